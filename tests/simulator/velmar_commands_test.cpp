#include <gtest/gtest.h>

#include <string>

#include "tests/simulator/velmar_session.h"

namespace sim {
namespace {

std::string Error(const std::string& text) {
  return "\r\n<ERROR:Invalid message. " + text + "\r\n[COM1]";
}

FileStore Named(const std::vector<std::string>& names) {
  FileStore files;
  for (const std::string& name : names) {
    files.Add(name, ToBytes(name), 0);
  }
  return files;
}

TEST(VelmarCommandsTest, AnAcknowledgementEndsWithThePrompt) {
  VelmarSession session;
  EXPECT_EQ(session.Ask("interfacemode thisport novatel novatel on"), kOk);
  EXPECT_EQ(session.Ask("unlogall thisport"), kOk);
  EXPECT_EQ(session.Ask("unlogall"), kOk);
}

TEST(VelmarCommandsTest, ThePromptNamesThePort) {
  VelmarOptions options;
  options.identity.port_name = "USB1";
  VelmarSession session(options);
  EXPECT_EQ(session.Ask("unlogall thisport"), "\r\n<OK\r\n[USB1]");
  EXPECT_EQ(session.Ask("unlogall usb1"), "\r\n<OK\r\n[USB1]");
  EXPECT_EQ(session.Ask("unlogall com1"), "\r\n<ERROR:Invalid message. Unknown port\r\n[USB1]");
}

TEST(VelmarCommandsTest, TheCaseOfWordsDoesNotMatter) {
  VelmarSession session;
  EXPECT_EQ(session.Ask("UnLogAll THISPORT"), kOk);
  EXPECT_EQ(session.Ask("com 9600 n 8 1 xon"), kOk);
  EXPECT_EQ(session.receiver.port_settings().handshake, "XON");
}

TEST(VelmarCommandsTest, BlanksMayBeMore) {
  VelmarSession session;
  EXPECT_EQ(session.Ask("  unlogall   thisport"), kOk);
}

TEST(VelmarCommandsTest, ALineFeedAfterTheEndIsDiscarded) {
  VelmarSession session;
  session.port.Write("unlogall\r\nunlogall\r\n", session.host_speed);
  EXPECT_EQ(ToText(session.port.ReadFull(100, 100)), std::string(kOk) + kOk);
  EXPECT_EQ(session.log.str(),
            "> unlogall\\r\n> unlogall\\r\n"
            "< \\r\\n<OK\\r\\n[COM1]\n< \\r\\n<OK\\r\\n[COM1]\n");
}

TEST(VelmarCommandsTest, ALineFeedElsewhereIsKept) {
  VelmarSession session;
  EXPECT_EQ(session.Ask("\nunlogall"), Error("Unknown command"));
}

TEST(VelmarCommandsTest, AnEmptyLineIsNotAnswered) {
  VelmarSession session;
  EXPECT_EQ(session.Ask(""), "");
  EXPECT_EQ(session.Ask("  "), "");
}

TEST(VelmarCommandsTest, AHalfCommandWaitsForItsEnd) {
  VelmarSession session;
  session.port.Write("unlog", session.host_speed);
  EXPECT_EQ(ToText(session.port.Read(100, 60'000)), "");
  EXPECT_EQ(session.Ask("all"), kOk);
}

TEST(VelmarCommandsTest, WhatIsNotUnderstoodIsAnError) {
  VelmarSession session;
  EXPECT_EQ(session.Ask("logs versiona"), Error("Unknown command"));
  EXPECT_EQ(session.Ask("log versionb once"), Error("Unknown log"));
  EXPECT_EQ(session.Ask("log versiona ontime 1"), Error("Unknown trigger"));
  EXPECT_EQ(session.Ask("log"), Error("Unknown log"));
  EXPECT_EQ(session.Ask("interfacemode thisport rtcm novatel on"),
            Error("Interface mode not available"));
  EXPECT_EQ(session.Ask("interfacemode thisport novatel novatel"),
            Error("Interface mode not available"));
  EXPECT_EQ(session.Ask("interfacemode com2 novatel novatel on"),
            Error("Interface mode not available"));
  EXPECT_EQ(session.Ask("del folder x"), Error("Unknown object"));
}

TEST(VelmarCommandsTest, ErrorsMayHaveNoText) {
  VelmarOptions options;
  options.bare_errors = true;
  VelmarSession session(options);
  EXPECT_EQ(session.Ask("nonsense"), "\r\n<ERROR:[COM1]");
  EXPECT_EQ(session.Ask("unlogall"), kOk);
}

TEST(VelmarCommandsTest, AnEndlessCommandIsCutOff) {
  VelmarSession session;
  EXPECT_EQ(session.Ask(std::string(1'000'000, 'x')), Error("Unknown command"));
  EXPECT_LT(session.log.str().size(), 2000U);
}

TEST(VelmarCommandsTest, DeletingRemovesTheFile) {
  VelmarSession session;
  EXPECT_EQ(session.Ask("del file A0101.log"), kOk);
  EXPECT_FALSE(session.receiver.files().Find("A0101.log").has_value());
  EXPECT_EQ(session.Ask("del file A0101.log"), Error("No such file"));
}

TEST(VelmarCommandsTest, RenamingKeepsTheContent) {
  VelmarSession session({}, Named({"a", "b"}));
  EXPECT_EQ(session.Ask("rename a c"), kOk);
  EXPECT_FALSE(session.receiver.files().Find("a").has_value());
  EXPECT_EQ(session.receiver.files().Read("c", 0, 1), ToBytes("a"));
}

TEST(VelmarCommandsTest, ARefusedRenamingChangesNothing) {
  VelmarSession session({}, Named({"a", "b"}));
  EXPECT_EQ(session.Ask("rename x c"), Error("No such file"));
  EXPECT_EQ(session.Ask("rename a b"), Error("Wrong new name"));
  EXPECT_EQ(session.Ask("rename a"), Error("No such file"));
  EXPECT_EQ(session.Ask("rename"), Error("No such file"));
  EXPECT_EQ(session.receiver.files().Read("a", 0, 1), ToBytes("a"));
  EXPECT_EQ(session.receiver.files().Read("b", 0, 1), ToBytes("b"));
}

TEST(VelmarCommandsTest, NamesMayHaveBlanks) {
  VelmarSession session({}, Named({"a", "a b", "c d all"}));
  EXPECT_EQ(session.Ask("rename a b x y"), kOk);
  EXPECT_TRUE(session.receiver.files().Find("a").has_value());
  EXPECT_TRUE(session.receiver.files().Find("x y").has_value());
  EXPECT_EQ(session.Ask("currentfile c d all all"), kOk);
  EXPECT_EQ(ReadLogs(session.Ask("log filehdra")).at(0).body.at(0), "\"c d all\"");
  EXPECT_EQ(session.Ask("del file c d all"), kOk);
}

TEST(VelmarCommandsTest, LogsOfAFileNeedACurrentOne) {
  VelmarSession session;
  EXPECT_EQ(session.Ask("log filehdra"), Error("No current file"));
  EXPECT_EQ(session.Ask("log filetransferb"), Error("No current file"));
  EXPECT_FALSE(session.receiver.in_transfer());
  EXPECT_EQ(session.Ask("currentfile other all"), Error("No such file"));
  EXPECT_EQ(session.Ask("log filehdra"), Error("No current file"));
  EXPECT_EQ(session.Ask("currentfile A0101.log"), kOk);
  EXPECT_EQ(ReadLogs(session.Ask("log filehdra")).size(), 1U);
}

TEST(VelmarCommandsTest, TheCurrentFileCanBeCleared) {
  VelmarSession session;
  session.Ask("currentfile A0101.log all");
  EXPECT_EQ(session.Ask("currentfile"), kOk);
  EXPECT_EQ(session.Ask("log filehdra"), Error("No current file"));
}

TEST(VelmarCommandsTest, AFailedChoiceKeepsTheCurrentFile) {
  VelmarSession session;
  session.Ask("currentfile A0101.log all");
  session.Ask("currentfile other all");
  EXPECT_EQ(ReadLogs(session.Ask("log filehdra")).size(), 1U);
}

TEST(VelmarCommandsTest, TheCurrentFileFollowsItsName) {
  VelmarSession session;
  session.Ask("currentfile A0101.log all");
  session.Ask("rename A0101.log B.log");
  EXPECT_EQ(ReadLogs(session.Ask("log filehdra")).at(0).body.at(0), "\"B.log\"");
  session.Ask("del file B.log");
  EXPECT_EQ(session.Ask("log filehdra"), Error("No current file"));
}

TEST(VelmarCommandsTest, AnUnfinishedCommandIsInTheTranscript) {
  std::ostringstream log;
  Transcript transcript(log);
  {
    VelmarReceiver receiver({}, OneFile(1), &transcript);
    MemoryPort port(receiver);
    port.Write("unlog", kHostSpeed);
  }
  EXPECT_EQ(log.str(), "> unlog\n");
}

}  // namespace
}  // namespace sim
