#include "quorin/block_download.h"

#include <span>
#include <utility>

#include "platform/clock.h"
#include "platform/hresult.h"
#include "quorin/quorin_command.h"
#include "report/report_file.h"
#include "transport/wait_scope.h"

namespace rcvlink {
namespace {

// A silence may be a lost control byte, so the receiver is asked again before the transfer ends.
constexpr int kMaxTimeouts = 3;

HRESULT WriteToStream(IStream* stream, std::span<const uint8_t> bytes) {
  ULONG written = 0;
  return stream->Write(bytes.data(), static_cast<ULONG>(bytes.size()), &written);
}

}  // namespace

HRESULT WriteControl(CIConnection* connection, uint8_t control) {
  const WaitScope shield = WaitScope::Shielded(connection);
  return connection->Write(&control, sizeof(control), QuorinCommands::kWriteTimeoutMs);
}

BlockDownload::BlockDownload(CIConnection* connection,
                             AbortSwitch& abort,
                             ProgressFunction tell_progress,
                             IStream* stream,
                             int size,
                             LinkPolicy& policy)
    : connection_(connection),
      abort_(abort),
      tell_progress_(std::move(tell_progress)),
      stream_(stream),
      size_(size),
      policy_(policy) {}

HRESULT BlockDownload::Run() {
  if (!stream_ || size_ < 1) return E_INVALIDARG;
  accepted_at_ = CurrentClock().Ticks();
  for (;;) {
    if (const auto ended = TakeBlock()) return *ended;
  }
}

std::optional<HRESULT> BlockDownload::TakeBlock() {
  if (abort_.Take()) return EndCancelled();

  Block block;
  const HRESULT header_result = policy_.ReadHeader(block);
  if (FAILED(header_result)) return AfterFailedRead(header_result);
  if (abort_.Take()) return EndCancelled();

  switch (block.Type()) {
    case BlockType::kEnd:
      TraceWhy(L"recognisable byte is 0x23");
      return S_FALSE;
    case BlockType::kData:
      if (block.Sequence() != expected_sequence_) return AskAgain(L"out of sequence");
      break;
    case BlockType::kLast:
      break;
    default:
      return AskAgain(L"recognisable byte is not recognised");
  }
  const std::optional<size_t> payload_length = block.PayloadLength();
  if (!payload_length) return kNotConnected;

  const HRESULT rest_result = policy_.ReadRest(block);
  if (FAILED(rest_result)) return AfterFailedRead(rest_result);
  // An abort ended the read, and another operation has cleared its flag since. The receiver is told
  // all the same, or it would wait for a control byte.
  if (rest_result == S_FALSE) EndTransfer();
  if (rest_result != S_OK) return rest_result;
  if (!block.HasEndByte()) return AskAgain(L"eob character is missed");
  if (!block.IsChainedTo(crc_)) return AskAgain(L"cheksum missmatch");

  return Accept(block, *payload_length);
}

std::optional<HRESULT> BlockDownload::Accept(const Block& block, size_t payload_length) {
  crc_ = block.Crc();
  accepted_at_ = CurrentClock().Ticks();
  const HRESULT store_result = WriteToStream(stream_, block.Payload().first(payload_length));
  if (FAILED(store_result)) {
    if (policy_.TellsWhy()) {
      Trace(L"CQuorinProtocol::%s - write to stream failed [0x%08X]\r\n",
            policy_.Name(),
            store_result);
    }
    EndTransfer();
    return Passed(store_result);
  }
  delivered_ += static_cast<uint32_t>(payload_length);
  TellProgress();

  if (block.Type() == BlockType::kLast) {
    EndTransfer();
    return Passed(store_result);
  }
  if (abort_.Take()) return EndCancelled();
  const HRESULT ack_result = WriteControl(connection_, kAck);
  if (FAILED(ack_result)) return ack_result;
  if (ack_result != S_OK) return Passed(ack_result);
  ++expected_sequence_;
  if (policy_.CountsTimeoutsPerBlock()) timeouts_ = 0;
  return std::nullopt;
}

void BlockDownload::TellProgress() {
  const uint8_t percent = policy_.Percent(delivered_, static_cast<uint32_t>(size_));
  if (percent == percent_) return;
  percent_ = percent;
  if (policy_.IsTimeToTell()) tell_progress_(percent);
}

// After a time-out the block is asked for again, up to kMaxTimeouts times. Any other failure is one
// of the link, which asking again does not mend.
std::optional<HRESULT> BlockDownload::AfterFailedRead(HRESULT failure) {
  if (failure != kTimedOut) return failure;
  TraceText(policy_.TimeoutText());
  if (timeouts_ == kMaxTimeouts) return kTimedOut;
  ++timeouts_;
  return AskAgain();
}

// Discards what is left of the block and asks for it again. A NAK that cannot be sent ends the
// transfer: the receiver would not know that it is to send.
std::optional<HRESULT> BlockDownload::AskAgain() {
  if (IsHopeless()) {
    TraceText(L"no valid block has come for too long");
    return kTimedOut;
  }
  connection_->Flush();
  const HRESULT result = WriteControl(connection_, kNak);
  return FAILED(result) ? std::optional(result) : std::nullopt;
}

std::optional<HRESULT> BlockDownload::AskAgain(const wchar_t* why) {
  TraceWhy(why);
  return AskAgain();
}

bool BlockDownload::IsHopeless() const {
  const DWORD limit = policy_.LongestWithoutBlockMs();
  return limit != INFINITE && CurrentClock().Ticks() - accepted_at_ > limit;
}

HRESULT BlockDownload::EndCancelled() {
  TraceText(L"download is cancelled");
  const HRESULT result = EndTransfer();
  return FAILED(result) ? result : S_FALSE;
}

HRESULT BlockDownload::EndTransfer() { return WriteControl(connection_, kEndOfTransfer); }

HRESULT BlockDownload::Passed(HRESULT result) const {
  return policy_.PassesResultsOn() ? result : S_OK;
}

void BlockDownload::TraceText(const wchar_t* text) const {
  Trace(L"CQuorinProtocol::%s - %s\r\n", policy_.Name(), text);
}

void BlockDownload::TraceWhy(const wchar_t* text) const {
  if (policy_.TellsWhy()) TraceText(text);
}

}  // namespace rcvlink
