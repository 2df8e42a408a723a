#include "simulator/damage_text.h"

#include <gtest/gtest.h>

#include <stdexcept>

namespace sim {
namespace {

TEST(DamageTextTest, ARateIsAChance) {
  EXPECT_EQ(ParseRate("0"), 0);
  EXPECT_EQ(ParseRate("1"), 1);
  EXPECT_EQ(ParseRate("1e-4"), 0.0001);
  for (const char* text : {"", "x", "-0.1", "1.1", "nan", "0.1 "}) {
    EXPECT_THROW(ParseRate(text), std::invalid_argument) << text;
  }
}

TEST(DamageTextTest, KindsAreAList) {
  EXPECT_EQ(ParseNoiseKinds("flip"), std::vector<NoiseKind>{NoiseKind::kFlip});
  EXPECT_EQ(ParseNoiseKinds("flip,drop,insert,double,burst,stall,unplug"), AllNoiseKinds());
  for (const char* text : {"", "flop", "flip,", ",flip", "flip;drop"}) {
    EXPECT_THROW(ParseNoiseKinds(text), std::invalid_argument) << text;
  }
}

TEST(DamageTextTest, AnEventHasAStartAndADuration) {
  const LineEvent unplug = ParseLineEvent(LineEventKind::kUnplug, "time=2.5:10");
  EXPECT_EQ(unplug.kind, LineEventKind::kUnplug);
  EXPECT_EQ(unplug.start, LineEventStart::kTime);
  EXPECT_EQ(unplug.at, 2500U);
  EXPECT_EQ(unplug.duration_ms, 10'000U);

  const LineEvent silence = ParseLineEvent(LineEventKind::kSilence, "byte=5000000000:0.5");
  EXPECT_EQ(silence.kind, LineEventKind::kSilence);
  EXPECT_EQ(silence.start, LineEventStart::kByte);
  EXPECT_EQ(silence.at, 5'000'000'000U);
  EXPECT_EQ(silence.duration_ms, 500U);

  EXPECT_EQ(ParseLineEvent(LineEventKind::kUnplug, "block=7").start, LineEventStart::kBlock);
}

TEST(DamageTextTest, OnlyAnUnpluggingMayBeForEver) {
  EXPECT_EQ(ParseLineEvent(LineEventKind::kUnplug, "block=7").duration_ms, std::nullopt);
  EXPECT_THROW(ParseLineEvent(LineEventKind::kSilence, "block=7"), std::invalid_argument);
}

TEST(DamageTextTest, WrongEventsAreErrors) {
  for (const char* text : {"",
                           "7",
                           "block",
                           "block=",
                           "block=x",
                           "block=-1",
                           "times=3",
                           "time=-1",
                           "byte=1:x",
                           "byte=1:"}) {
    EXPECT_THROW(ParseLineEvent(LineEventKind::kUnplug, text), std::invalid_argument) << text;
  }
}

}  // namespace
}  // namespace sim
