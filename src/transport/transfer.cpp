#include "transport/transfer.h"

#include <new>
#include <utility>

#include "platform/hresult.h"

namespace rcvlink {

HRESULT Transfer::Create(BOOL manual_reset, std::unique_ptr<Transfer>& transfer) {
  std::unique_ptr<Transfer> created(new (std::nothrow) Transfer);
  if (!created) return E_OUTOFMEMORY;
  created->event_ = KernelHandle(CreateEventW(nullptr, manual_reset, FALSE, nullptr));
  if (!created->event_) return HResultFromError(GetLastError());
  transfer = std::move(created);
  return S_OK;
}

void Transfer::Abandon(std::unique_ptr<Transfer> transfer) noexcept {
  static_cast<void>(transfer.release());
}

HRESULT Transfer::Prepare(size_t size) {
  if (!ResetEvent(event())) return HResultFromError(GetLastError());
  if (size > capacity_) {
    std::unique_ptr<uint8_t[]> larger(new (std::nothrow) uint8_t[size]);
    if (!larger) return E_OUTOFMEMORY;
    bytes_ = std::move(larger);
    capacity_ = size;
  }
  record_ = {};
  record_.hEvent = event();
  return S_OK;
}

}  // namespace rcvlink
