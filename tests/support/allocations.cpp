#include "tests/support/allocations.h"

#include <malloc.h>
#include <windows.h>

#include <algorithm>
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
ptrdiff_t live_bytes = 0;
ptrdiff_t most_bytes = 0;

bool IsCounted() { return counted_thread.load() == GetCurrentThreadId() && uncounted_scopes == 0; }

void* Allocate(size_t size) {
  const bool counted = IsCounted();
  if (counted && count++ == failing) throw std::bad_alloc();
  void* const memory = std::malloc(size == 0 ? 1 : size);
  if (!memory) throw std::bad_alloc();
  if (counted) {
    bytes += size;
    ++live;
    live_bytes += static_cast<ptrdiff_t>(_msize(memory));
    most_bytes = std::max(most_bytes, live_bytes);
  }
  return memory;
}

void Free(void* memory) {
  if (memory && IsCounted()) {
    --live;
    live_bytes -= static_cast<ptrdiff_t>(_msize(memory));
  }
  std::free(memory);
}

}  // namespace

Allocations::Allocations(size_t number) {
  count = 0;
  bytes = 0;
  live = 0;
  live_bytes = 0;
  most_bytes = 0;
  failing = number;
  counted_thread = GetCurrentThreadId();
}

Allocations::~Allocations() { counted_thread = 0; }

size_t Allocations::Count() { return count; }

size_t Allocations::Bytes() { return bytes; }

ptrdiff_t Allocations::Live() { return live; }

size_t Allocations::LiveBytes() { return static_cast<size_t>(std::max<ptrdiff_t>(live_bytes, 0)); }

size_t Allocations::MostBytes() { return static_cast<size_t>(most_bytes); }

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
