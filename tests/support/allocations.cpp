#include "tests/support/allocations.h"

#include <windows.h>

#include <atomic>
#include <cstdlib>
#include <new>

namespace {

// The thread whose allocations are counted; 0 for none. Only that thread uses the rest.
std::atomic<DWORD> counted_thread = 0;
int uncounted_scopes = 0;

size_t count = 0;
size_t bytes = 0;
size_t failing = Allocations::kNone;
ptrdiff_t live = 0;

bool IsCounted() { return counted_thread.load() == GetCurrentThreadId() && uncounted_scopes == 0; }

void* Allocate(size_t size) {
  const bool counted = IsCounted();
  if (counted && count++ == failing) throw std::bad_alloc();
  void* const memory = std::malloc(size == 0 ? 1 : size);
  if (!memory) throw std::bad_alloc();
  if (counted) {
    bytes += size;
    ++live;
  }
  return memory;
}

void Free(void* memory) {
  if (memory && IsCounted()) --live;
  std::free(memory);
}

}  // namespace

Allocations::Allocations(size_t number) {
  count = 0;
  bytes = 0;
  live = 0;
  failing = number;
  counted_thread = GetCurrentThreadId();
}

Allocations::~Allocations() { counted_thread = 0; }

size_t Allocations::Count() { return count; }

size_t Allocations::Bytes() { return bytes; }

ptrdiff_t Allocations::Live() { return live; }

bool Allocations::HasFailed() { return count > failing; }

UncountedAllocations::UncountedAllocations() {
  if (counted_thread.load() == GetCurrentThreadId()) ++uncounted_scopes;
}

UncountedAllocations::~UncountedAllocations() {
  if (uncounted_scopes > 0) --uncounted_scopes;
}

void* operator new(size_t size) { return Allocate(size); }
void* operator new[](size_t size) { return Allocate(size); }
void operator delete(void* memory) noexcept { Free(memory); }
void operator delete[](void* memory) noexcept { Free(memory); }
void operator delete(void* memory, size_t) noexcept { Free(memory); }
void operator delete[](void* memory, size_t) noexcept { Free(memory); }
