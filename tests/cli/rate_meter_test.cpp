#include "rate_meter.h"

#include <gtest/gtest.h>

namespace cli {
namespace {

TEST(RateMeterTest, IsUnknownAtFirst) {
  RateMeter meter;
  EXPECT_EQ(meter.BytesPerSecond(), 0U);
  meter.Add(100, 0);
  EXPECT_EQ(meter.BytesPerSecond(), 0U);
  meter.Add(350, 500);
  EXPECT_EQ(meter.BytesPerSecond(), 2000U);
}

// A slow start of the transfer must not affect the rate later.
TEST(RateMeterTest, ForgetsWhatIsLongAgo) {
  RateMeter meter;
  meter.Add(0, 0);
  for (uint64_t ms = 60'000; ms <= 70'000; ms += 100) meter.Add(ms, (ms - 60'000) * 10);
  EXPECT_EQ(meter.BytesPerSecond(), 10'000U);
}

TEST(RateMeterTest, FallsToNothingWhenNothingArrives) {
  RateMeter meter;
  for (uint64_t ms = 0; ms <= 10'000; ms += 100) meter.Add(ms, 1000);
  EXPECT_EQ(meter.BytesPerSecond(), 0U);
}

}  // namespace
}  // namespace cli
