#include "platform/mutex.h"

#include "platform/hresult.h"

Mutex::Mutex() : handle_(CreateMutexW(nullptr, FALSE, nullptr)) {
  if (!handle_) throw HResultError(HResultFromError(GetLastError()));
}

void Mutex::Lock() { WaitForSingleObject(handle_.get(), INFINITE); }

bool Mutex::Unlock() { return ReleaseMutex(handle_.get()) != FALSE; }
