#include "velmar/velmar_command.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <new>
#include <utility>

#include "platform/clock.h"
#include "platform/hresult.h"
#include "report/report_file.h"
#include "velmar/block_crc32.h"

using rcvlink::CurrentClock;
using rcvlink::kTimedOut;
using rcvlink::Trace;

namespace VelmarCommands {
namespace {

// Holds a whole reply. A longer one ends the exchange with what has come of it.
constexpr uint32_t kBufferLength = 8192;
// A receiver that sends byte by byte would never reach a time-out. At 300 bit/s the buffer is full
// after 273 s.
constexpr DWORD kLongestPieceMs = 300000;
// Receivers need a moment after a reply before they take the next command.
constexpr DWORD kPauseMs = 500;

constexpr std::string_view kLineEnd = "\r\n";

}  // namespace

CVelmarCommand::CVelmarCommand(const char* text, uint32_t flags)
    : CReceiverCmd(text, flags, kWriteTimeoutMs, kReadTimeoutMs) {
  // An abort that comes before a command or during it ends only the wait for the answer: the
  // receiver would take half a line as the beginning of the next command.
  SendWhole();
}

HRESULT CVelmarCommand::Execute(CIConnection* connection, HANDLE abort_event) {
  if (!connection) return E_INVALIDARG;
  if (IsCancelled(abort_event)) return S_FALSE;
  if (const HRESULT result = connection->Flush(); FAILED(result)) return result;
  if (const HRESULT result = Send(connection, GetCommand(), GetCommandLength()); FAILED(result)) {
    return result;
  }
  if (GetFlags() & kAppendCrc) {
    const uint32_t crc = CalculateBlockCrc32(GetCommand(), GetCommandLength());
    const std::array<uint8_t, 4> bytes = {static_cast<uint8_t>(crc),
                                          static_cast<uint8_t>(crc >> 8),
                                          static_cast<uint8_t>(crc >> 16),
                                          static_cast<uint8_t>(crc >> 24)};
    const HRESULT result = Send(connection, bytes.data(), sizeof(bytes));
    if (FAILED(result)) return result;
  }
  if (GetFlags() & kSendOnly) return S_OK;
  if (IsCancelled(abort_event)) return S_FALSE;
  return ReceiveReply(connection, abort_event);
}

// The bytes that were received and not consumed, with zeros after them, and the reply that is kept.
class CVelmarCommand::Receiving {
 public:
  const char* bytes() const { return buffer_.data(); }
  uint32_t held() const { return held_; }
  // Whether no more is waited for, although what is held is no whole answer.
  bool IsOver() const {
    if (held_ == kBufferLength) return true;
    if (CurrentClock().Ticks() - piece_began_at_ <= kLongestPieceMs) return false;
    Trace(L"CVelmarCommand::Execute - the answer does not end\r\n");
    return true;
  }

  HRESULT Read(CIConnection* connection, DWORD timeout_ms, DWORD* count) {
    return connection->Read(buffer_.data() + held_, kBufferLength - held_, count, timeout_ms);
  }
  // Keeps all that is held and the new bytes, so bytes that were held before are kept again. The
  // last part is then the whole reply, in which a refusal is found (download.cpp).
  bool Keep(DWORD count) {
    try {
      kept_.append(buffer_.data(), held_ + count);
    } catch (const std::bad_alloc&) {
      return false;
    }
    return true;
  }
  void Hold(DWORD count) { held_ += count; }
  void Consume(uint32_t count) {
    if (count != 0) piece_began_at_ = CurrentClock().Ticks();
    count = std::min(count, held_);
    std::copy(buffer_.begin() + count, buffer_.end(), buffer_.begin());
    held_ -= count;
  }
  std::string TakeKept() { return std::move(kept_); }

 private:
  std::array<char, kBufferLength> buffer_{};
  uint32_t held_ = 0;
  DWORD piece_began_at_ = CurrentClock().Ticks();
  std::string kept_;
};

HRESULT CVelmarCommand::ReceiveReply(CIConnection* connection, HANDLE abort_event) {
  const bool keep_reply = (GetFlags() & kStreamed) == 0;
  Receiving receiving;
  bool need_data = true;
  bool done = false;
  while (!done) {
    if (need_data) {
      DWORD count = 0;
      const HRESULT read_result = receiving.Read(connection, GetReadTimeout(), &count);
      if (FAILED(read_result)) {
        Trace(L"CVelmarCommand::Execute - read failed [0x%08X]\r\n", read_result);
        if (read_result != kTimedOut) return read_result;
      }
      // An abort that came before this command ends its wait as well.
      if (read_result == S_FALSE || IsCancelled(abort_event)) return S_FALSE;
      if (count == 0) break;
      if (keep_reply && !receiving.Keep(count)) return E_OUTOFMEMORY;
      receiving.Hold(count);
      if (read_result == kTimedOut) break;
    }
    uint32_t consumed = 0;
    const HRESULT parse_result = ParseReply(receiving.bytes(), receiving.held(), &done, &consumed);
    if (FAILED(parse_result)) return parse_result;
    if (response_ == RESPONSE_UNKNOWN) {
      Trace(L"CVelmarCommand::Execute - unknown response type\r\n");
      break;
    }
    need_data = consumed == 0;
    receiving.Consume(consumed);
    if (!done && need_data && receiving.IsOver()) break;
  }
  if (keep_reply) KeepReply(receiving.TakeKept());
  CurrentClock().Pause(kPauseMs);
  return S_OK;
}

HRESULT CVelmarCommand::ParseReply(const char* bytes,
                                   uint32_t length,
                                   bool* done,
                                   uint32_t* consumed) {
  *done = false;
  if (!bytes || length == 0) return S_FALSE;
  if (bytes[0] == '\r') return ParseResponse(bytes, length, done, consumed);
  response_ = RESPONSE_UNKNOWN;
  return S_FALSE;
}

HRESULT CVelmarCommand::ParseResponse(const char* bytes,
                                      uint32_t length,
                                      bool* done,
                                      uint32_t* consumed) {
  const VelmarCommands::Response response = RecogniseResponse({bytes, length});
  response_ = response.type;
  if (response.prompt_end == 0) return S_FALSE;
  const auto prompt_end = static_cast<uint32_t>(response.prompt_end);
  if (prompt_end == length) {
    *done = true;
    return S_OK;
  }
  if (GetFlags() & kStreamed) *consumed = prompt_end;

  const char* const log = bytes + prompt_end;
  const uint32_t log_length = length - prompt_end;
  switch (static_cast<uint8_t>(*log)) {
    case BinaryHeader::kSync:
      return ParseBinaryLog(log, log_length, done, consumed);
    case '#':
      return ParseAsciiLog(log, log_length, done, consumed);
    case '<':
      return ParseAbbreviatedLog(log, log_length, done, consumed);
    case '\r':
      *done = true;
      return S_OK;
    default:
      response_ = RESPONSE_UNKNOWN;
      return S_FALSE;
  }
}

HRESULT CVelmarCommand::ParseAcknowledgedReply(const char* bytes,
                                               uint32_t length,
                                               bool* done,
                                               uint32_t* consumed) {
  *done = false;
  if (bytes && length != 0) {
    if (bytes[0] == '\r') {
      const HRESULT result = ParseResponse(bytes, length, done, consumed);
      if (FAILED(result)) return result;
    } else {
      response_ = RESPONSE_UNKNOWN;
    }
  }
  if (response_ == RESPONSE_OK) *done = false;
  return S_OK;
}

HRESULT CVelmarCommand::ParseReserved(const char*, uint32_t, bool*, uint32_t*) { return E_NOTIMPL; }

HRESULT CVelmarCommand::ParseAbbreviatedLog(const char*, uint32_t, bool*, uint32_t*) {
  return E_NOTIMPL;
}

HRESULT CVelmarCommand::ParseAsciiMessage(const char* text, bool* done) {
  const char* const separator = std::strchr(text, ';');
  if (!separator) {
    *done = false;
    return S_FALSE;
  }
  const HRESULT header_result = ParseAsciiHeader(text, static_cast<uint32_t>(separator - text));
  if (FAILED(header_result)) return header_result;
  const char* const body = separator + 1;
  const HRESULT parse_result =
      ParseMessageBody(body, static_cast<uint32_t>(std::strlen(body)), done);
  return FAILED(parse_result) ? parse_result : S_OK;
}

HRESULT CVelmarCommand::ParseAsciiLog(const char* bytes,
                                      uint32_t length,
                                      bool* done,
                                      uint32_t* consumed) {
  *done = false;
  response_ = RESPONSE_INCOMPLETE;
  const std::string_view log(bytes, length);
  const size_t separator = log.find(';');
  if (separator == std::string_view::npos) return S_FALSE;
  const auto header = ParseHeaderFields(log.substr(0, separator));
  if (!header) return S_FALSE;
  header_ = *header;
  const std::string_view body = log.substr(separator + 1);
  return ParseLogBody(body.data(), static_cast<uint32_t>(body.size()), done, consumed);
}

HRESULT CVelmarCommand::ParseBinaryLog(const char* bytes,
                                       uint32_t length,
                                       bool* done,
                                       uint32_t* consumed) {
  *done = false;
  if (length < BinaryHeader::kLength) return S_FALSE;
  binary_header_.Assign({bytes, length});
  if (length < binary_header_.LogLength()) return S_FALSE;
  // The headers of all logs that commands ask for have 28 bytes, so the body is not looked for by
  // the length that the header gives.
  constexpr uint32_t kBody = BinaryHeader::kLength;
  return ParseLogBody(bytes + kBody, length - kBody, done, consumed);
}

HRESULT CVelmarCommand::ParseLogBody(const char*, uint32_t, bool* done, uint32_t*) {
  *done = true;
  return S_OK;
}

HRESULT CVelmarCommand::ParseAsciiHeader(const char* text, uint32_t length) {
  const auto header = ParseHeaderFields({text, length});
  if (!header) return S_FALSE;
  header_.message_name = header->message_name;
  header_.port = header->port;
  header_.gps_week = header->gps_week;
  header_.gps_seconds = header->gps_seconds;
  return S_OK;
}

HRESULT CVelmarCommand::ParseMessageBody(const char*, uint32_t, bool* done) {
  *done = true;
  return S_OK;
}

int CVelmarCommand::ParseAcknowledgement(const char* text) {
  const auto skip_line_ends = [](std::string_view& rest) {
    while (rest.starts_with(kLineEnd)) rest.remove_prefix(kLineEnd.size());
  };
  constexpr size_t kShortest = 2;

  std::string_view rest = text ? text : "";
  skip_line_ends(rest);
  if (rest.size() < kShortest) {
    response_ = RESPONSE_INCOMPLETE;
    return 0;
  }
  if (!rest.starts_with("<")) {
    response_ = RESPONSE_UNKNOWN;
    return 1;
  }
  constexpr std::string_view kOk = "<OK";
  if (!rest.starts_with(kOk)) {
    response_ = RESPONSE_ERROR;
    return 1;
  }
  response_ = RESPONSE_OK;
  rest.remove_prefix(kOk.size());
  skip_line_ends(rest);
  if (rest.size() < kShortest) return 1;
  response_ = RESPONSE_DATA;
  error_text_ = rest;
  return 0;
}

}  // namespace VelmarCommands
