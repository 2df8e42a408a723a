#include "quorin/link_policy.h"

#include <algorithm>

#include "platform/clock.h"
#include "platform/hresult.h"

namespace rcvlink {
namespace {

constexpr DWORD kSerialReadTimeoutMs = 3000;

}  // namespace

HRESULT SerialPolicy::ReadHeader(Block& block) {
  DWORD count = 0;
  const HRESULT result =
      connection_->Read(block.data(), kBlockHeader, &count, kSerialReadTimeoutMs);
  if (count < kBlockHeader) block = Block();
  return result;
}

HRESULT SerialPolicy::ReadRest(Block& block) {
  constexpr DWORD kRest = kBlockLength - kBlockHeader;
  DWORD count = 0;
  const HRESULT result =
      connection_->Read(block.data() + kBlockHeader, kRest, &count, kSerialReadTimeoutMs);
  // After a read that brought less the end byte is missing, and the block is asked for again.
  return FAILED(result) ? result : S_OK;
}

// In 32-bit arithmetic: beyond 43383508 bytes the percent starts again from 1. This is kept for
// hosts that compare the percents of a transfer with recorded ones; nothing else depends on them.
uint8_t SerialPolicy::Percent(uint32_t delivered, uint32_t size) const {
  return static_cast<uint8_t>(delivered * 99 / size + 1);
}

UsbPolicy::UsbPolicy(CIConnection* connection, AbortSwitch& abort, DWORD read_timeout_ms)
    : connection_(connection),
      abort_(abort),
      read_timeout_ms_(read_timeout_ms),
      told_at_(CurrentClock().Ticks()) {}

HRESULT UsbPolicy::ReadHeader(Block& block) {
  read_result_ = ReadWhole(block);
  // An abort comes before a failure of the read: the host wants the end, and no further try.
  return abort_.IsSet() ? S_FALSE : read_result_;
}

HRESULT UsbPolicy::ReadRest(Block&) { return read_result_; }

// Reads pieces of at most one bulk packet, until the block is whole, a read fails or an abort came.
// A receiver may send a packet that holds only a part of the block. A device that answers with no
// bytes is as silent as one that does not answer, and one that sends byte by byte sends no block.
HRESULT UsbPolicy::ReadWhole(Block& block) {
  constexpr DWORD kMaxPiece = 512;
  Clock& clock = CurrentClock();
  const DWORD began_at = clock.Ticks();
  DWORD last_byte_at = began_at;
  DWORD held = 0;
  while (held < kBlockLength && !abort_.IsSet()) {
    const DWORD piece = std::min<DWORD>(kBlockLength - held, kMaxPiece);
    DWORD count = 0;
    const HRESULT result = connection_->Read(block.data() + held, piece, &count, read_timeout_ms_);
    if (result != S_OK) return result;
    const DWORD now = clock.Ticks();
    if (count != 0) {
      last_byte_at = now;
    } else if (now - last_byte_at > read_timeout_ms_) {
      return kTimedOut;
    }
    held += std::min(count, piece);
    if (held < kBlockLength && now - began_at > LongestWithoutBlockMs()) return kTimedOut;
  }
  return S_OK;
}

// As long as the four reads of a silent receiver take.
DWORD UsbPolicy::LongestWithoutBlockMs() const {
  constexpr DWORD kTwoMinutes = 120000;
  return kTwoMinutes;
}

// In floating point, so it is right for files of any size.
uint8_t UsbPolicy::Percent(uint32_t delivered, uint32_t size) const {
  return static_cast<uint8_t>(static_cast<uint64_t>(delivered * 99.0 / size + 1.0));
}

// At most twice a second: blocks come fast, and the transfer waits while the host's function runs.
bool UsbPolicy::IsTimeToTell() {
  constexpr DWORD kReportIntervalMs = 500;
  const DWORD now = CurrentClock().Ticks();
  if (now - told_at_ <= kReportIntervalMs) return false;
  told_at_ = now;
  return true;
}

}  // namespace rcvlink
