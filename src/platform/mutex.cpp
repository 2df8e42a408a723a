#include "platform/mutex.h"

#include "platform/hresult.h"

namespace rcvlink {

Mutex::Mutex() : handle_(CreateMutexW(nullptr, FALSE, nullptr)) {
  if (!handle_) throw HResultError(HResultFromError(GetLastError()));
}

// The result is not looked at: the wait for a mutex whose holder has ended gives another one, but
// takes the mutex as well.
void Mutex::Lock() { WaitForSingleObject(handle_.get(), INFINITE); }

bool Mutex::Unlock() { return ReleaseMutex(handle_.get()) != FALSE; }

}  // namespace rcvlink
