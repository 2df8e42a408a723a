// The base of the Quorin commands: writes one command and reads its framed reply.
#ifndef RCVLINK_QUORIN_QUORIN_COMMAND_H_
#define RCVLINK_QUORIN_QUORIN_COMMAND_H_

#include <cstdint>
#include <string>
#include <string_view>

#include "commands/receiver_cmd.h"
#include "quorin/reply_framing.h"

namespace QuorinCommands {

// Flags of a command.
constexpr uint32_t kNoReply = 0x0001;  // no reply is read
constexpr uint32_t kTagged = 0x1000;   // a tag is sent before it; only a reply with that tag counts

constexpr uint32_t kWriteTimeoutMs = 3000;
constexpr uint32_t kReadTimeoutMs = 30000;

class CQuorinCommand : public CReceiverCmd {
 public:
  CQuorinCommand(const char* text, uint32_t flags);

  // S_OK: the exchange ran, or a read ended it; Result() says how. S_FALSE: cancelled.
  // E_INVALIDARG: no connection. 0x8007048F: refused, or the reply did not become whole in time or
  // does not fit into the buffer. Else the failure that ended it.
  HRESULT Execute(CIConnection* connection, HANDLE abort_event) override;

  // Evaluates the body of one message, and sets `done` when the command needs no further message.
  virtual HRESULT ParseReply(const char* body, uint32_t length, ReplyKind kind, bool* done);

  // S_OK, 0x8007048F when the receiver refused, or the code of the read that ended the exchange:
  // S_FALSE after an abort.
  HRESULT Result() const { return result_; }
  // The kind of the last message that was evaluated.
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
