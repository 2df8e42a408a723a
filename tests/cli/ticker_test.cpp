#include "ticker.h"

#include <gtest/gtest.h>

#include "handle.h"

namespace cli {
namespace {

TEST(TickerTest, TicksUntilItIsDestroyed) {
  constexpr DWORD kPatienceMs = 10'000;
  const UniqueHandle ticked(CreateEventW(nullptr, FALSE, FALSE, nullptr));
  {
    const Ticker ticker(std::chrono::milliseconds(1), [&ticked] { SetEvent(ticked.get()); });
    EXPECT_EQ(WaitForSingleObject(ticked.get(), kPatienceMs), DWORD{WAIT_OBJECT_0});
    EXPECT_EQ(WaitForSingleObject(ticked.get(), kPatienceMs), DWORD{WAIT_OBJECT_0});
  }
  WaitForSingleObject(ticked.get(), 0);
  EXPECT_EQ(WaitForSingleObject(ticked.get(), 0), DWORD{WAIT_TIMEOUT});
}

TEST(TickerTest, EndsAtOnceHoweverLongItsInterval) {
  constexpr int kOften = 500;
  bool ticked = false;
  for (int i = 0; i < kOften; ++i) {
    const Ticker ticker(std::chrono::hours(1), [&ticked] { ticked = true; });
  }
  EXPECT_FALSE(ticked);
}

}  // namespace
}  // namespace cli
