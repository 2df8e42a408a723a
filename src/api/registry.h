// The process-wide table that owns every live receiver, counts its users and finds it by the name
// of its port. A receiver's handle is its address.
#ifndef RCVLINK_API_REGISTRY_H_
#define RCVLINK_API_REGISTRY_H_

#include <cstdint>
#include <memory>
#include <unordered_map>

#include "platform/critical_section.h"
#include "platform/text.h"
#include "receiver/receiver.h"

class ReceiverRegistry {
 public:
  // Registers a new receiver with one user and gives its handle. E_OUTOFMEMORY: it is destroyed.
  HRESULT Insert(const wchar_t* port, std::shared_ptr<CIReceiver> receiver, void** handle);

  // The receiver of a handle, kept alive for as long as the caller holds the pointer; null when the
  // handle is unknown.
  std::shared_ptr<CIReceiver> Find(void* handle);

  // As the exported functions of these names, which hand their arguments on.
  HRESULT Open(const wchar_t* port, void** handle);
  HRESULT Close(void* handle);
  HRESULT Destroy(const wchar_t* port);

  // Lets go of every receiver, at unload. No other thread runs in the library then. Takes no lock: a
  // thread that the end of the process has stopped may hold it.
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

// The process's own.
ReceiverRegistry& Receivers();

#endif  // RCVLINK_API_REGISTRY_H_
