#include "simulator/noise.h"

#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

namespace sim {
namespace {

constexpr int kBytes = 100'000;

std::vector<std::optional<Damage>> Draw(Noise noise, int count) {
  std::vector<std::optional<Damage>> drawn;
  for (int i = 0; i < count; ++i) {
    drawn.push_back(noise.Next());
  }
  return drawn;
}

// In a form that can be compared and printed.
std::vector<int64_t> Sample(double rate, uint64_t seed) {
  std::vector<int64_t> sample;
  for (const auto& damage : Draw(Noise(rate, AllNoiseKinds(), seed), kBytes)) {
    sample.push_back(damage ? static_cast<int64_t>(damage->kind) * 100'000 + damage->amount : -1);
  }
  return sample;
}

std::map<NoiseKind, int> Count(double rate, const std::vector<NoiseKind>& kinds, int bytes) {
  std::map<NoiseKind, int> counts;
  for (const auto& damage : Draw(Noise(rate, kinds, /*seed=*/1), bytes)) {
    if (damage) ++counts[damage->kind];
  }
  return counts;
}

TEST(NoiseTest, TheSameSeedGivesTheSameDamage) {
  EXPECT_TRUE(Sample(0.01, 7) == Sample(0.01, 7));
  EXPECT_FALSE(Sample(0.01, 7) == Sample(0.01, 8));
}

// A seed of an older report must go on meaning the same damage.
TEST(NoiseTest, ASeedMeansTheSameEverywhere) {
  std::vector<std::string> seen;
  const auto drawn = Draw(Noise(0.01, AllNoiseKinds(), 7), 200);
  for (size_t i = 0; i < drawn.size(); ++i) {
    if (drawn[i]) {
      seen.push_back(std::to_string(i) + ' ' + std::string(NoiseName(drawn[i]->kind)) + ' ' +
                     std::to_string(drawn[i]->amount));
    }
  }
  EXPECT_EQ(seen,
            (std::vector<std::string>{"76 drop 0",
                                      "100 insert 98",
                                      "102 unplug 1338",
                                      "194 burst 238",
                                      "195 burst 144",
                                      "196 burst 9",
                                      "197 burst 211",
                                      "198 burst 148",
                                      "199 burst 30"}));
}

TEST(NoiseTest, TheRateIsTheShareOfDamagedBytes) {
  EXPECT_TRUE(Count(0, AllNoiseKinds(), kBytes).empty());
  EXPECT_NEAR(Count(0.01, {NoiseKind::kFlip}, kBytes)[NoiseKind::kFlip], kBytes / 100, 100);
  EXPECT_EQ(Count(1, {NoiseKind::kDrop}, 1000)[NoiseKind::kDrop], 1000);
}

TEST(NoiseTest, AllKindsAreEquallyLikely) {
  auto counts = Count(0.07, AllNoiseKinds(), kBytes);
  for (const NoiseKind kind : AllNoiseKinds()) {
    if (kind != NoiseKind::kBurst) {
      EXPECT_NEAR(counts[kind], kBytes / 100, 150) << NoiseName(kind);
    }
  }
}

TEST(NoiseTest, OnlyTheKindsThatAreAskedForHappen) {
  const auto counts = Count(0.5, {NoiseKind::kDouble, NoiseKind::kStall}, 1000);
  EXPECT_EQ(counts.size(), 2U);
  EXPECT_TRUE(counts.contains(NoiseKind::kDouble));
  EXPECT_TRUE(counts.contains(NoiseKind::kStall));
}

TEST(NoiseTest, AFlipIsOneBitAndABurstDamagesEachOfItsBytes) {
  for (const auto& damage : Draw(Noise(1, {NoiseKind::kFlip}, 3), 1000)) {
    EXPECT_EQ(damage->amount & (damage->amount - 1), 0U);
    EXPECT_TRUE(damage->amount >= 1 && damage->amount <= 0x80) << damage->amount;
  }
  for (const auto& damage : Draw(Noise(1, {NoiseKind::kBurst}, 3), 1000)) {
    EXPECT_TRUE(damage->amount >= 1 && damage->amount <= 0xFF) << damage->amount;
  }
}

TEST(NoiseTest, ABurstHasTwoToSixteenBytes) {
  const auto drawn = Draw(Noise(0.0005, {NoiseKind::kBurst}, 3), kBytes);
  std::map<size_t, int> lengths;
  size_t length = 0;
  for (const auto& damage : drawn) {
    if (damage) {
      ++length;
    } else if (length > 0) {
      ++lengths[length];
      length = 0;
    }
  }
  // Two bursts may follow each other.
  EXPECT_GE(lengths.begin()->first, 2U);
  EXPECT_LE(lengths.rbegin()->first, 32U);
  EXPECT_GE(lengths.size(), 10U);
}

}  // namespace
}  // namespace sim
