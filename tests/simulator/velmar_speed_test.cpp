#include <gtest/gtest.h>

#include <string>

#include "tests/simulator/velmar_session.h"

namespace sim {
namespace {

TEST(VelmarSpeedTest, TheSpeedChangesAfterTheReply) {
  VelmarSession session;
  EXPECT_EQ(session.Ask("COM 115200 N 8 1 N"), kOk);
  EXPECT_EQ(session.receiver.speed(), 115200U);
  EXPECT_EQ(session.Ask("unlogall"), "");
  session.host_speed = 115200;
  EXPECT_EQ(session.Ask("unlogall"), kOk);
  EXPECT_EQ(ReadLogs(session.Ask("log comconfiga once")).at(0).body.at(2), "115200");
}

TEST(VelmarSpeedTest, TheTranscriptShowsWhenTheSpeedChanges) {
  VelmarSession session;
  session.Ask("COM 115200 N 8 1 N");
  session.Ask("unlogall");
  EXPECT_EQ(session.log.str(),
            "> COM 115200 N 8 1 N\\r\n"
            "= port N 8 1 N\n"
            "< \\r\\n<OK\\r\\n[COM1]\n"
            "= speed 115200\n"
            "- not heard at 9600\n");
}

TEST(VelmarSpeedTest, TheReplyLeavesAtTheOldSpeed) {
  VelmarOptions options;
  options.line.paced = true;
  VelmarSession session(options);
  session.Say("COM 115200 N 8 1 N");
  EXPECT_EQ(ToText(session.port.ReadFull(12, 1000)), "\r\n<OK\r\n[COM1");
  EXPECT_EQ(session.receiver.speed(), 9600U);
  EXPECT_EQ(ToText(session.port.Read(1, 1000)), "]");
  EXPECT_EQ(session.receiver.speed(), 115200U);
}

TEST(VelmarSpeedTest, ALinkWithoutSpeedAlwaysWorks) {
  VelmarSession session;
  session.host_speed = 0;
  EXPECT_EQ(session.Ask("COM 115200"), kOk);
  EXPECT_EQ(session.Ask("unlogall"), kOk);
}

TEST(VelmarSpeedTest, AGarbledCommandIsNotUnderstood) {
  VelmarOptions options;
  options.line.garbled = true;
  VelmarSession session(options);
  session.host_speed = 19200;
  EXPECT_EQ(session.Ask("del file A0101.log").find("OK"), std::string::npos);
  EXPECT_TRUE(session.receiver.files().Find("A0101.log").has_value());
}

TEST(VelmarSpeedTest, WrongSettingsChangeNothing) {
  VelmarSession session;
  for (const char* arguments : {"",
                                "115201",
                                "0",
                                "-9600",
                                "9600x",
                                "115200 X",
                                "115200 N 9",
                                "115200 N 8 3",
                                "115200 N 8 1 RTS",
                                "115200 N 8 1 N on",
                                "com1 115200 N 8 1 N"}) {
    const std::string command = std::string("COM ") + arguments;
    EXPECT_EQ(session.Ask(command), "\r\n<ERROR:Invalid message. Wrong port settings\r\n[COM1]")
        << command;
    EXPECT_EQ(session.receiver.speed(), 9600U) << command;
  }
  EXPECT_EQ(session.receiver.port_settings().parity, "N");
}

TEST(VelmarSpeedTest, MissingSettingsAreThoseOfANewPort) {
  VelmarSession session;
  session.Ask("COM 9600 E 7 2 CTS");
  session.Ask("COM 9600 O");
  EXPECT_EQ(session.receiver.port_settings().parity, "O");
  EXPECT_EQ(session.receiver.port_settings().data_bits, "8");
  EXPECT_EQ(session.receiver.port_settings().stop_bits, "1");
  EXPECT_EQ(session.receiver.port_settings().handshake, "N");
}

TEST(VelmarSpeedTest, AReceiverMayKeepItsSpeedAndReportAnother) {
  VelmarOptions options;
  options.faults.keeps_speed = true;
  VelmarSession session(options);
  EXPECT_EQ(session.Ask("COM 115200 E 8 1 N"), kOk);
  EXPECT_EQ(session.receiver.speed(), 9600U);
  const auto logs = ReadLogs(session.Ask("log comconfiga once"));
  EXPECT_EQ(logs.at(0).body.at(2), "9600");
  EXPECT_EQ(logs.at(0).body.at(3), "N");
}

TEST(VelmarSpeedTest, AChangeInATransferWaitsForItsReply) {
  VelmarOptions options;
  options.line.paced = true;
  VelmarSession session(options);
  session.Ask("currentfile A0101.log all");
  session.Say("log filetransferb");
  session.port.Advance(300);
  session.Say("COM 115200");
  session.port.Advance(700);
  EXPECT_EQ(session.receiver.speed(), 9600U);
  session.port.Advance(500);
  EXPECT_EQ(session.receiver.speed(), 115200U);
}

TEST(VelmarSpeedTest, TheEndOfASpeedCommandIsFound) {
  const VelmarSession session;
  const auto end = [&](std::string_view text) {
    return session.receiver.EndOfSpeedCommand(ToBytes(text));
  };
  EXPECT_EQ(end("COM 9600 N 8 1 N\runlogall\r"), 17U);
  EXPECT_EQ(end("COM 9600\r\nunlogall\r"), 10U);
  EXPECT_EQ(end("unlogall\rcom 9600\r"), 18U);
  EXPECT_EQ(end("com 9600\rcom 1200\r\n"), 19U);
  EXPECT_EQ(end("com 9600\rcom 1200"), 9U);
  EXPECT_EQ(end("com 96"), 0U);
  EXPECT_EQ(end("unlogall\r"), 0U);
  EXPECT_EQ(end("log comconfiga once\r"), 0U);
  EXPECT_EQ(end("comconfig\r"), 0U);
  EXPECT_EQ(end(""), 0U);
}

TEST(VelmarSpeedTest, TheEndOfASpeedCommandIsFoundAfterItsBeginning) {
  VelmarSession session;
  session.port.Write("CO", session.host_speed);
  EXPECT_EQ(session.receiver.EndOfSpeedCommand(ToBytes("M 9600\runlogall\r")), 7U);
}

}  // namespace
}  // namespace sim
