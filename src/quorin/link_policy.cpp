#include "quorin/link_policy.h"

#include <algorithm>

#include "platform/clock.h"

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
  // A read that did not bring all lacks the end byte: the block is asked for again for that.
  return FAILED(result) ? result : S_OK;
}

// In 32-bit arithmetic, which wraps beyond 43383508 bytes, and cut to 8 bits.
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
  // An abort counts more than how the read ended.
  return abort_.IsSet() ? S_FALSE : read_result_;
}

HRESULT UsbPolicy::ReadRest(Block&) { return read_result_; }

// In pieces of no more than a bulk packet, until all is there, a read does not succeed or an abort
// is seen.
HRESULT UsbPolicy::ReadWhole(Block& block) {
  constexpr DWORD kMaxPiece = 512;
  DWORD held = 0;
  while (held < kBlockLength && !abort_.IsSet()) {
    const DWORD piece = std::min<DWORD>(kBlockLength - held, kMaxPiece);
    DWORD count = 0;
    const HRESULT result = connection_->Read(block.data() + held, piece, &count, read_timeout_ms_);
    if (result != S_OK) return result;
    held += std::min(count, piece);
  }
  return S_OK;
}

// Cut to 8 bits; right for files of any size.
uint8_t UsbPolicy::Percent(uint32_t delivered, uint32_t size) const {
  return static_cast<uint8_t>(static_cast<uint64_t>(delivered * 99.0 / size + 1.0));
}

// Twice a second at most.
bool UsbPolicy::IsTimeToTell() {
  constexpr DWORD kReportIntervalMs = 500;
  const DWORD now = CurrentClock().Ticks();
  if (now - told_at_ <= kReportIntervalMs) return false;
  told_at_ = now;
  return true;
}
