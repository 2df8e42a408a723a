// The base of every command, of either family: the bytes to send, the bytes kept of the reply,
// flags whose meaning is the family's, two time-outs and the cancelled mark.
#ifndef RCVLINK_COMMANDS_RECEIVER_CMD_H_
#define RCVLINK_COMMANDS_RECEIVER_CMD_H_

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>

#include "platform/win32.h"
#include "transport/connection.h"

// A command serves one exchange: construct it, execute it, read the results, destroy it. One thread
// uses it; only Cancel may be called from another.
class CReceiverCmd {
 public:
  // `text` is sent without its terminating zero. Raises std::bad_alloc.
  CReceiverCmd(const char* text,
               uint32_t flags,
               uint32_t write_timeout_ms,
               uint32_t read_timeout_ms);
  CReceiverCmd(const CReceiverCmd&) = delete;
  CReceiverCmd& operator=(const CReceiverCmd&) = delete;
  virtual ~CReceiverCmd() = default;

  // False, with the old command kept, when the copy cannot be allocated.
  virtual bool SetCommand(const void* bytes, uint32_t length);
  virtual bool SetCommandText(const char* text);

  // Replaces the reply by a copy of the text without its terminating zero. The old reply stays when
  // the copy cannot be allocated.
  virtual void SetReply(const char* text);
  // Frees the reply. GetReplyLength keeps its old value, and counts only while GetReply is not
  // null.
  virtual void FreeReply();
  // E_INVALIDARG for null bytes, S_FALSE for none, E_OUTOFMEMORY with the reply unchanged.
  virtual HRESULT AppendReply(const void* bytes, uint32_t length);

  virtual uint32_t GetFlags() const;
  virtual void SetFlags(uint32_t flags);
  virtual void SetReadTimeout(uint32_t timeout_ms);
  virtual uint32_t GetWriteTimeout() const;
  virtual uint32_t GetReadTimeout() const;
  virtual uint32_t GetCommandLength() const;
  virtual const uint8_t* GetCommand() const;  // may be null
  virtual uint32_t GetReplyLength() const;
  virtual const uint8_t* GetReply() const;  // may be null

  // Whether Cancel was called or the event (which may be null) is signalled. It does not wait.
  virtual bool IsCancelled(HANDLE abort_event) const;

  // Runs the exchange. S_OK: it ran, and the command's results say whether the receiver did what
  // was asked; S_FALSE: cancelled; else the failure that ended it.
  virtual HRESULT Execute(CIConnection* connection, HANDLE abort_event) = 0;

  // Marks the command as cancelled: Execute ends at its next step. The mark is never cleared.
  virtual void Cancel();

  // Makes Execute send the whole line once it begins, so that an abort ends only the wait for the
  // reply: the receiver would take half a line as the beginning of the next command.
  void SendWhole() { sends_whole_ = true; }

 protected:
  bool SendsWhole() const { return sends_whole_; }
  // Makes room for a reply of so many bytes at once, if there is memory for it.
  void ReserveReply(size_t length);
  // Takes over a whole reply, also an empty one, without a copy.
  void KeepReply(std::string reply);
  // Writes bytes with the command's write time-out. Results as those of the connection's Write.
  HRESULT Send(CIConnection* connection, const void* bytes, uint32_t length) const;

 private:
  uint32_t flags_;
  std::unique_ptr<uint8_t[]> command_;
  uint32_t command_length_ = 0;
  uint32_t write_timeout_ms_;
  uint32_t read_timeout_ms_;
  std::string reply_;
  uint32_t reply_length_ = 0;
  bool has_reply_ = false;
  std::atomic<bool> cancelled_ = false;
  bool sends_whole_ = false;
};

#endif  // RCVLINK_COMMANDS_RECEIVER_CMD_H_
