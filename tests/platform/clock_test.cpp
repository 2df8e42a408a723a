#include "platform/clock.h"

#include <gtest/gtest.h>

#include "tests/support/manual_clock.h"

using rcvlink::Clock;
using rcvlink::CurrentClock;

namespace {

TEST(Clock, IsReplacedForAScope) {
  Clock* const system = &CurrentClock();
  {
    ManualClock outer;
    EXPECT_EQ(&CurrentClock(), &outer);
    {
      const ManualClock inner;
      EXPECT_EQ(&CurrentClock(), &inner);
    }
    EXPECT_EQ(&CurrentClock(), &outer);
  }
  EXPECT_EQ(&CurrentClock(), system);
}

TEST(Clock, OfTheSystemCountsMilliseconds) {
  const DWORD before = GetTickCount();
  const DWORD ticks = CurrentClock().Ticks();
  const DWORD after = GetTickCount();
  EXPECT_LE(ticks - before, after - before);
}

}  // namespace
