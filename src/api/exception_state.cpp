// The C++ ABI has two functions that give a thread its exception state, __cxa_get_globals and
// __cxa_get_globals_fast. Those of libsupc++ keep it in an emulated thread-local variable: its key is
// never freed, and neither is what the thread library keeps for each thread that raised, so a host
// that loads and unloads the DLL runs out of TLS slots. The definitions here, which the linker
// takes instead, keep it in a fiber-local slot. Unlike a TLS slot it has a callback, which frees the
// state of a thread when that thread ends, and those of all threads when the slot is freed.
//
// Only the DLL has this source. Programs end with their runtime, and need none of it.
#include "api/exception_state.h"

#include <cxxabi.h>

#include <atomic>
#include <cstdlib>

#include "platform/win32.h"

namespace __cxxabiv1 {

// As the ABI lays it out. All zero for a new thread.
struct __cxa_eh_globals {
  void* caught_exceptions;
  unsigned int uncaught_exceptions;
};

}  // namespace __cxxabiv1

namespace __gnu_cxx {

// Frees the memory that libsupc++ sets aside at load for exceptions raised when there is no other.
// No header declares it.
void __freeres();

}  // namespace __gnu_cxx

namespace {

using State = abi::__cxa_eh_globals;

constinit std::atomic<DWORD> state_slot = FLS_OUT_OF_INDEXES;

void WINAPI FreeState(void* state) { std::free(state); }

// The slot, made when the first exception of all is raised. Without one there is no way to go on: a
// raise calls this, so it cannot raise.
DWORD StateSlot() {
  const DWORD slot = state_slot;
  if (slot != FLS_OUT_OF_INDEXES) return slot;
  const DWORD own = FlsAlloc(FreeState);
  if (own == FLS_OUT_OF_INDEXES) std::abort();
  DWORD first = FLS_OUT_OF_INDEXES;
  if (state_slot.compare_exchange_strong(first, own)) return own;
  FlsFree(own);  // another thread was first
  return first;
}

State* ThreadState() {
  const DWORD last_error = GetLastError();  // a raise leaves it as it is
  const DWORD slot = StateSlot();
  auto* state = static_cast<State*>(FlsGetValue(slot));
  if (!state) {
    // Not operator new: libsupc++'s raises inside, even the one that gives null.
    state = static_cast<State*>(std::calloc(1, sizeof(State)));
    if (!state || !FlsSetValue(slot, state)) std::abort();
  }
  SetLastError(last_error);
  return state;
}

}  // namespace

extern "C" abi::__cxa_eh_globals* abi::__cxa_get_globals() noexcept { return ThreadState(); }

extern "C" abi::__cxa_eh_globals* abi::__cxa_get_globals_fast() noexcept { return ThreadState(); }

void FreeExceptionState() {
  const DWORD slot = state_slot.exchange(FLS_OUT_OF_INDEXES);
  if (slot != FLS_OUT_OF_INDEXES) FlsFree(slot);
  __gnu_cxx::__freeres();
}
