// The exceptions of this program keep their state in the DLL's own way.
#include "api/exception_state.h"

#include <gtest/gtest.h>

#include <exception>
#include <stdexcept>
#include <thread>

#include "platform/win32.h"
#include "tests/support/resources.h"

namespace {

size_t FreeFiberSlots() { return CountResources().free_fls_slots; }

void Raise() { EXPECT_THROW(throw std::runtime_error("any"), std::runtime_error); }

// Code between a Win32 call that failed and GetLastError may raise and catch an exception.
TEST(ExceptionState, KeepsTheLastErrorOfAThread) {
  DWORD before = 0;
  DWORD after = 0;
  std::thread([&] {
    SetLastError(ERROR_SEM_TIMEOUT);
    before = static_cast<DWORD>(std::uncaught_exceptions());  // makes the state of the thread
    after = GetLastError();
  }).join();
  EXPECT_EQ(before, 0U);
  EXPECT_EQ(after, static_cast<DWORD>(ERROR_SEM_TIMEOUT));
}

TEST(ExceptionState, IsEachThreadsOwn) {
  try {
    throw std::runtime_error("of the first thread");
  } catch (const std::runtime_error&) {
    std::exception_ptr seen = std::current_exception();
    std::thread([&] { seen = std::current_exception(); }).join();
    EXPECT_FALSE(seen) << "the second thread handles the first one's exception";
    EXPECT_TRUE(std::current_exception());
  }
}

TEST(ExceptionState, HasOneSlotForAllThreads) {
  Raise();
  const size_t before = FreeFiberSlots();
  for (int i = 0; i < 10; ++i) std::thread(Raise).join();
  EXPECT_EQ(FreeFiberSlots(), before);
}

TEST(ExceptionState, IsFreedWithItsSlotAndMadeAgain) {
  Raise();
  const size_t with_slot = FreeFiberSlots();
  rcvlink::FreeExceptionState();
  EXPECT_EQ(FreeFiberSlots(), with_slot + 1);
  rcvlink::FreeExceptionState();
  EXPECT_EQ(FreeFiberSlots(), with_slot + 1) << "it was freed twice";
  Raise();
  EXPECT_EQ(FreeFiberSlots(), with_slot);
}

}  // namespace
