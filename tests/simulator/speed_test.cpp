#include <gtest/gtest.h>

#include <string>

#include "tests/simulator/session.h"

namespace sim {
namespace {

QuorinOptions Garbled() {
  QuorinOptions options;
  options.line.garbled = true;
  return options;
}

TEST(SpeedTest, ALinkWithoutSpeedAlwaysWorks) {
  Session session;
  session.host_speed = 0;
  EXPECT_EQ(session.Ask("%1%\r\n"), "RE003%1%\r\n");
  session.Say("set,/par/dev/ser/a/rate,115200\r\n");
  EXPECT_EQ(session.Ask("%2%\r\n"), "RE003%2%\r\n");
}

TEST(SpeedTest, ADeafReceiverHearsNothingAtAnotherSpeed) {
  Session session;
  session.host_speed = 19200;
  EXPECT_EQ(session.Ask("%1%remove,A0101.log\r\n"), "");
  EXPECT_TRUE(session.receiver.files().Find("A0101.log").has_value());
  session.host_speed = 9600;
  EXPECT_EQ(session.Ask("%1%\r\n"), "RE003%1%\r\n");
}

TEST(SpeedTest, AGarbledCommandIsNotUnderstoodAndItsAnswerNotReadable) {
  Session session(Garbled());
  session.host_speed = 19200;
  EXPECT_EQ(session.Ask("%1%remove,A0101.log\r\n").find("RE"), std::string::npos);
  EXPECT_TRUE(session.receiver.files().Find("A0101.log").has_value());
  session.host_speed = 9600;
  session.Ask("\n");
  EXPECT_EQ(session.Ask("%1%\r\n"), "RE003%1%\r\n");
}

// When the host changes its speed too early, the command is right but the reply is damaged.
TEST(SpeedTest, AReplyIsLostOnAHostThatHasAlreadyChanged) {
  QuorinOptions options;
  options.faults.replies = {{ReplyFaultKind::kSilence, std::string(kAnyCommand), kAlways, 1000}};
  Session deaf(options);
  deaf.Say("%1%\r\n");
  deaf.port.SetHostSpeed(115200);
  EXPECT_EQ(ToText(deaf.port.Read(100, 5000)), "");

  options.line.garbled = true;
  Session garbled(options);
  garbled.Say("%1%\r\n");
  garbled.port.SetHostSpeed(115200);
  const std::string garbage = ToText(garbled.port.Read(100, 5000));
  EXPECT_EQ(garbage.size(), 10U);
  EXPECT_NE(garbage, "RE003%1%\r\n");
}

TEST(SpeedTest, SettingThePortChangesTheSpeedAtOnce) {
  Session session;
  session.Say("set,/par/dev/ser/a/rate,115200\r\n%1%\r\n");
  EXPECT_EQ(session.receiver.speed(), 115200U);
  session.host_speed = 115200;
  EXPECT_EQ(session.Ask("%2%\r\n"), "RE003%2%\r\n");
}

TEST(SpeedTest, TheRestOfOneWriteIsHeardAtTheNewSpeed) {
  Session session;
  EXPECT_EQ(session.Ask("set,/par/dev/ser/a/rate,115200\r\n%1%\r\n"), "");
}

TEST(SpeedTest, SettingAnotherPortLeavesThisOneAlone) {
  Session session;
  EXPECT_EQ(session.Ask("set,/par/dev/ser/b/rate,115200\r\n%1%\r\n"), "RE003%1%\r\n");
  EXPECT_EQ(session.receiver.speed(), 9600U);
  EXPECT_EQ(session.receiver.port_settings('b'), (PortSettings{{"rate", "115200"}}));
}

TEST(SpeedTest, SettingTheTerminalIsAnsweredAtTheOldSpeed) {
  Session session;
  EXPECT_EQ(session.Ask("%1%set,cur/term/rate,115200\r\n"), "RE003%1%\r\n");
  EXPECT_EQ(session.receiver.speed(), 115200U);
  EXPECT_EQ(session.Ask("%2%\r\n"), "");
  session.host_speed = 115200;
  EXPECT_EQ(session.Ask("%2%\r\n"), "RE003%2%\r\n");
}

TEST(SpeedTest, WithoutATagTheTerminalIsSetAtOnceAndSilently) {
  Session session;
  EXPECT_EQ(session.Ask("set,cur/term/rate,115200\r\n"), "");
  EXPECT_EQ(session.receiver.speed(), 115200U);
}

TEST(SpeedTest, TheSpeedChangesOnlyWhenTheReplyHasLeft) {
  QuorinOptions options;
  options.line.paced = true;
  Session session(options);
  session.Say("%1%set,cur/term/rate,115200\r\n");
  EXPECT_EQ(ToText(session.port.ReadFull(9, 1000)), "RE003%1%\r");
  EXPECT_EQ(session.receiver.speed(), 9600U);
  EXPECT_EQ(ToText(session.port.Read(1, 1000)), "\n");
  EXPECT_EQ(session.receiver.speed(), 115200U);
}

TEST(SpeedTest, AReplyThatIsDiscardedStillChangesTheSpeed) {
  QuorinOptions options;
  options.faults.replies = {{ReplyFaultKind::kSilence, "set,", kAlways, 1000}};
  Session session(options);
  session.Say("%1%set,cur/term/rate,115200\r\n");
  EXPECT_EQ(session.receiver.speed(), 9600U);
  session.Say("dm\r\n");
  EXPECT_EQ(session.receiver.speed(), 115200U);
}

TEST(SpeedTest, AReceiverMayKeepItsSpeed) {
  QuorinOptions options;
  options.faults.keeps_speed = true;
  Session session(options);
  EXPECT_EQ(session.Ask("set,/par/dev/ser/a/rate,115200\r\n"), "");
  EXPECT_EQ(session.Ask("%1%set,cur/term/rate,115200\r\n"), "ER010%1%{wrong value}\r\n");
  EXPECT_EQ(session.receiver.speed(), 9600U);
  EXPECT_EQ(session.Ask("%2%\r\n"), "RE003%2%\r\n");
}

TEST(SpeedTest, AReceiverMayTakeAnotherSpeed) {
  QuorinOptions options;
  options.line.stray_speed = 19200;
  Session session(options);
  EXPECT_EQ(session.Ask("%1%set,cur/term/rate,115200\r\n"), "RE003%1%\r\n");
  EXPECT_EQ(session.receiver.speed(), 19200U);
}

TEST(SpeedTest, TheEndOfASpeedCommandIsFound) {
  const Session session;
  const auto end = [&](std::string_view text) {
    return session.receiver.EndOfSpeedCommand(ToBytes(text));
  };
  EXPECT_EQ(end("set,/par/dev/ser/a/rate,9600\r\n%1%\r\n"), 30U);
  EXPECT_EQ(end("%5%set,cur/term/rate,115200\r\n"), 29U);
  EXPECT_EQ(end("%1%\r\n"), 0U);
  EXPECT_EQ(end("set,/par/dev/ser/a/rate,96"), 0U);
  EXPECT_EQ(end(""), 0U);
}

}  // namespace
}  // namespace sim
