#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "tests/simulator/velmar_session.h"

namespace sim {
namespace {

using Kind = VelmarReplyFaultKind;

constexpr const char* kAskVersion = "log versiona once";
constexpr const char* kAskFiles = "log direnta once";
constexpr const char* kAskPorts = "log comconfiga once";

VelmarReplyFault ForAll(Kind kind, int64_t amount = 0) {
  return {kind, std::string(kAnyVelmarCommand), kAlways, amount};
}

FileStore FourFiles() {
  FileStore files;
  for (const char* name : {"a", "b", "c", "d"}) {
    files.Add(name, {}, 0);
  }
  return files;
}

std::vector<int> Sequences(const std::vector<SeenLog>& logs) {
  std::vector<int> numbers;
  for (const SeenLog& log : logs) {
    EXPECT_TRUE(log.good_crc);
    numbers.push_back(log.sequence());
  }
  return numbers;
}

TEST(VelmarReplyFaultsTest, ARefusedCommandIsNotCarriedOut) {
  VelmarSession session(WithReplyFault({Kind::kRefused, "del", kOnce}));
  EXPECT_EQ(session.Ask("DEL file A0101.log"), "\r\n<ERROR:Refused\r\n[COM1]");
  EXPECT_TRUE(session.receiver.files().Find("A0101.log").has_value());
  EXPECT_EQ(session.Ask("del file A0101.log"), kOk);
}

TEST(VelmarReplyFaultsTest, ARefusalMayHaveNoText) {
  VelmarSession session(WithReplyFault({Kind::kRefusedBare, "log filetransferb"}));
  session.Ask("currentfile A0101.log all");
  EXPECT_EQ(session.Ask("log filetransferb"), "\r\n<ERROR:[COM1]");
  EXPECT_FALSE(session.receiver.in_transfer());
  EXPECT_EQ(session.Ask("unlogall"), kOk);
}

TEST(VelmarReplyFaultsTest, ARefusedChangeOfSpeedIsNone) {
  VelmarSession session(WithReplyFault({Kind::kRefused, "com"}));
  EXPECT_EQ(session.Ask("COM 115200"), "\r\n<ERROR:Refused\r\n[COM1]");
  EXPECT_EQ(session.receiver.speed(), 9600U);
}

TEST(VelmarReplyFaultsTest, AMuteReceiverIgnoresACommand) {
  VelmarSession session(WithReplyFault({Kind::kMute, "del", 2}));
  EXPECT_EQ(session.Ask("del file A0101.log", 60'000), "");
  EXPECT_EQ(session.Ask("unlogall"), kOk);
  EXPECT_EQ(session.Ask("del file A0101.log", 60'000), "");
  EXPECT_EQ(session.Ask("del file A0101.log"), kOk);
}

TEST(VelmarReplyFaultsTest, AMutedUnlogallDoesNotEndATransfer) {
  VelmarOptions options = WithReplyFault({Kind::kMute, "unlogall"});
  options.line.paced = true;
  VelmarSession session(options);
  session.Ask("currentfile A0101.log all");
  session.Say("log filetransferb");
  session.Say("unlogall");
  EXPECT_TRUE(session.receiver.in_transfer());
}

TEST(VelmarReplyFaultsTest, AnEmptyLineDoesNotCountForAFault) {
  VelmarSession session(WithReplyFault({Kind::kMute, std::string(kAnyVelmarCommand), kOnce}));
  EXPECT_EQ(session.Ask(""), "");
  EXPECT_EQ(session.Ask("unlogall"), "");
  EXPECT_EQ(session.Ask("unlogall"), kOk);
}

TEST(VelmarReplyFaultsTest, ALateReplyComesWhenItIsDue) {
  VelmarSession session(WithReplyFault(ForAll(Kind::kSilence, 8000)));
  session.Say("unlogall");
  EXPECT_TRUE(session.port.Read(100, 7999).empty());
  EXPECT_EQ(ToText(session.port.Read(100, 1)), kOk);
}

TEST(VelmarReplyFaultsTest, ALatePromptComesAfterTheAcknowledgement) {
  VelmarSession session(WithReplyFault(ForAll(Kind::kLatePrompt, 700)));
  session.Say("unlogall");
  EXPECT_EQ(ToText(session.port.Read(100, 0)), "\r\n<OK\r\n");
  EXPECT_TRUE(session.port.Read(100, 699).empty());
  EXPECT_EQ(ToText(session.port.Read(100, 1)), "[COM1]");
}

TEST(VelmarReplyFaultsTest, AnErrorHasALatePromptToo) {
  VelmarOptions options = WithReplyFault(ForAll(Kind::kLatePrompt, 700));
  options.bare_errors = true;
  VelmarSession session(options);
  session.Say("nonsense");
  EXPECT_EQ(ToText(session.port.Read(100, 0)), "\r\n<ERROR:");
  EXPECT_EQ(ToText(session.port.Read(100, 700)), "[COM1]");
}

TEST(VelmarReplyFaultsTest, TheLogFollowsALatePromptAtOnce) {
  VelmarSession session(WithReplyFault({Kind::kLatePrompt, "log", kAlways, 700}));
  session.Say(kAskVersion);
  session.port.Advance(700);
  EXPECT_EQ(ReadLogs(ToText(session.port.Read(SIZE_MAX, 0))).size(), 1U);
}

TEST(VelmarReplyFaultsTest, ALogMayComeLate) {
  VelmarSession session(WithReplyFault(ForAll(Kind::kLateLog, 900)));
  session.Say(kAskVersion);
  EXPECT_EQ(ToText(session.port.Read(100, 0)), kOk);
  EXPECT_TRUE(session.port.Read(100, 899).empty());
  EXPECT_EQ(ToText(session.port.Read(10, 1)), "#VERSIONA,");
}

TEST(VelmarReplyFaultsTest, TheFirstChunkMayComeLate) {
  VelmarSession session(WithReplyFault({Kind::kLateLog, "log filetransferb", kAlways, 900}));
  session.Ask("currentfile A0101.log all");
  const uint64_t start_ms = session.port.Now();
  session.Say("log filetransferb");
  EXPECT_EQ(ToText(session.port.Read(100, 0)), kOk);
  const auto chunks = ReadChunks(session.port.ReadFull(2 * 1064 + 92, 900));
  EXPECT_EQ(session.port.Now() - start_ms, 900U);
  EXPECT_EQ(Contents(chunks), TestPayload(2100));
}

TEST(VelmarReplyFaultsTest, GarbageComesFirst) {
  VelmarSession session(
      WithReplyFault({Kind::kGarbageBefore, std::string(kAnyVelmarCommand), kOnce, 30}));
  const std::string reply = session.Ask("unlogall");
  ASSERT_EQ(reply.size(), 30U + kAcknowledged);
  EXPECT_EQ(reply.substr(30), kOk);
  EXPECT_EQ(reply.substr(0, 30).find_first_of("\r\n<"), std::string::npos);
  EXPECT_EQ(session.Ask("unlogall"), kOk);
}

TEST(VelmarReplyFaultsTest, APromptMayHaveNoEnd) {
  VelmarSession session(WithReplyFault({Kind::kEndlessPrompt, "log", kAlways, 3'000'000}));
  const std::string reply = session.Ask(kAskVersion);
  EXPECT_EQ(reply, "\r\n<OK\r\n[" + std::string(3'000'000, 'X'));
  EXPECT_LT(session.log.str().size(), 200U);
}

TEST(VelmarReplyFaultsTest, AfterAPromptWithoutEndNoTransferStarts) {
  VelmarSession session(WithReplyFault({Kind::kEndlessPrompt, "log", kAlways, 5}));
  session.Ask("currentfile A0101.log all");
  EXPECT_EQ(session.Ask("log filetransferb"), "\r\n<OK\r\n[XXXXX");
  EXPECT_FALSE(session.receiver.in_transfer());
}

TEST(VelmarReplyFaultsTest, ALineEndMayFollowThePrompt) {
  VelmarSession session(WithReplyFault(ForAll(Kind::kLineEndAfterPrompt)));
  EXPECT_EQ(session.Ask("unlogall"), "\r\n<OK\r\n[COM1]\r\n");
  EXPECT_EQ(session.Ask(kAskVersion).substr(13, 3), "\r\n#");
}

TEST(VelmarReplyFaultsTest, AnAbbreviatedLogComesInsteadOfTheRightOne) {
  VelmarSession session(WithReplyFault(ForAll(Kind::kAbbreviatedLog)));
  const std::string expected =
      std::string(kOk) +
      "<STATUS COM1 0 62.5 FINESTEERING 2290 172800.000 02000000 b1f6 16248\r\n<     1\r\n";
  EXPECT_EQ(session.Ask(kAskVersion), expected);
  EXPECT_EQ(session.Ask("currentfile A0101.log all"), expected);
  EXPECT_EQ(session.Ask("log filetransferb"), expected);
  EXPECT_FALSE(session.receiver.in_transfer());
}

TEST(VelmarReplyFaultsTest, TheCrcOfLogsMayBeWrong) {
  VelmarSession session(WithReplyFault({Kind::kDamagedCrc, "log direnta", kOnce}), FourFiles());
  EXPECT_TRUE(ReadLogs(session.Ask(kAskVersion)).at(0).good_crc);
  for (const SeenLog& log : ReadLogs(session.Ask(kAskFiles))) {
    EXPECT_FALSE(log.good_crc);
    EXPECT_EQ(log.body.size(), 5U);
  }
  EXPECT_TRUE(ReadLogs(session.Ask(kAskFiles)).at(0).good_crc);
}

TEST(VelmarReplyFaultsTest, FaultsInLogsAreKeptForCommandsThatGetSome) {
  VelmarOptions options;
  for (const Kind kind : {Kind::kDamagedCrc, Kind::kSequenceOpen, Kind::kLateLog}) {
    options.faults.replies.push_back({kind, std::string(kAnyVelmarCommand), kOnce, 100});
  }
  VelmarSession session(options);
  EXPECT_EQ(session.Ask("unlogall"), kOk);
  EXPECT_EQ(session.Ask("nonsense").substr(0, 9), "\r\n<ERROR:");
  const auto logs = ReadLogs(session.Ask(kAskVersion, 1000));
  EXPECT_EQ(logs.at(0).sequence(), 1);
  EXPECT_FALSE(logs.at(0).good_crc);
  EXPECT_EQ(session.port.Now(), 100U + 100 + 100 + 1000);
}

TEST(VelmarReplyFaultsTest, ABodyMayEndWithinQuotationMarks) {
  VelmarSession session(WithReplyFault(ForAll(Kind::kOpenQuotes)), FourFiles());
  const auto quotes = [](const std::string& text) {
    return std::count(text.begin(), text.end(), '"');
  };
  const std::string version = session.Ask(kAskVersion);
  EXPECT_EQ(quotes(version), 27);
  EXPECT_NE(version.find("\"12:00:00*"), std::string::npos);
  const std::string ports = session.Ask(kAskPorts);
  EXPECT_EQ(quotes(ports), 1);
  EXPECT_NE(ports.find(",\"ON*"), std::string::npos);
  const std::string files = session.Ask(kAskFiles);
  EXPECT_EQ(quotes(files), 1);
  EXPECT_NE(files.find(",\"000000*"), std::string::npos);
  EXPECT_TRUE(ReadLogs(version).at(0).good_crc);
}

TEST(VelmarReplyFaultsTest, ABodyMayHaveFewerFields) {
  VelmarSession session(WithReplyFault({Kind::kFewerFields, "log filehdra", kAlways, 22}));
  session.Ask("currentfile A0101.log all");
  const auto logs = ReadLogs(session.Ask("log filehdra"));
  EXPECT_EQ(logs.at(0).body.size(), 22U);
  EXPECT_EQ(logs.at(0).body.at(8), "\"HILL\"");
  EXPECT_TRUE(logs.at(0).good_crc);
  EXPECT_EQ(ReadLogs(session.Ask(kAskVersion)).at(0).body.size(), 17U);
}

TEST(VelmarReplyFaultsTest, FewerFieldsCountQuotedCommasAsText) {
  VelmarSession session(WithReplyFault(ForAll(Kind::kFewerFields, 11)));
  const auto logs = ReadLogs(session.Ask(kAskVersion));
  EXPECT_EQ(logs.at(0).body.size(), 11U);
  EXPECT_EQ(logs.at(0).body.back(), "\"World, 0.25 deg\"");
}

TEST(VelmarReplyFaultsTest, ABodyMayHaveNoFieldsOrAllOfThem) {
  VelmarSession none(WithReplyFault(ForAll(Kind::kFewerFields, 0)));
  EXPECT_NE(none.Ask(kAskVersion).find(",16248;*"), std::string::npos);
  VelmarSession all(WithReplyFault(ForAll(Kind::kFewerFields, 100)));
  EXPECT_EQ(ReadLogs(all.Ask(kAskVersion)).at(0).body.size(), 17U);
}

TEST(VelmarReplyFaultsTest, CountsMayBeWrong) {
  VelmarSession huge(WithReplyFault(ForAll(Kind::kCount, 2'147'483'647)));
  EXPECT_EQ(ReadLogs(huge.Ask(kAskVersion)).at(0).body.at(0), "2147483647");
  const auto ports = ReadLogs(huge.Ask(kAskPorts));
  EXPECT_EQ(ports.at(0).body.at(0), "2147483647");
  EXPECT_EQ(ports.at(0).body.size(), 34U);
  EXPECT_TRUE(ports.at(0).good_crc);
  EXPECT_EQ(ReadLogs(huge.Ask(kAskFiles)).at(0).body.at(0), "A0101.log");
  VelmarSession negative(WithReplyFault({Kind::kCount, "log comconfiga", kAlways, -1}));
  EXPECT_EQ(ReadLogs(negative.Ask(kAskPorts)).at(0).body.at(0), "-1");
  EXPECT_EQ(ReadLogs(negative.Ask(kAskVersion)).at(0).body.at(0), "2");
}

TEST(VelmarReplyFaultsTest, ANumberMayBeLeftOut) {
  VelmarSession early(WithReplyFault(ForAll(Kind::kSequenceGap, 1)), FourFiles());
  EXPECT_EQ(Sequences(ReadLogs(early.Ask(kAskFiles))), (std::vector<int>{4, 2, 1, 0}));
  VelmarSession late(WithReplyFault(ForAll(Kind::kSequenceGap, 3)), FourFiles());
  EXPECT_EQ(Sequences(ReadLogs(late.Ask(kAskFiles))), (std::vector<int>{4, 3, 2, 0}));
  VelmarSession beyond(WithReplyFault(ForAll(Kind::kSequenceGap, 99)), FourFiles());
  EXPECT_EQ(Sequences(ReadLogs(beyond.Ask(kAskFiles))), (std::vector<int>{4, 3, 2, 0}));
}

TEST(VelmarReplyFaultsTest, TheNumbersMayNotReachZero) {
  VelmarSession session(WithReplyFault(ForAll(Kind::kSequenceOpen)), FourFiles());
  EXPECT_EQ(Sequences(ReadLogs(session.Ask(kAskFiles))), (std::vector<int>{4, 3, 2, 1}));
}

TEST(VelmarReplyFaultsTest, SizesMayBeWrong) {
  VelmarOptions options;
  options.faults.sizes = {{"A0101.log", 0}};
  VelmarSession session(options);
  EXPECT_EQ(ReadLogs(session.Ask(kAskFiles)).at(0).body.at(1), "0");
  session.Ask("currentfile A0101.log all");
  EXPECT_EQ(ReadLogs(session.Ask("log filehdra")).at(0).body.at(1), "0");
  EXPECT_EQ(Contents(ReadChunks(session.FetchFile())), TestPayload(2100));
}

TEST(VelmarReplyFaultsTest, TheOwnPortMayBeHidden) {
  VelmarOptions options;
  options.faults.hides_own_port = true;
  VelmarSession session(options);
  const auto logs = ReadLogs(session.Ask(kAskPorts));
  EXPECT_EQ(logs.at(0).header.at(1), "COM1");
  EXPECT_EQ(logs.at(0).body.size(), 34U);
  EXPECT_EQ(logs.at(0).body.at(1), "AUX");
}

}  // namespace
}  // namespace sim
