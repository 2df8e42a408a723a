// A receiver's lock, as another thread sees it.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_LOCK_H_
#define RCVLINK_TESTS_HOST_SUPPORT_LOCK_H_

#include "rcvlink.h"
#include "tests/host/support/receiver.h"

namespace host {

// What another thread gets at once: S_OK if the lock was free (it is released again), otherwise
// S_FALSE.
inline long TryLockElsewhere(void* receiver) {
  return OnThread([receiver] {
           const Event at_once(true);
           const long result = devapi::LockConnection(receiver, at_once.get());
           if (result == S_OK) devapi::UnlockConnection(receiver);
           return result;
         })
      .get();
}

}  // namespace host

#endif  // RCVLINK_TESTS_HOST_SUPPORT_LOCK_H_
