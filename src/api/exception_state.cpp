// The C++ ABI has two functions that give a thread its exception state, __cxa_get_globals and
// __cxa_get_globals_fast. Those of libsupc++ keep the state in an emulated thread-local variable.
// Its key is never freed, nor is the memory of each thread that raised an exception, so a host that
// loads and unloads the DLL again and again runs out of TLS slots.
//
// The linker takes the definitions below instead. They keep the state in a fiber-local slot. Unlike
// a TLS slot it has a callback, which frees a thread's state when the thread ends, and the states
// of all threads when the slot is freed.
//
// Only the DLL needs this source: in a program the runtime ends with the process. The unit tests have it too.
#include "api/exception_state.h"

#include <cxxabi.h>

#include <atomic>
#include <cstdlib>

#include "platform/win32.h"

namespace __cxxabiv1 {

// The layout is that of the C++ ABI. All zero for a new thread.
struct __cxa_eh_globals {
  void* caught_exceptions;
  unsigned int uncaught_exceptions;
};

}  // namespace __cxxabiv1

namespace __gnu_cxx {

// Frees the memory that libsupc++ allocates at load, for exceptions that are raised when no memory
// is left. No header declares the function.
void __freeres();  // NOLINT(bugprone-reserved-identifier)

}  // namespace __gnu_cxx

namespace {

using State = abi::__cxa_eh_globals;

constinit std::atomic<DWORD> state_slot = FLS_OUT_OF_INDEXES;

void WINAPI FreeState(void* state) { std::free(state); }

// The slot, allocated when the first exception is raised. Without a slot the process ends: this is
// a part of raising an exception, so it cannot raise one.
DWORD StateSlot() {
  const DWORD slot = state_slot;
  if (slot != FLS_OUT_OF_INDEXES) return slot;
  const DWORD own = FlsAlloc(FreeState);
  if (own == FLS_OUT_OF_INDEXES) std::abort();
  DWORD first = FLS_OUT_OF_INDEXES;
  if (state_slot.compare_exchange_strong(first, own)) return own;
  FlsFree(own);  // another thread has set its slot meanwhile
  return first;
}

State* ThreadState() {
  const DWORD last_error = GetLastError();  // raising an exception must not change it
  const DWORD slot = StateSlot();
  auto* state = static_cast<State*>(FlsGetValue(slot));
  if (!state) {
    // Not operator new: that of libsupc++ raises an exception when there is no memory, also inside
    // the form that gives null, and would come here again.
    state = static_cast<State*>(std::calloc(1, sizeof(State)));
    if (!state || !FlsSetValue(slot, state)) std::abort();
  }
  SetLastError(last_error);
  return state;
}

}  // namespace

extern "C" abi::__cxa_eh_globals* abi::__cxa_get_globals() noexcept { return ThreadState(); }

extern "C" abi::__cxa_eh_globals* abi::__cxa_get_globals_fast() noexcept { return ThreadState(); }

void rcvlink::FreeExceptionState() {
  const DWORD slot = state_slot.exchange(FLS_OUT_OF_INDEXES);
  if (slot != FLS_OUT_OF_INDEXES) FlsFree(slot);
  __gnu_cxx::__freeres();
}
