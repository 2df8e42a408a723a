// The limited resources that this process uses.
#ifndef RCVLINK_TESTS_SUPPORT_RESOURCES_H_
#define RCVLINK_TESTS_SUPPORT_RESOURCES_H_

#include <cstddef>
#include <iosfwd>

// The handles that are open. Asks for each handle value: Wine does not count
// (GetProcessHandleCount gives 0 there).
size_t HandleCount();

struct Resources {
  size_t handles = 0;
  size_t free_tls_slots = 0;
  size_t free_fls_slots = 0;
  bool operator==(const Resources&) const = default;
};

std::ostream& operator<<(std::ostream& stream, const Resources& resources);

// Takes and frees all free slots: no other thread may need one at that moment.
Resources CountResources();

// The bytes in use on all heaps of the process.
size_t HeapBytes();

// The bytes of memory that the process holds.
size_t WorkingSetBytes();

#endif  // RCVLINK_TESTS_SUPPORT_RESOURCES_H_
