#include "simulator/quorin/fault_text.h"

#include <gtest/gtest.h>

#include <stdexcept>

namespace sim {
namespace {

TEST(FaultTextTest, ABlockFaultHappensOnceByDefault) {
  const BlockFault fault = ParseBlockFault(BlockFaultKind::kWrongEnd, "12");
  EXPECT_EQ(fault.kind, BlockFaultKind::kWrongEnd);
  EXPECT_EQ(fault.block, 12U);
  EXPECT_EQ(fault.times, kOnce);
  EXPECT_EQ(ParseBlockFault(BlockFaultKind::kWrongEnd, "0@4").times, 4U);
  EXPECT_EQ(ParseBlockFault(BlockFaultKind::kWrongEnd, "0@always").times, kAlways);
}

TEST(FaultTextTest, SilenceIsGivenInSeconds) {
  const BlockFault fault = ParseBlockFault(BlockFaultKind::kSilence, "3:2.5@2");
  EXPECT_EQ(fault.block, 3U);
  EXPECT_EQ(fault.silence_ms, 2500U);
  EXPECT_EQ(fault.times, 2U);
}

TEST(FaultTextTest, AReplyFaultHappensAlwaysByDefault) {
  const ReplyFault fault = ParseReplyFault(ReplyFaultKind::kRefused, "print,/log/&[name,size");
  EXPECT_EQ(fault.command, "print,/log/&[name,size");
  EXPECT_EQ(fault.times, kAlways);
  EXPECT_EQ(ParseReplyFault(ReplyFaultKind::kRefused, "get,@1").times, 1U);
  EXPECT_EQ(ParseReplyFault(ReplyFaultKind::kRefused, "get,@1").command, "get,");
}

TEST(FaultTextTest, AnAmountMayBeForAnyCommand) {
  const ReplyFault any = ParseReplyFault(ReplyFaultKind::kSilence, "9");
  EXPECT_EQ(any.amount, 9000);
  EXPECT_EQ(any.command, kAnyCommand);
  const ReplyFault one = ParseReplyFault(ReplyFaultKind::kWrongLength, "-3:get,\"a:b\"@7");
  EXPECT_EQ(one.amount, -3);
  EXPECT_EQ(one.command, "get,\"a:b\"");
  EXPECT_EQ(one.times, 7U);
}

TEST(FaultTextTest, AWrongSizeIsForAFile) {
  const SizeLie lie = ParseSizeLie("a=b=77");
  EXPECT_EQ(lie.file, "a=b");
  EXPECT_EQ(lie.size, 77U);
}

TEST(FaultTextTest, WrongTextIsAnError) {
  for (const char* text : {"", "x", "-1", "1x", "1@", "1@0", "1@x", "1@-1", "@1"}) {
    EXPECT_THROW(ParseBlockFault(BlockFaultKind::kLostByte, text), std::invalid_argument) << text;
  }
  for (const char* text : {"1", "1:", "1:-1", "1:x", ":1", "1:nan", "1:1e9"}) {
    EXPECT_THROW(ParseBlockFault(BlockFaultKind::kSilence, text), std::invalid_argument) << text;
  }
  for (const char* text : {"", "0", "-5", "x:get", "99999"}) {
    EXPECT_THROW(ParseReplyFault(ReplyFaultKind::kGarbageBefore, text), std::invalid_argument)
        << text;
  }
  EXPECT_THROW(ParseReplyFault(ReplyFaultKind::kMute, ""), std::invalid_argument);
  EXPECT_THROW(ParseReplyFault(ReplyFaultKind::kMute, "@2"), std::invalid_argument);
  for (const char* text : {"", "name", "=5", "name=", "name=x"}) {
    EXPECT_THROW(ParseSizeLie(text), std::invalid_argument) << text;
  }
}

}  // namespace
}  // namespace sim
