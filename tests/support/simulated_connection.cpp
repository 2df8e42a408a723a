#include "tests/support/simulated_connection.h"

#include <algorithm>
#include <utility>

#include "platform/hresult.h"
#include "platform/text.h"

using rcvlink::CopyBstr;
using rcvlink::kTimedOut;

HRESULT SimulatedConnection::Read(void* buffer, DWORD size, DWORD* bytes_read, DWORD timeout_ms) {
  constexpr uint64_t kQuietMs = 1000;
  *bytes_read = 0;
  if (before_read) before_read();
  if (!rule_.shielded && std::exchange(cancelled_, false)) return S_FALSE;
  auto* const out = static_cast<uint8_t*>(buffer);
  while (*bytes_read < size) {
    const uint64_t wait = *bytes_read == 0 ? timeout_ms : std::min<uint64_t>(kQuietMs, timeout_ms);
    const sim::Bytes bytes = port_.Read(size - *bytes_read, wait);
    if (bytes.empty()) break;
    std::ranges::copy(bytes, out + *bytes_read);
    *bytes_read += static_cast<DWORD>(bytes.size());
    if (IsUsb()) break;
  }
  return *bytes_read == 0 ? kTimedOut : S_OK;
}

HRESULT SimulatedConnection::Write(const void* buffer, DWORD size, DWORD) {
  port_.Write(std::span(static_cast<const uint8_t*>(buffer), size), speed_);
  return S_OK;
}

HRESULT SimulatedConnection::Flush() {
  port_.Purge();
  return S_OK;
}

HRESULT SimulatedConnection::GetInstanceType(EInstanceType* type) {
  *type = IsUsb() ? eInstanceUSB : eInstanceSerial;
  return S_OK;
}

HRESULT SimulatedConnection::GetName(BSTR* name) {
  *name = CopyBstr(L"memory").release();
  return S_OK;
}

HRESULT SimulatedConnection::GetSpeed(DWORD* speed) {
  *speed = speed_;
  return IsUsb() ? S_FALSE : S_OK;
}

HRESULT SimulatedConnection::SetSpeed(DWORD speed) {
  if (IsUsb() || speed == speed_) return S_FALSE;
  speed_ = speed;
  port_.SetHostSpeed(speed);
  return S_OK;
}
