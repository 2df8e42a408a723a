#include "velmar/logs.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <tuple>
#include <vector>

#include "tests/velmar/velmar_replies.h"

namespace {

using namespace VelmarCommands;

// --- VERSION

std::string Component(const std::string& type, const std::string& model) {
  std::string text = "," + type + ",\"" + model + "\"";
  for (const char* field : {"SN", "HW", "SW"}) text += ",\"" + (field + ("-" + model)) + "\"";
  return text + ",\"BOOT\",\"2012/Jan/01\",\"a,b\"";
}

TEST(VersionLog, ReadsTheReceiverCard) {
  VersionLog log;
  EXPECT_EQ(DecodeVersion("1" + Component("GPSCARD", "OEM6"), log), Progress::kComplete);
  EXPECT_EQ(log.model, L"OEM6");
  EXPECT_EQ(log.serial_number, L"SN-OEM6");
  EXPECT_EQ(log.hardware_version, L"HW-OEM6");
  EXPECT_EQ(log.software_version, L"SW-OEM6");
}

TEST(VersionLog, TheLastEnclosureOrApplicationNamesTheModel) {
  VersionLog log;
  EXPECT_EQ(DecodeVersion("3" + Component("GPSCARD", "card") + Component("ENCLOSURE", "box") +
                              Component("OTHER", "ignored"),
                          log),
            Progress::kComplete);
  EXPECT_EQ(log.model, L"box");
  EXPECT_EQ(log.serial_number, L"SN-card");
  EXPECT_EQ(log.hardware_version, L"HW-card");
  EXPECT_EQ(log.software_version, L"SW-card");
  EXPECT_EQ(
      DecodeVersion("2" + Component("DB_USERAPPAUTO", "app") + Component("GPSCARD", "card"), log),
      Progress::kComplete);
  EXPECT_EQ(log.model, L"card");
}

TEST(VersionLog, TypesCompareExactly) {
  VersionLog log;
  DecodeVersion("1" + Component("gpscard", "card"), log);
  EXPECT_EQ(log.model, L"");
}

TEST(VersionLog, NoComponentIsCompleteAndEmpty) {
  VersionLog log;
  EXPECT_EQ(DecodeVersion("0", log), Progress::kComplete);
  EXPECT_EQ(log.model, L"");
}

TEST(VersionLog, WaitsForAllFields) {
  VersionLog log;
  const std::string body = "2" + Component("GPSCARD", "a") + Component("ENCLOSURE", "b");
  EXPECT_EQ(DecodeVersion("", log), Progress::kNothing);
  EXPECT_EQ(DecodeVersion(body.substr(0, body.rfind(",\"a,b\"")), log), Progress::kMore);
  EXPECT_EQ(DecodeVersion(body, log), Progress::kComplete);
}

TEST(VersionLog, HugeAndNegativeCountsEnd) {
  VersionLog log;
  EXPECT_EQ(DecodeVersion("2147483647" + Component("GPSCARD", "a"), log), Progress::kMore);
  EXPECT_EQ(DecodeVersion("-1" + Component("GPSCARD", "a"), log), Progress::kComplete);
  EXPECT_EQ(DecodeVersion("-2147483648", log), Progress::kComplete);
}

// --- DIRENT

std::string Entry(const std::string& name, int sequence) {
  return AsciiLog("DIRENTA", "\"" + name + "\",1000,0,20121231,235959", sequence);
}

std::vector<std::wstring> Names(const std::vector<FileEntry>& entries) {
  std::vector<std::wstring> names;
  for (const FileEntry& entry : entries) names.push_back(entry.name);
  return names;
}

TEST(DirectoryLogs, ReadNameSizeAndTime) {
  std::vector<FileEntry> entries;
  EXPECT_EQ(DecodeDirectory(Entry("a.pdc", 0), entries), Progress::kComplete);
  ASSERT_EQ(entries.size(), 1u);
  EXPECT_EQ(entries[0].name, L"a.pdc");
  EXPECT_EQ(entries[0].size, 1000u);
  const SYSTEMTIME& time = entries[0].time;
  EXPECT_EQ(time.wYear, 2012);
  EXPECT_EQ(time.wMonth, 12);
  EXPECT_EQ(time.wDay, 31);
  EXPECT_EQ(time.wDayOfWeek, 0);
  EXPECT_EQ(time.wHour, 23);
  EXPECT_EQ(time.wMinute, 59);
  EXPECT_EQ(time.wSecond, 59);
  EXPECT_EQ(time.wMilliseconds, 0);
}

TEST(DirectoryLogs, CountDownToTheLast) {
  std::vector<FileEntry> entries;
  const std::string text = Entry("a", 3) + Entry("b", 2) + Entry("c", 1) + Entry("d", 0);
  EXPECT_EQ(DecodeDirectory(text, entries), Progress::kComplete);
  EXPECT_THAT(Names(entries), testing::ElementsAre(L"a", L"b", L"c", L"d"));
}

TEST(DirectoryLogs, AGapContradictsAndKeepsWhatWasRead) {
  std::vector<FileEntry> entries;
  EXPECT_EQ(DecodeDirectory(Entry("a", 3) + Entry("b", 1), entries), Progress::kContradiction);
  EXPECT_THAT(Names(entries), testing::ElementsAre(L"a", L"b"));
}

TEST(DirectoryLogs, SequencesAtTheEndOfTheirRangeDoNotOverflow) {
  std::vector<FileEntry> entries;
  EXPECT_EQ(DecodeDirectory(Entry("a", 2147483647) + Entry("b", 2147483647), entries),
            Progress::kContradiction);
}

// Each beginning of the text waits, and holds the logs that are whole.
TEST(DirectoryLogs, EveryBeginningWaitsForMore) {
  const std::string text = Entry("a", 1) + Entry("b", 0);
  for (size_t length = 0; length < text.size() - 2; ++length) {
    std::vector<FileEntry> entries;
    const Progress progress = DecodeDirectory(text.substr(0, length), entries);
    EXPECT_TRUE(progress == Progress::kMore || progress == Progress::kNothing) << length;
    EXPECT_LE(entries.size(), 1u);
  }
}

TEST(DirectoryLogs, StartAfresh) {
  std::vector<FileEntry> entries(5);
  DecodeDirectory(Entry("a", 0), entries);
  EXPECT_EQ(entries.size(), 1u);
  DecodeDirectory("nothing of it", entries);
  EXPECT_TRUE(entries.empty());
}

// --- FILEHDR

std::string Fields(int count, const std::string& first) {
  std::string text = first;
  for (int i = 2; i < count; ++i) text += ",0";
  return text;
}

TEST(FileHeaderLog, NeedsAllItsFields) {
  FileHeaderLog log;
  EXPECT_EQ(DecodeFileHeader(Fields(22, "\"a.pdc\",123456"), log), Progress::kMore);
  EXPECT_EQ(DecodeFileHeader(Fields(23, "\"a.pdc\",123456"), log), Progress::kComplete);
  EXPECT_EQ(log.file_name, L"\"a.pdc\"");
  EXPECT_EQ(log.file_size, 123456);
}

// --- COMCONFIG

std::string PortFields(const std::string& settings) {
  return "," + settings + ",ON,OFF,NOVATEL,NOVATEL,ON";
}

TEST(PortConfig, TakesThePortThatIsTalkedOn) {
  PortConfigLog log;
  const std::string body =
      "2" + PortFields("COM1,9600,N,8,1,N") + PortFields("COM2,115200,O,7,2,CTS");
  EXPECT_EQ(DecodePortConfig(body, L"COM2", log), Progress::kComplete);
  EXPECT_EQ(log.port_name, L"COM2");
  EXPECT_EQ(log.baud, 115200);
  EXPECT_EQ(log.parity, 2);
  EXPECT_EQ(log.data_bits, 7);
  EXPECT_EQ(log.stop_bits, 2);
  EXPECT_EQ(log.handshake, 2);
}

TEST(PortConfig, ReadsEachWord) {
  for (const auto& [words, parity, handshake] :
       std::vector<std::tuple<std::string, int, int>>{{"COM1,1,N,8,1,N", 0, 0},
                                                      {"COM1,1,E,8,1,XON", 1, 1},
                                                      {"COM1,1,O,8,1,CTS", 2, 2},
                                                      {"COM1,1,X,8,1,X", 9, 9}}) {
    PortConfigLog log{.port_name = L"", .parity = 9, .handshake = 9};
    DecodePortConfig("1" + PortFields(words), L"COM1", log);
    EXPECT_EQ(log.parity, parity) << words;
    EXPECT_EQ(log.handshake, handshake) << words;
  }
}

TEST(PortConfig, OfAnotherPortIsNotTaken) {
  PortConfigLog log;
  EXPECT_EQ(DecodePortConfig("1" + PortFields("com1,9600,N,8,1,N"), L"COM1", log),
            Progress::kComplete);
  EXPECT_EQ(log.port_name, L"");
}

TEST(PortConfig, CountsOfAnyKindEnd) {
  PortConfigLog log;
  EXPECT_EQ(DecodePortConfig("", L"COM1", log), Progress::kNothing);
  EXPECT_EQ(DecodePortConfig("0", L"COM1", log), Progress::kComplete);
  EXPECT_EQ(DecodePortConfig("-5", L"COM1", log), Progress::kComplete);
  EXPECT_EQ(DecodePortConfig("2147483647" + PortFields("COM1,1,N,8,1,N"), L"COM1", log),
            Progress::kMore);
}

}  // namespace
