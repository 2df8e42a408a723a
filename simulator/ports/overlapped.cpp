#include "simulator/ports/overlapped.h"

#include <algorithm>
#include <system_error>
#include <utility>

namespace sim {

void ThrowLastError(const char* what) {
  throw std::system_error(static_cast<int>(GetLastError()), std::system_category(), what);
}

UniqueHandle MakeEvent() {
  UniqueHandle event(CreateEventW(nullptr, /*bManualReset=*/TRUE, FALSE, nullptr));
  if (event.get() == nullptr) {
    ThrowLastError("cannot make an event");
  }
  return event;
}

void WaitForEvents(const std::vector<HANDLE>& events, std::optional<uint64_t> wait_ms) {
  const auto limit = static_cast<DWORD>(std::min<uint64_t>(wait_ms.value_or(INFINITE), INFINITE));
  const DWORD happened = WaitForMultipleObjects(
      static_cast<DWORD>(events.size()), events.data(), /*bWaitAll=*/FALSE, limit);
  if (happened == WAIT_FAILED) {
    ThrowLastError("cannot wait for the port");
  }
}

bool IsSet(HANDLE event) { return WaitForSingleObject(event, 0) == WAIT_OBJECT_0; }

void OverlappedTransfer::Cancel() {
  if (on_its_way_) {
    CancelIoEx(file_, &overlapped_);
    Finish();
  }
}

bool OverlappedTransfer::StartConnect() { return Started(ConnectNamedPipe(file_, Prepare())); }

bool OverlappedTransfer::StartRead(size_t count) {
  bytes_.resize(count);
  return Started(
      ReadFile(file_, bytes_.data(), static_cast<DWORD>(bytes_.size()), nullptr, Prepare()));
}

bool OverlappedTransfer::StartWrite(Bytes bytes) {
  bytes_ = std::move(bytes);
  return Started(
      WriteFile(file_, bytes_.data(), static_cast<DWORD>(bytes_.size()), nullptr, Prepare()));
}

std::optional<size_t> OverlappedTransfer::Finish() {
  DWORD length = 0;
  const BOOL done = GetOverlappedResult(file_, &overlapped_, &length, /*bWait=*/TRUE);
  on_its_way_ = false;
  ResetEvent(event_.get());
  if (!done) {
    return std::nullopt;
  }
  return length;
}

OVERLAPPED* OverlappedTransfer::Prepare() {
  overlapped_ = {};
  overlapped_.hEvent = event_.get();
  return &overlapped_;
}

bool OverlappedTransfer::Started(BOOL done) {
  const DWORD error = done ? ERROR_SUCCESS : GetLastError();
  if (error == ERROR_PIPE_CONNECTED) {
    // Nothing is pending, and nobody sets the event.
    overlapped_.Internal = 0;
    SetEvent(event_.get());
    on_its_way_ = true;
    return true;
  }
  on_its_way_ = error == ERROR_SUCCESS || error == ERROR_IO_PENDING;
  return on_its_way_;
}

}  // namespace sim
