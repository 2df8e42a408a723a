#include "platform/mutex.h"

#include <gtest/gtest.h>

#include <thread>

using rcvlink::Mutex;
using rcvlink::MutexGuard;

namespace {

// Whether another thread could take it at once.
bool IsFree(Mutex& mutex) {
  DWORD waited = WAIT_FAILED;
  std::thread([&] {
    waited = WaitForSingleObject(mutex.handle(), 0);
    if (waited == WAIT_OBJECT_0) mutex.Unlock();
  }).join();
  return waited == WAIT_OBJECT_0;
}

TEST(Mutex, IsHeldByOneThread) {
  Mutex mutex;
  EXPECT_TRUE(IsFree(mutex));
  mutex.Lock();
  EXPECT_FALSE(IsFree(mutex));
  EXPECT_TRUE(mutex.Unlock());
  EXPECT_TRUE(IsFree(mutex));
}

TEST(Mutex, IsUnlockedByItsHolderAlone) {
  Mutex mutex;
  EXPECT_FALSE(mutex.Unlock());
  mutex.Lock();
  bool unlocked = true;
  std::thread([&] { unlocked = mutex.Unlock(); }).join();
  EXPECT_FALSE(unlocked);
  EXPECT_FALSE(IsFree(mutex));
  EXPECT_TRUE(mutex.Unlock());
}

TEST(Mutex, IsUnlockedAsOftenAsItWasLocked) {
  Mutex mutex;
  mutex.Lock();
  mutex.Lock();
  EXPECT_TRUE(mutex.Unlock());
  EXPECT_FALSE(IsFree(mutex));
  EXPECT_TRUE(mutex.Unlock());
  EXPECT_TRUE(IsFree(mutex));
}

TEST(Mutex, OfAThreadThatHasEndedIsTaken) {
  Mutex mutex;
  std::thread([&] { mutex.Lock(); }).join();
  mutex.Lock();
  EXPECT_TRUE(mutex.Unlock());
}

TEST(MutexGuard, HoldsForAScope) {
  Mutex mutex;
  {
    const MutexGuard guard(mutex);
    EXPECT_FALSE(IsFree(mutex));
  }
  EXPECT_TRUE(IsFree(mutex));
}

TEST(MutexGuard, ReleasesOnce) {
  Mutex mutex;
  mutex.Lock();
  {
    MutexGuard guard(mutex);
    guard.Release();
    guard.Release();
  }
  EXPECT_FALSE(IsFree(mutex));
  EXPECT_TRUE(mutex.Unlock());
}

}  // namespace
