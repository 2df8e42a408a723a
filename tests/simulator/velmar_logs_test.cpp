#include <gtest/gtest.h>

#include <string>

#include "tests/simulator/velmar_session.h"

namespace sim {
namespace {

constexpr const char* kAskVersion = "log versiona once";
constexpr const char* kAskFiles = "log direnta once";
constexpr const char* kAskPorts = "log comconfiga once";

FileStore ManyFiles(size_t count) {
  FileStore files;
  for (size_t i = 0; i < count; ++i) {
    files.Add("F" + std::to_string(i) + ".log", TestPayload(i), 0);
  }
  return files;
}

TEST(VelmarLogsTest, TheHeaderHasTenFields) {
  VelmarSession session;
  const auto logs = ReadLogs(session.Ask(kAskVersion));
  ASSERT_EQ(logs.size(), 1U);
  ASSERT_EQ(logs[0].header.size(), 10U);
  EXPECT_EQ(logs[0].header[0], "#VERSIONA");
  EXPECT_EQ(logs[0].header[1], "COM1");
  EXPECT_EQ(logs[0].header[2], "0");
  EXPECT_EQ(logs[0].header[5], "2290");
  EXPECT_EQ(logs[0].header[6], "172800.000");
  EXPECT_TRUE(logs[0].good_crc);
}

// The whole reply to the byte; its CRC was computed without the simulator's code.
TEST(VelmarLogsTest, AReplyHasExactlyTheseBytes) {
  FileStore files;
  files.Add("A0101.log", ToBytes("0123456789abcdefghij"), 1'700'000'000);
  VelmarSession session({}, files);
  EXPECT_EQ(
      session.Ask(kAskFiles),
      "\r\n<OK\r\n[COM1]#DIRENTA,COM1,0,62.5,FINESTEERING,2290,172800.000,02000000,b1f6,16248;"
      "A0101.log,20,0,20231114,221320*da7c529d\r\n");
}

TEST(VelmarLogsTest, TheVersionHasEightFieldsAComponent) {
  VelmarOptions options;
  options.identity.id = "SN,42";
  options.identity.model = "M 1";
  VelmarSession session(options);
  const auto logs = ReadLogs(session.Ask(kAskVersion));
  const auto& body = logs.at(0).body;
  ASSERT_EQ(body.size(), 17U);
  EXPECT_EQ(body[0], "2");
  EXPECT_EQ(body[1], "GPSCARD");
  EXPECT_EQ(body[2], "\"M 1\"");
  EXPECT_EQ(body[3], "\"SN,42\"");
  EXPECT_EQ(body[9], "DB_HEIGHTMODEL");
  EXPECT_NE(body[10].find(','), std::string::npos);
}

TEST(VelmarLogsTest, ComponentsAreReportedInTheOrderOfTheOptions) {
  VelmarOptions options;
  options.identity.components = {
      {"ENCLOSURE", "Box, red"}, {"DB_USERAPPAUTO"}, {"RADIO"}, {kReceiverCard}};
  VelmarSession session(options);
  const auto logs = ReadLogs(session.Ask(kAskVersion));
  const auto& body = logs.at(0).body;
  ASSERT_EQ(body.size(), 33U);
  EXPECT_EQ(body[0], "4");
  EXPECT_EQ(body[1], "ENCLOSURE");
  EXPECT_EQ(body[2], "\"Box, red\"");
  EXPECT_EQ(body[9], "DB_USERAPPAUTO");
  EXPECT_EQ(body[17], "RADIO");
  EXPECT_EQ(body[25], "GPSCARD");
  EXPECT_EQ(body[27], "\"VM00731\"");
  EXPECT_TRUE(logs.at(0).good_crc);
}

TEST(VelmarLogsTest, AReceiverWithoutComponentsReportsNone) {
  VelmarOptions options;
  options.identity.components.clear();
  VelmarSession session(options);
  EXPECT_EQ(ReadLogs(session.Ask(kAskVersion)).at(0).body, std::vector<std::string>{"0"});
}

TEST(VelmarLogsTest, AnEmptyDirectoryIsAcknowledgedAndNothingElse) {
  VelmarSession session({}, FileStore());
  EXPECT_EQ(session.Ask(kAskFiles, 60'000), kOk);
}

TEST(VelmarLogsTest, AnEmptyDirectoryMayBeOneBlankEntry) {
  VelmarOptions options;
  options.listing.blank_entry = true;
  VelmarSession empty(options, FileStore());
  const auto logs = ReadLogs(empty.Ask(kAskFiles));
  ASSERT_EQ(logs.size(), 1U);
  EXPECT_EQ(logs[0].body, (std::vector<std::string>{"", "0", "0", "19700101", "000000"}));
  VelmarSession full(options);
  EXPECT_EQ(ReadLogs(full.Ask(kAskFiles)).at(0).body.at(0), "A0101.log");
}

TEST(VelmarLogsTest, ADirectoryCountsDownToZero) {
  VelmarSession session({}, ManyFiles(60));
  const std::string reply = session.Ask(kAskFiles);
  const auto logs = ReadLogs(reply);
  ASSERT_EQ(logs.size(), 60U);
  for (int i = 0; i < 60; ++i) {
    const SeenLog& log = logs[static_cast<size_t>(i)];
    EXPECT_EQ(log.header.at(0), "#DIRENTA");
    EXPECT_EQ(log.header.size(), 10U);
    EXPECT_EQ(log.sequence(), 59 - i);
    EXPECT_TRUE(log.good_crc);
    ASSERT_EQ(log.body.size(), 5U);
    EXPECT_EQ(log.body[0], "F" + std::to_string(i) + ".log");
    EXPECT_EQ(log.body[1], std::to_string(i));
  }
}

TEST(VelmarLogsTest, DatesAreReportedInUniversalTime) {
  FileStore files;
  files.Add("x", {}, 1'356'998'399);
  files.Add("y", {}, 951'782'400);
  VelmarSession session({}, files);
  const auto logs = ReadLogs(session.Ask(kAskFiles));
  EXPECT_EQ(logs.at(0).body.at(3), "20121231");
  EXPECT_EQ(logs.at(0).body.at(4), "235959");
  EXPECT_EQ(logs.at(1).body.at(3), "20000229");
  EXPECT_EQ(logs.at(1).body.at(4), "000000");
}

TEST(VelmarLogsTest, NamesMayBeQuoted) {
  VelmarOptions options;
  options.listing.quoted_names = true;
  FileStore files;
  files.Add("a,b", {}, 0);
  VelmarSession session(options, files);
  const auto logs = ReadLogs(session.Ask(kAskFiles));
  EXPECT_EQ(logs.at(0).body.size(), 5U);
  EXPECT_EQ(logs.at(0).body.at(0), "\"a,b\"");
}

TEST(VelmarLogsTest, TheHeaderOfAFileNamesItAndItsSize) {
  VelmarSession session;
  session.Ask("currentfile A0101.log all");
  const auto logs = ReadLogs(session.Ask("log filehdra"));
  ASSERT_EQ(logs.size(), 1U);
  EXPECT_EQ(logs[0].header.at(0), "#FILEHDRA");
  EXPECT_TRUE(logs[0].good_crc);
  EXPECT_EQ(logs[0].body.size(), 24U);
  EXPECT_EQ(logs[0].body.at(0), "\"A0101.log\"");
  EXPECT_EQ(logs[0].body.at(1), "2100");
  EXPECT_EQ(logs[0].body.at(2), "20231114");
}

TEST(VelmarLogsTest, ThreePortsHaveElevenFieldsEach) {
  VelmarOptions options;
  options.identity.port_name = "COM2";
  options.line.speed = 38400;
  VelmarSession session(options);
  session.host_speed = 38400;
  const std::string reply = session.Ask(kAskPorts);
  ASSERT_EQ(reply.substr(0, kAcknowledged), "\r\n<OK\r\n[COM2]");
  const auto logs = ReadLogs(kOk + reply.substr(kAcknowledged));
  EXPECT_EQ(logs.at(0).header.at(1), "COM2");
  const auto& body = logs.at(0).body;
  ASSERT_EQ(body.size(), 34U);
  EXPECT_EQ(body[0], "3");
  EXPECT_EQ(body[1], "COM1");
  EXPECT_EQ(body[2], "9600");
  EXPECT_EQ(body[12], "COM2");
  EXPECT_EQ(body[13], "38400");
  EXPECT_EQ(body[14], "N");
  EXPECT_EQ(body[15], "8");
  EXPECT_EQ(body[16], "1");
  EXPECT_EQ(body[17], "N");
  EXPECT_EQ(body[23], "COM3");
}

TEST(VelmarLogsTest, APortThatIsNotSerialIsNotListed) {
  VelmarOptions options;
  options.identity.port_name = "USB1";
  VelmarSession session(options);
  const auto logs = ReadLogs(kOk + session.Ask(kAskPorts).substr(kAcknowledged));
  EXPECT_EQ(logs.at(0).header.at(1), "USB1");
  EXPECT_EQ(logs.at(0).body.size(), 34U);
  for (const std::string& field : logs.at(0).body) {
    EXPECT_NE(field, "USB1");
  }
}

TEST(VelmarLogsTest, SettingsShowInTheListOfPorts) {
  VelmarSession session;
  session.Ask("COM 9600 O 7 2 CTS");
  const auto logs = ReadLogs(session.Ask(kAskPorts));
  const auto& body = logs.at(0).body;
  EXPECT_EQ(body.at(2), "9600");
  EXPECT_EQ(body.at(3), "O");
  EXPECT_EQ(body.at(4), "7");
  EXPECT_EQ(body.at(5), "2");
  EXPECT_EQ(body.at(6), "CTS");
  EXPECT_EQ(body.at(14), "N");
}

}  // namespace
}  // namespace sim
