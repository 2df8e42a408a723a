// Counts the allocations of a thread, and lets one of them fail. The program's `operator new` is
// replaced in every program that uses this.
#ifndef RCVLINK_TESTS_SUPPORT_ALLOCATIONS_H_
#define RCVLINK_TESTS_SUPPORT_ALLOCATIONS_H_

#include <cstddef>
#include <cstdint>

// Counts what the thread that made it allocates, while this lives. One at a time.
class Allocations {
 public:
  static constexpr size_t kNone = SIZE_MAX;

  // The allocation of this number, from 0, fails.
  explicit Allocations(size_t failing = kNone);
  Allocations(const Allocations&) = delete;
  Allocations& operator=(const Allocations&) = delete;
  ~Allocations();

  static size_t Count();      // how many there were
  static size_t Bytes();      // of how many bytes
  static ptrdiff_t Live();    // how many of them were not freed, less those of before that were
  static size_t LiveBytes();  // of how many bytes these are
  static size_t MostBytes();  // the most that LiveBytes was
  static bool HasFailed();
};

// What a test's own fakes allocate is not counted and does not fail.
class UncountedAllocations {
 public:
  UncountedAllocations();
  UncountedAllocations(const UncountedAllocations&) = delete;
  UncountedAllocations& operator=(const UncountedAllocations&) = delete;
  ~UncountedAllocations();
};

#endif  // RCVLINK_TESTS_SUPPORT_ALLOCATIONS_H_
