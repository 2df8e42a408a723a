// Memory of the kernel's pool, its owner, and lists that own what is linked into them.
#ifndef SIMULATOR_USB_DRIVER_MEMORY_H_
#define SIMULATOR_USB_DRIVER_MEMORY_H_

#include <cstddef>
#include <memory>

#include "simulator/usb/driver/kernel.h"

namespace usb_driver {

inline constexpr ULONG kPoolTag = 0x6B6E6C72;  // "rlnk"

struct PoolDeleter {
  template <typename T>
  void operator()(T* object) const {
    std::destroy_at(object);
    ExFreePoolWithTag(object, kPoolTag);
  }
};

template <typename T>
using Pooled = std::unique_ptr<T, PoolDeleter>;

// Makes an object with all members zero, and room for more bytes after it. Gives null when there is
// no memory.
template <typename T>
Pooled<T> Allocate(size_t more_bytes = 0) {
  void* const memory = ExAllocatePoolWithTag(NonPagedPool, sizeof(T) + more_bytes, kPoolTag);
  return Pooled<T>(memory == nullptr ? nullptr : std::construct_at(static_cast<T*>(memory)));
}

// The object that a link belongs to: the link is its first member.
template <typename T>
T* At(LIST_ENTRY* entry) {
  static_assert(offsetof(T, link) == 0);
  return reinterpret_cast<T*>(entry);
}

// The list owns the object from now on.
template <typename T>
void Append(LIST_ENTRY* list, Pooled<T> object) {
  InsertTailList(list, &object.release()->link);
}

// The caller owns the object from now on.
template <typename T>
Pooled<T> Unlink(T* object) {
  RemoveEntryList(&object->link);
  return Pooled<T>(object);
}

}  // namespace usb_driver

#endif  // SIMULATOR_USB_DRIVER_MEMORY_H_
