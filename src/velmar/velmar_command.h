// The base of the Velmar commands: writes one command and hands what comes back to parse
// operations, which recognise acknowledgement, prompt and log. Concrete commands override the parse
// operations.
#ifndef RCVLINK_VELMAR_VELMAR_COMMAND_H_
#define RCVLINK_VELMAR_VELMAR_COMMAND_H_

#include <cstdint>
#include <string>
#include <string_view>

#include "commands/receiver_cmd.h"
#include "velmar/log_header.h"
#include "velmar/response.h"

namespace VelmarCommands {

// Flags of a command: no reply is read; the command's CRC-32 follows it; the reply is streamed (its
// bytes are not kept, and the parsers say how many they consumed).
constexpr uint32_t kSendOnly = 0x0001;
constexpr uint32_t kAppendCrc = 0x0002;
constexpr uint32_t kStreamed = 0x1000;

constexpr uint32_t kWriteTimeoutMs = 500;
constexpr uint32_t kReadTimeoutMs = 30000;

class CVelmarCommand : public CReceiverCmd {
 public:
  CVelmarCommand(const char* text, uint32_t flags);

  // S_OK: the exchange ran; the response type tells its outcome, also after a time-out. S_FALSE:
  // cancelled. E_INVALIDARG: no connection. Else what ended it.
  HRESULT Execute(CIConnection* connection, HANDLE abort_event) override;

  // The parse operations take the bytes received and not consumed so far. `done` ends the exchange;
  // `consumed` is how many bytes at the front are dealt with. S_FALSE: not handled, or not enough.
  virtual HRESULT ParseReply(const char* bytes, uint32_t length, bool* done, uint32_t* consumed);
  virtual HRESULT ParseResponse(const char* bytes, uint32_t length, bool* done, uint32_t* consumed);
  virtual HRESULT ParseReserved(const char* bytes, uint32_t length, bool* done, uint32_t* consumed);
  virtual HRESULT ParseAsciiMessage(const char* text, bool* done);
  // A log behind the prompt that opens with "<"; no family member reads it.
  virtual HRESULT ParseAbbreviatedLog(const char* bytes,
                                      uint32_t length,
                                      bool* done,
                                      uint32_t* consumed);
  virtual HRESULT ParseAsciiLog(const char* bytes, uint32_t length, bool* done, uint32_t* consumed);
  virtual HRESULT ParseBinaryLog(const char* bytes,
                                 uint32_t length,
                                 bool* done,
                                 uint32_t* consumed);
  virtual HRESULT ParseLogBody(const char* bytes, uint32_t length, bool* done, uint32_t* consumed);
  virtual HRESULT ParseAsciiHeader(const char* text, uint32_t length);
  virtual HRESULT ParseMessageBody(const char* text, uint32_t length, bool* done);
  // Sorts a whole reply, a text that ends in 0, by its acknowledgement. 0 when it is no end
  // (nothing has come, or something follows the OK, which is kept as ErrorText); else 1.
  virtual int ParseAcknowledgement(const char* text);

  ResponseType Response() const { return response_; }
  const std::wstring& Port() const { return header_.port; }
  const AsciiHeader& Header() const { return header_; }
  const std::string& ErrorText() const { return error_text_; }

 protected:
  void SetResponse(ResponseType response) { response_ = response; }
  const BinaryHeader& Binary() const { return binary_header_; }

  // What commands that wait for a log do with a reply: an acknowledgement alone does not end it.
  HRESULT ParseAcknowledgedReply(const char* bytes,
                                 uint32_t length,
                                 bool* done,
                                 uint32_t* consumed);

 private:
  class Receiving;

  HRESULT ReceiveReply(CIConnection* connection, HANDLE abort_event);

  ResponseType response_ = RESPONSE_UNKNOWN;
  AsciiHeader header_;
  BinaryHeader binary_header_;
  std::string error_text_;
};

}  // namespace VelmarCommands

#endif  // RCVLINK_VELMAR_VELMAR_COMMAND_H_
