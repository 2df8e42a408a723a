#include "tests/host/support/handle_count.h"

#include <windows.h>

#include <cstdint>

namespace host {
namespace {

// Handles are multiples of four, and the lowest free one is given out first.
constexpr uintptr_t kStep = 4;
constexpr uintptr_t kEnd = 4096 * kStep;

}  // namespace

size_t HandleCount() {
  size_t count = 0;
  for (uintptr_t value = kStep; value < kEnd; value += kStep) {
    DWORD flags = 0;
    if (GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags)) ++count;
  }
  return count;
}

}  // namespace host
