// The process-wide table of receivers. It owns them, counts their users and finds them by the names
// of their ports. A receiver's handle is its address.
#ifndef RCVLINK_API_REGISTRY_H_
#define RCVLINK_API_REGISTRY_H_

#include <cstdint>
#include <memory>
#include <unordered_map>

#include "platform/critical_section.h"
#include "platform/text.h"
#include "receiver/receiver.h"

namespace rcvlink {

class ReceiverRegistry {
 public:
  // Registers a new receiver with one user and gives its handle. E_OUTOFMEMORY: the receiver is
  // destroyed.
  HRESULT Insert(const wchar_t* port, std::shared_ptr<CIReceiver> receiver, void** handle);

  // The receiver of a handle, kept alive for as long as the caller holds the pointer; null when the
  // handle is unknown.
  std::shared_ptr<CIReceiver> Find(void* handle);

  // OpenReceiver, CloseReceiver and DestroyReceiver of rcvlink.h.
  HRESULT Open(const wchar_t* port, void** handle);
  HRESULT Close(void* handle);
  HRESULT Destroy(const wchar_t* port);

  // Closes every receiver, at unload. It takes no lock: no other thread is in the library then, and
  // a thread that the end of the process has stopped may still hold the lock.
  void Clear() { entries_.clear(); }

 private:
  struct Entry {
    uint32_t use_count = 1;
    UniqueBstr port;
    std::shared_ptr<CIReceiver> receiver;
  };

  CriticalSection lock_;  // guards the table, its entries and their counts
  std::unordered_map<void*, Entry> entries_;
};

// The registry of the process.
ReceiverRegistry& Receivers();

}  // namespace rcvlink

#endif  // RCVLINK_API_REGISTRY_H_
