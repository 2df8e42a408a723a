#include "quorin/quorin_command.h"

#include <atomic>
#include <memory>
#include <new>
#include <optional>

#include "platform/clock.h"
#include "platform/hresult.h"
#include "platform/text.h"
#include "report/report_file.h"

using rcvlink::Clock;
using rcvlink::CurrentClock;
using rcvlink::FormatText;
using rcvlink::kNotConnected;
using rcvlink::Trace;

namespace QuorinCommands {
namespace {

// Holds a whole reply, with all messages of a directory.
constexpr uint32_t kBufferLength = 65536;

// Counted for the process, not for a command or a receiver: no number comes twice, so a late answer
// to an earlier command never has the tag of a later one.
constinit std::atomic<int32_t> last_tag = 0;

// A number between two percent signs.
std::string NextTag() { return FormatText("%%%i%%", ++last_tag); }

}  // namespace

CQuorinCommand::CQuorinCommand(const char* text, uint32_t flags)
    : CReceiverCmd(text, flags, kWriteTimeoutMs, kReadTimeoutMs) {}

HRESULT CQuorinCommand::Execute(CIConnection* connection, HANDLE abort_event) {
  if (!connection) return E_INVALIDARG;
  FreeReply();
  if (const HRESULT result = connection->Flush(); FAILED(result)) return result;

  const std::string tag = GetFlags() & kTagged ? NextTag() : std::string();
  if (const HRESULT result = SendLine(connection, abort_event, tag); result != S_OK) return result;
  if (GetFlags() & kNoReply) return S_OK;
  return ReceiveReply(connection, abort_event, tag);
}

// Gives S_FALSE when an abort ended a write: the command ends then, as after a failure.
HRESULT CQuorinCommand::SendLine(CIConnection* connection,
                                 HANDLE abort_event,
                                 std::string_view tag) {
  if (!tag.empty()) {
    const HRESULT result = Send(connection, tag.data(), static_cast<uint32_t>(tag.size()));
    if (result != S_OK) return result;
  }
  if (!SendsWhole() && IsCancelled(abort_event)) return S_FALSE;
  return Send(connection, GetCommand(), GetCommandLength());
}

// The bytes of a reply that have come, and from where they are searched next.
class CQuorinCommand::Receiving {
 public:
  bool Allocate() {
    buffer_.reset(new (std::nothrow) char[kBufferLength]);
    return buffer_ != nullptr;
  }

  // Appends what comes to the buffer.
  HRESULT Read(CIConnection* connection, DWORD timeout_ms, DWORD* count) {
    const HRESULT result = connection->Read(buffer_.get() + received_, Free(), count, timeout_ms);
    if (result == S_OK) received_ += *count;
    return result;
  }

  std::optional<ReplyHeader> FindHeader() {
    return FindReplyHeader({buffer_.get(), received_}, scan_from_);
  }
  std::string_view Body(const ReplyHeader& header) const {
    return {buffer_.get() + header.position + kReplyHeaderLength, header.body_length};
  }
  void SearchFrom(size_t position) { scan_from_ = position; }

  size_t Received() const { return received_; }
  bool IsFull() const { return Free() == 0; }
  // How many bytes of the message are still to come.
  size_t Missing(const ReplyHeader& header) const {
    const size_t end = header.position + header.MessageLength();
    return end > received_ ? end - received_ : 0;
  }
  bool HasRoomFor(size_t bytes) const { return Free() >= bytes; }

 private:
  DWORD Free() const { return kBufferLength - static_cast<DWORD>(received_); }

  std::unique_ptr<char[]> buffer_;
  size_t received_ = 0;
  size_t scan_from_ = 0;
};

HRESULT CQuorinCommand::ReceiveReply(CIConnection* connection,
                                     HANDLE abort_event,
                                     std::string_view tag) {
  Receiving receiving;
  if (!receiving.Allocate()) return E_OUTOFMEMORY;
  bool done = false;
  // The body is one zero byte: it reads as an empty text, and the report's line of a failed command
  // then shows an empty reply.
  const auto parse_nothing = [&] { return ParseReply("", 1, ReplyKind::kBlank, &done); };

  Clock& clock = CurrentClock();
  const DWORD start = clock.Ticks();
  bool read_needed = true;
  do {
    if (IsCancelled(abort_event)) return S_FALSE;
    if (read_needed) {
      Trace(L"CQuorinCommand::Execute - start reading. Timeout is [%u msec]\r\n", GetReadTimeout());
      DWORD count = 0;
      result_ = receiving.Read(connection, GetReadTimeout(), &count);
      if (result_ != S_OK) return S_OK;
      if (count == 0) return parse_nothing();
      ReserveReply(receiving.Received());
    }
    read_needed = true;

    const auto header = receiving.FindHeader();
    if (!header) {
      if (receiving.IsFull()) return parse_nothing();
    } else if (const size_t missing = receiving.Missing(*header); missing != 0) {
      if (!receiving.HasRoomFor(missing)) return kNotConnected;
    } else if (std::string_view body = receiving.Body(*header); !body.starts_with(tag)) {
      // The answer to another command. The right one may be in the buffer already, so that is
      // searched first: another read could wait for nothing.
      receiving.SearchFrom(header->position + 1);
      read_needed = false;
    } else {
      body.remove_prefix(tag.size());
      const HRESULT result =
          ParseReply(body.data(), static_cast<uint32_t>(body.size()), header->kind, &done);
      if (done) return result;
      receiving.SearchFrom(header->position + header->MessageLength());
      read_needed = false;
    }
  } while (clock.Ticks() - start <= GetReadTimeout());
  return kNotConnected;
}

HRESULT CQuorinCommand::ParseReply(const char* body, uint32_t length, ReplyKind kind, bool* done) {
  if (const HRESULT result = AppendReply(body, length); FAILED(result)) return result;
  kind_ = kind;
  *done = true;
  result_ = kind == ReplyKind::kBlank || kind == ReplyKind::kReply ? S_OK : kNotConnected;
  return result_;
}

std::string CQuorinCommand::ReplyText() const {
  const uint8_t* const reply = GetReply();
  return reply ? std::string(reply, reply + GetReplyLength()) : std::string();
}

}  // namespace QuorinCommands
