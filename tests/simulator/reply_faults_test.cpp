#include <gtest/gtest.h>

#include <string>

#include "tests/simulator/session.h"

namespace sim {
namespace {

constexpr const char* kAskId = "%1%print,/par/rcvid\r\n";
constexpr const char* kId = "RE00A%1%QR00421\r\n";
constexpr const char* kAskModel = "%2%print,/par/rcv/model\r\n";
constexpr const char* kModel = "RE00B%2%HVA3-G3T\r\n";

QuorinOptions WithFault(const ReplyFault& fault) {
  QuorinOptions options;
  options.faults.replies = {fault};
  return options;
}

TEST(ReplyFaultsTest, ARefusedCommandIsNotCarriedOut) {
  Session session(WithFault({ReplyFaultKind::kRefused, "remove,"}));
  EXPECT_EQ(session.Ask("%1%remove,A0101.log\r\n"), "ER00C%1%{refused}\r\n");
  EXPECT_TRUE(session.receiver.files().Find("A0101.log").has_value());
  EXPECT_EQ(session.Ask(kAskModel), kModel);
}

TEST(ReplyFaultsTest, ARefusalMayHappenOnce) {
  Session session(WithFault({ReplyFaultKind::kRefused, "print,/par/rcvid", kOnce}));
  EXPECT_EQ(session.Ask(kAskId), "ER00C%1%{refused}\r\n");
  EXPECT_EQ(session.Ask(kAskId), kId);
}

TEST(ReplyFaultsTest, AMuteReceiverIgnoresACommand) {
  Session session(WithFault({ReplyFaultKind::kMute, "remove,"}));
  EXPECT_EQ(session.Ask("%1%remove,A0101.log\r\n", 60'000), "");
  EXPECT_TRUE(session.receiver.files().Find("A0101.log").has_value());
  EXPECT_EQ(session.Ask(kAskModel), kModel);
}

TEST(ReplyFaultsTest, ThePingHasAName) {
  Session session(WithFault({ReplyFaultKind::kMute, std::string(kPingCommand), kOnce}));
  // Lines that are never answered do not count.
  EXPECT_EQ(session.Ask("\r\n"), "");
  EXPECT_EQ(session.Ask("%1%\r\n"), "");
  EXPECT_EQ(session.Ask("%2%\r\n"), "RE003%2%\r\n");
}

TEST(ReplyFaultsTest, AnyCommandMeansAnyThatIsAnswered) {
  Session session(WithFault({ReplyFaultKind::kMute, std::string(kAnyCommand), 2}));
  EXPECT_EQ(session.Ask("dm\r\n#OFF#\r\nset,/par/dev/ser/a/stops,2\r\n"), "");
  EXPECT_EQ(session.receiver.port_settings('a').size(), 1U);
  EXPECT_EQ(session.Ask(kAskId), "");
  EXPECT_EQ(session.Ask("%1%\r\n"), "");
  EXPECT_EQ(session.Ask(kAskId), kId);
}

TEST(ReplyFaultsTest, AnUntaggedSettingCanBeMuted) {
  Session session(WithFault({ReplyFaultKind::kMute, "set,/par/dev/ser/a/rate"}));
  session.Say("set,/par/dev/ser/a/rate,115200\r\n");
  EXPECT_EQ(session.receiver.speed(), kDefaultSpeed);
}

TEST(ReplyFaultsTest, ALateReplyComesWhenItIsDue) {
  Session session(WithFault({ReplyFaultKind::kSilence, std::string(kAnyCommand), kOnce, 8'000}));
  session.Say(kAskId);
  EXPECT_TRUE(session.port.Read(100, 7'999).empty());
  EXPECT_EQ(ToText(session.port.Read(100, 1)), kId);
  EXPECT_EQ(session.port.Now(), 8'000U);
  EXPECT_EQ(session.Ask(kAskModel), kModel);
}

TEST(ReplyFaultsTest, ALateReplyIsDiscardedByDm) {
  Session session(WithFault({ReplyFaultKind::kSilence, std::string(kAnyCommand), kOnce, 8'000}));
  session.Say(kAskId);
  EXPECT_EQ(session.Ask("dm\r\n", 20'000), "");
}

TEST(ReplyFaultsTest, GarbageComesFirst) {
  Session session(WithFault({ReplyFaultKind::kGarbageBefore, std::string(kAnyCommand), kOnce, 30}));
  const std::string reply = session.Ask(kAskId);
  ASSERT_EQ(reply.size(), 30 + std::string(kId).size());
  EXPECT_EQ(reply.substr(30), kId);
  EXPECT_EQ(reply.substr(0, 30).find_first_of(" RE"), std::string::npos);
  EXPECT_EQ(session.Ask(kAskId), kId);
}

TEST(ReplyFaultsTest, AMessageWithAnotherTagMayComeFirst) {
  Session session(WithFault({ReplyFaultKind::kOtherTagBefore}));
  EXPECT_EQ(session.Ask(kAskId), std::string("RE00B%19%another\r\n") + kId);
}

TEST(ReplyFaultsTest, TheReplyMayCarryAnotherTag) {
  Session session(WithFault({ReplyFaultKind::kOtherTagOnly}));
  EXPECT_EQ(session.Ask(kAskId), "RE00B%19%QR00421\r\n");
}

TEST(ReplyFaultsTest, TheHeaderMayHaveATooLargeOrTooSmallLength) {
  Session more(WithFault({ReplyFaultKind::kWrongLength, "print,", kAlways, 0x20}));
  EXPECT_EQ(more.Ask(kAskId), "RE02A%1%QR00421\r\n");
  EXPECT_EQ(more.Ask("%1%\r\n"), "RE003%1%\r\n");
  Session less(WithFault({ReplyFaultKind::kWrongLength, "print,", kAlways, -4}));
  EXPECT_EQ(less.Ask(kAskId), "RE006%1%QR00421\r\n");
  Session least(WithFault({ReplyFaultKind::kWrongLength, "print,", kAlways, -400}));
  EXPECT_EQ(least.Ask(kAskId), "RE000%1%QR00421\r\n");
  Session most(WithFault({ReplyFaultKind::kWrongLength, "print,", kAlways, 9000}));
  EXPECT_EQ(most.Ask(kAskId), "REFFF%1%QR00421\r\n");
}

}  // namespace
}  // namespace sim
