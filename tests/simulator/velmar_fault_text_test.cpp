#include "simulator/velmar/fault_text.h"

#include <gtest/gtest.h>

#include <stdexcept>

namespace sim {
namespace {

using ChunkKind = VelmarChunkFaultKind;
using ReplyKind = VelmarReplyFaultKind;

TEST(VelmarFaultTextTest, AChunkFaultHappensOnceByDefault) {
  const VelmarChunkFault fault = ParseChunkFault(ChunkKind::kWrongSync, "12");
  EXPECT_EQ(fault.kind, ChunkKind::kWrongSync);
  EXPECT_EQ(fault.chunk, 12U);
  EXPECT_EQ(fault.times, kOnce);
  EXPECT_EQ(ParseChunkFault(ChunkKind::kDamagedCrc, "0@always").times, kAlways);
}

TEST(VelmarFaultTextTest, AChunkFaultMayHaveAnAmount) {
  const VelmarChunkFault fault = ParseChunkFault(ChunkKind::kMessageLength, "3:2000@2");
  EXPECT_EQ(fault.chunk, 3U);
  EXPECT_EQ(fault.amount, 2000U);
  EXPECT_EQ(fault.times, 2U);
  EXPECT_EQ(ParseChunkFault(ChunkKind::kSilence, "1:2.5").amount, 2500U);
  EXPECT_EQ(ParseChunkFault(ChunkKind::kHeaderLength, "1:255").amount, 255U);
  EXPECT_EQ(ParseChunkFault(ChunkKind::kBodyLength, "1:65535").amount, 65535U);
}

TEST(VelmarFaultTextTest, AReplyFaultHappensAlwaysByDefault) {
  const VelmarReplyFault fault = ParseReplyFault(ReplyKind::kRefused, "log direnta");
  EXPECT_EQ(fault.command, "log direnta");
  EXPECT_EQ(fault.times, kAlways);
  EXPECT_EQ(ParseReplyFault(ReplyKind::kMute, "com@1").times, 1U);
}

TEST(VelmarFaultTextTest, AnAmountMayBeForAnyCommand) {
  const VelmarReplyFault any = ParseReplyFault(ReplyKind::kLatePrompt, "0.7");
  EXPECT_EQ(any.amount, 700);
  EXPECT_EQ(any.command, kAnyVelmarCommand);
  const VelmarReplyFault one = ParseReplyFault(ReplyKind::kCount, "-1:log versiona@7");
  EXPECT_EQ(one.amount, -1);
  EXPECT_EQ(one.command, "log versiona");
  EXPECT_EQ(one.times, 7U);
  EXPECT_EQ(ParseReplyFault(ReplyKind::kCount, "2147483647").amount, 2'147'483'647);
  EXPECT_EQ(ParseReplyFault(ReplyKind::kEndlessPrompt, "5000000").amount, 5'000'000);
}

TEST(VelmarFaultTextTest, AComponentMayHaveAModel) {
  EXPECT_EQ(ParseComponent("ENCLOSURE").type, "ENCLOSURE");
  EXPECT_EQ(ParseComponent("ENCLOSURE").model, "");
  EXPECT_EQ(ParseComponent("ENCLOSURE:Box, red: 2").type, "ENCLOSURE");
  EXPECT_EQ(ParseComponent("ENCLOSURE:Box, red: 2").model, "Box, red: 2");
}

TEST(VelmarFaultTextTest, WrongTextIsAnError) {
  for (const char* text : {"", "x", "-1", "1x", "1@", "1@0", "1:5", "@1"}) {
    EXPECT_THROW(ParseChunkFault(ChunkKind::kDamagedCrc, text), std::invalid_argument) << text;
  }
  for (const char* text : {"1", "1:", "1:-1", "1:x", ":1", "1:256"}) {
    EXPECT_THROW(ParseChunkFault(ChunkKind::kHeaderLength, text), std::invalid_argument) << text;
  }
  EXPECT_THROW(ParseChunkFault(ChunkKind::kMessageLength, "1:65536"), std::invalid_argument);
  for (const char* text : {"", "0", "-5", "x:log", "100000001"}) {
    EXPECT_THROW(ParseReplyFault(ReplyKind::kEndlessPrompt, text), std::invalid_argument) << text;
    EXPECT_THROW(ParseReplyFault(ReplyKind::kGarbageBefore, text), std::invalid_argument) << text;
  }
  EXPECT_THROW(ParseReplyFault(ReplyKind::kSequenceGap, "0"), std::invalid_argument);
  EXPECT_THROW(ParseReplyFault(ReplyKind::kFewerFields, "-1"), std::invalid_argument);
  EXPECT_THROW(ParseReplyFault(ReplyKind::kLateLog, "-1"), std::invalid_argument);
  EXPECT_THROW(ParseReplyFault(ReplyKind::kMute, ""), std::invalid_argument);
  EXPECT_THROW(ParseComponent(""), std::invalid_argument);
  EXPECT_THROW(ParseComponent(":x"), std::invalid_argument);
}

}  // namespace
}  // namespace sim
