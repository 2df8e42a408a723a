#include "tests/support/resources.h"

#include <windows.h>

#include <psapi.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <ostream>
#include <span>
#include <vector>

namespace {

// Handles are multiples of four, and the lowest free one is given out first.
constexpr uintptr_t kStep = 4;
constexpr uintptr_t kEnd = 4096 * kStep;

template <typename Allocate, typename Free>
size_t CountFree(DWORD none_left, Allocate allocate, Free free) {
  std::vector<DWORD> slots;
  for (DWORD slot; (slot = allocate()) != none_left;) slots.push_back(slot);
  std::ranges::for_each(slots, free);
  return slots.size();
}

size_t BytesOf(HANDLE heap) {
  size_t bytes = 0;
  HeapLock(heap);
  for (PROCESS_HEAP_ENTRY entry{}; HeapWalk(heap, &entry);) {
    if (entry.wFlags & PROCESS_HEAP_ENTRY_BUSY) bytes += entry.cbData;
  }
  HeapUnlock(heap);
  return bytes;
}

}  // namespace

size_t HandleCount() {
  size_t count = 0;
  for (uintptr_t value = kStep; value < kEnd; value += kStep) {
    DWORD flags = 0;
    if (GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags)) ++count;
  }
  return count;
}

std::ostream& operator<<(std::ostream& stream, const Resources& resources) {
  return stream << resources.handles << " handles, " << resources.free_tls_slots
                << " free TLS slots, " << resources.free_fls_slots << " free FLS slots";
}

Resources CountResources() {
  return {.handles = HandleCount(),
          .free_tls_slots = CountFree(TLS_OUT_OF_INDEXES, TlsAlloc, TlsFree),
          .free_fls_slots = CountFree(
              FLS_OUT_OF_INDEXES, [] { return FlsAlloc(nullptr); }, FlsFree)};
}

size_t HeapBytes() {
  std::array<HANDLE, 64> heaps{};
  const DWORD count = GetProcessHeaps(heaps.size(), heaps.data());
  size_t bytes = 0;
  for (const HANDLE heap : std::span(heaps).first(std::min<size_t>(count, heaps.size()))) {
    bytes += BytesOf(heap);
  }
  return bytes;
}

size_t WorkingSetBytes() {
  PROCESS_MEMORY_COUNTERS counters{};
  K32GetProcessMemoryInfo(GetCurrentProcess(), &counters, sizeof(counters));
  return counters.WorkingSetSize;
}
