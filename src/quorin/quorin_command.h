// The base of the Quorin commands: writes one command and collects the framed reply.
#ifndef RCVLINK_QUORIN_QUORIN_COMMAND_H_
#define RCVLINK_QUORIN_QUORIN_COMMAND_H_

#include <cstdint>
#include <string>
#include <string_view>

#include "commands/receiver_cmd.h"
#include "quorin/reply_framing.h"

namespace QuorinCommands {

// Flags of a command: nothing is read after it; a tag goes ahead of it, and only a reply that
// carries the same tag is taken.
constexpr uint32_t kNoReply = 0x0001;
constexpr uint32_t kTagged = 0x1000;

constexpr uint32_t kWriteTimeoutMs = 3000;
constexpr uint32_t kReadTimeoutMs = 30000;

class CQuorinCommand : public CReceiverCmd {
 public:
  CQuorinCommand(const char* text, uint32_t flags);

  // S_OK: the exchange ran, and Result() tells its outcome. S_FALSE: cancelled. E_INVALIDARG: no
  // connection. 0x8007048F: the reply did not become whole in time, or is too long for the buffer.
  HRESULT Execute(CIConnection* connection, HANDLE abort_event) override;

  // Takes the body of one message; `done` is set when the command needs no further one.
  virtual HRESULT ParseReply(const char* body, uint32_t length, ReplyKind kind, bool* done);

  // The outcome: 0, 0x8007048F when the receiver refused, or the code of a failed read.
  HRESULT Result() const { return result_; }
  // The kind of the last message that was taken.
  ReplyKind Kind() const { return kind_; }

 protected:
  // The kept reply as text.
  std::string ReplyText() const;
  void SetResult(HRESULT result) { result_ = result; }

 private:
  class Receiving;

  HRESULT SendLine(CIConnection* connection, HANDLE abort_event, std::string_view tag);
  HRESULT ReceiveReply(CIConnection* connection, HANDLE abort_event, std::string_view tag);

  HRESULT result_ = S_OK;
  ReplyKind kind_ = ReplyKind::kNone;
};

}  // namespace QuorinCommands

#endif  // RCVLINK_QUORIN_QUORIN_COMMAND_H_
