// The base of the Velmar commands: writes one command and passes what comes back to parse
// operations, which recognise acknowledgement, prompt and log. Each command overrides those of its
// own log.
#ifndef RCVLINK_VELMAR_VELMAR_COMMAND_H_
#define RCVLINK_VELMAR_VELMAR_COMMAND_H_

#include <cstdint>
#include <string>
#include <string_view>

#include "commands/receiver_cmd.h"
#include "velmar/log_header.h"
#include "velmar/response.h"

namespace VelmarCommands {

// Flags of a command.
constexpr uint32_t kSendOnly = 0x0001;   // no reply is read
constexpr uint32_t kAppendCrc = 0x0002;  // the CRC-32 is sent after it; no command asks for it
// The reply is not kept, and the parse operations discard the logs that they have read: a file is
// larger than the buffer.
constexpr uint32_t kStreamed = 0x1000;

constexpr uint32_t kWriteTimeoutMs = 500;
constexpr uint32_t kReadTimeoutMs = 30000;

class CVelmarCommand : public CReceiverCmd {
 public:
  CVelmarCommand(const char* text, uint32_t flags);

  // S_OK: the exchange ran, also when it ended by a time-out; Response() says how. S_FALSE:
  // cancelled. E_INVALIDARG: no connection. Else the failure that ended it.
  HRESULT Execute(CIConnection* connection, HANDLE abort_event) override;

  // The parse operations get the bytes that were received and not consumed. `done` ends the
  // exchange. The first `consumed` bytes are discarded after the call. S_FALSE: not recognised, or
  // more bytes are needed. ParseReserved, ParseAsciiMessage and ParseAcknowledgement are for
  // derived commands: the library does not call them.
  virtual HRESULT ParseReply(const char* bytes, uint32_t length, bool* done, uint32_t* consumed);
  virtual HRESULT ParseResponse(const char* bytes, uint32_t length, bool* done, uint32_t* consumed);
  virtual HRESULT ParseReserved(const char* bytes, uint32_t length, bool* done, uint32_t* consumed);
  virtual HRESULT ParseAsciiMessage(const char* text, bool* done);
  // A log that begins with "<" after the prompt. No command asks for one: E_NOTIMPL.
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
  // Sets the response type by the acknowledgement of a whole reply, a text that ends in 0. Gives 1
  // when the exchange has ended with it, 0 when nothing has come or a text follows the OK;
  // ErrorText() then gives that text.
  virtual int ParseAcknowledgement(const char* text);

  ResponseType Response() const { return response_; }
  const std::wstring& Port() const { return header_.port; }
  const AsciiHeader& Header() const { return header_; }
  const std::string& ErrorText() const { return error_text_; }

 protected:
  void SetResponse(ResponseType response) { response_ = response; }
  const BinaryHeader& Binary() const { return binary_header_; }

  // ParseReply of the commands that wait for a log: an acknowledgement alone does not end the
  // exchange.
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
