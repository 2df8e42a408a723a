#include "api/registry.h"

#include <mutex>
#include <utility>

#include "platform/api_types.h"
#include "platform/hresult.h"
#include "platform/process_object.h"
#include "report/report_file.h"

namespace rcvlink {
namespace {

// Letter case counts: names are compared as the host gave them. A null name equals an empty one.
bool IsSameName(wchar_t* left, wchar_t* right) {
  constexpr ULONG kNoFlags = 0;
  return VarBstrCmp(left, right, LOCALE_USER_DEFAULT, kNoFlags) == static_cast<HRESULT>(VARCMP_EQ);
}

constinit ProcessObject<ReceiverRegistry> registry;

}  // namespace

HRESULT ReceiverRegistry::Insert(const wchar_t* port,
                                 std::shared_ptr<CIReceiver> receiver,
                                 void** handle) {
  return CatchResult([&] {
    void* const address = receiver.get();
    Entry entry{.port = CopyBstr(port), .receiver = std::move(receiver)};
    const std::scoped_lock lock(lock_);
    entries_.emplace(address, std::move(entry));
    *handle = address;
    return S_OK;
  });
}

std::shared_ptr<CIReceiver> ReceiverRegistry::Find(void* handle) {
  const std::scoped_lock lock(lock_);
  const auto found = entries_.find(handle);
  return found == entries_.end() ? nullptr : found->second.receiver;
}

HRESULT ReceiverRegistry::Open(const wchar_t* port, void** handle) {
  if (!handle) return E_INVALIDARG;
  const std::scoped_lock lock(lock_);
  if (entries_.empty()) return S_FALSE;
  const UniqueBstr name = CopyBstr(port);
  for (auto& [address, entry] : entries_) {
    if (!IsSameName(entry.port.get(), name.get())) continue;
    ++entry.use_count;
    Trace(L"OpenReceiver - ref [%u] [%s]\r\n", entry.use_count, port);
    *handle = address;
    return S_OK;
  }
  return S_FALSE;
}

HRESULT ReceiverRegistry::Close(void* handle) {
  const std::scoped_lock lock(lock_);
  const auto found = entries_.find(handle);
  if (found == entries_.end()) {
    Trace(L"CloseReceiver - receiver not found [0x%p]\r\n", handle);
    return E_INVALIDARG;
  }
  Entry& entry = found->second;
  if (--entry.use_count != 0) {
    Trace(L"CloseReceiver - ref [%u] [%s]\r\n", entry.use_count, entry.port.get());
    return S_FALSE;
  }
  devapi::Abort(handle);  // takes the lock again, which is recursive
  Trace(L"CloseReceiver - removed [%s]\r\n", entry.port.get());
  entries_.erase(found);
  return S_OK;
}

HRESULT ReceiverRegistry::Destroy(const wchar_t* port) {
  if (!port) return E_INVALIDARG;
  const std::scoped_lock lock(lock_);
  if (entries_.empty()) return S_FALSE;
  const UniqueBstr name = CopyBstr(port);
  for (auto entry = entries_.begin(); entry != entries_.end(); ++entry) {
    if (!IsSameName(entry->second.port.get(), name.get())) continue;
    // Receivers of that name with more users lose one on the way: a host that lost its handles
    // calls this until nothing is left, and need not know how many users there were.
    if (--entry->second.use_count != 0) continue;
    Trace(L"DestroyReceiver - removed [%s]\r\n", port);
    const std::shared_ptr<CIReceiver> receiver = std::move(entry->second.receiver);
    entries_.erase(entry);
    // A call that is running keeps the receiver, and without a handle no host can abort it any
    // more.
    if (receiver.use_count() > 1) receiver->Stop();
    return S_OK;
  }
  return S_FALSE;
}

ReceiverRegistry& Receivers() { return registry.get(); }

}  // namespace rcvlink
