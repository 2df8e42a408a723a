// An unnamed Win32 mutex: unlike a critical section it can be waited for together with an event.
#ifndef RCVLINK_PLATFORM_MUTEX_H_
#define RCVLINK_PLATFORM_MUTEX_H_

#include "platform/handle.h"

namespace rcvlink {

class Mutex {
 public:
  Mutex();  // not held; raises the HRESULT of the Win32 error when it cannot be created

  HANDLE handle() const { return handle_.get(); }

  // Waits without limit.
  void Lock();
  // False when the calling thread does not hold the mutex.
  bool Unlock();

 private:
  KernelHandle handle_;
};

// Holds a mutex for a scope, or until it is released early.
class MutexGuard {
 public:
  explicit MutexGuard(Mutex& mutex) : mutex_(mutex) { mutex_.Lock(); }
  MutexGuard(const MutexGuard&) = delete;
  MutexGuard& operator=(const MutexGuard&) = delete;
  ~MutexGuard() { Release(); }

  void Release() {
    if (held_) mutex_.Unlock();
    held_ = false;
  }

 private:
  Mutex& mutex_;
  bool held_ = true;
};

}  // namespace rcvlink

#endif  // RCVLINK_PLATFORM_MUTEX_H_
