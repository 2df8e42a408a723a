#include "platform/critical_section.h"

#include <gtest/gtest.h>

#include <mutex>
#include <thread>

#include "platform/event.h"
#include "platform/handle.h"

using rcvlink::CriticalSection;
using rcvlink::IsSignalled;
using rcvlink::KernelHandle;

namespace {

TEST(CriticalSection, MayBeTakenAgainByItsHolder) {
  CriticalSection section;
  const std::scoped_lock outer(section);
  const std::scoped_lock inner(section);
}

// The other thread has said that it asks for the section. Unless the section keeps it out, it gets
// through while this thread gives it the time to.
TEST(CriticalSection, KeepsOtherThreadsOut) {
  constexpr int kYields = 1000;
  CriticalSection section;
  const KernelHandle asks(CreateEventW(nullptr, TRUE, FALSE, nullptr));
  const KernelHandle passed(CreateEventW(nullptr, TRUE, FALSE, nullptr));
  std::thread other;
  {
    const std::scoped_lock lock(section);
    other = std::thread([&] {
      SetEvent(asks.get());
      const std::scoped_lock theirs(section);
      SetEvent(passed.get());
    });
    WaitForSingleObject(asks.get(), INFINITE);
    for (int i = 0; i < kYields; ++i) std::this_thread::yield();
    EXPECT_FALSE(IsSignalled(passed.get()));
  }
  other.join();
  EXPECT_TRUE(IsSignalled(passed.get()));
}

}  // namespace
