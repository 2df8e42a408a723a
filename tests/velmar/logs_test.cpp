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

TEST(VersionLog, AnApplicationNamesTheModelOfTheCard) {
  VersionLog log;
  EXPECT_EQ(
      DecodeVersion("2" + Component("GPSCARD", "card") + Component("DB_USERAPPAUTO", "app"), log),
      Progress::kComplete);
  EXPECT_EQ(log.model, L"app");
  EXPECT_EQ(log.serial_number, L"SN-card");
  EXPECT_EQ(log.hardware_version, L"HW-card");
  EXPECT_EQ(log.software_version, L"SW-card");
}

TEST(VersionLog, TypesCompareExactly) {
  for (const char* type : {"gpscard",
                           "GPSCARD ",
                           "\"GPSCARD\"",
                           "GPSCARD2",
                           "enclosure",
                           "\"ENCLOSURE\"",
                           "DB_USERAPP",
                           "db_userappauto",
                           ""}) {
    VersionLog log;
    EXPECT_EQ(DecodeVersion("1" + Component(type, "card"), log), Progress::kComplete);
    EXPECT_EQ(log.model, L"") << type;
    EXPECT_EQ(log.serial_number, L"") << type;
  }
}

TEST(VersionLog, QuotesAreRemovedAtBothEndsOnly) {
  VersionLog log;
  DecodeVersion("1,GPSCARD,\"\"M\"\",S\"1\"N,\"\",plain,B,D,T", log);
  EXPECT_EQ(log.model, L"M");
  EXPECT_EQ(log.serial_number, L"S\"1\"N");
  EXPECT_EQ(log.hardware_version, L"");
  EXPECT_EQ(log.software_version, L"plain");
}

TEST(VersionLog, NoComponentIsCompleteAndEmpty) {
  VersionLog log;
  EXPECT_EQ(DecodeVersion("0", log), Progress::kComplete);
  EXPECT_EQ(log.model, L"");
  EXPECT_EQ(log.serial_number, L"");
  EXPECT_EQ(log.hardware_version, L"");
  EXPECT_EQ(log.software_version, L"");
}

// The components after the count are missing.
TEST(VersionLog, TheCountGivesTheNumberOfComponents) {
  VersionLog log;
  EXPECT_EQ(DecodeVersion("1" + Component("GPSCARD", "card") + Component("ENCLOSURE", "box"), log),
            Progress::kComplete);
  EXPECT_EQ(log.model, L"card");
}

TEST(VersionLog, ABodyThatEndsInsideQuotesLacksAField) {
  VersionLog log;
  EXPECT_EQ(DecodeVersion("1,GPSCARD,M,S,H,W,B,D,\"T", log), Progress::kMore);
  EXPECT_EQ(log.model, L"");
  EXPECT_EQ(DecodeVersion("\"1", log), Progress::kNothing);
  EXPECT_EQ(DecodeVersion("1,GPSCARD,M,S,H,W,B,D,", log), Progress::kComplete);
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
  EXPECT_EQ(DecodeVersion("536870912" + Component("GPSCARD", "a"), log), Progress::kMore);
  EXPECT_EQ(DecodeVersion("-1" + Component("GPSCARD", "a"), log), Progress::kComplete);
  EXPECT_EQ(log.model, L"");
  EXPECT_EQ(DecodeVersion("-2147483648", log), Progress::kComplete);
}

// --- DIRENT

std::string Entry(const std::string& name, int sequence) {
  return AsciiLog("DIRENTA", "\"" + name + "\",1000,0,20121231,235959", sequence);
}

std::vector<std::wstring> Names(const FileEntries& entries) {
  std::vector<std::wstring> names;
  for (const FileEntry& entry : entries) names.push_back(entry.name);
  return names;
}

TEST(DirectoryLogs, ReadNameSizeAndTime) {
  FileEntries entries;
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

TEST(DirectoryLogs, ReadEachPartOfDateAndTime) {
  FileEntries entries;
  EXPECT_EQ(DecodeDirectory(AsciiLog("DIRENTA", "plain,2147483647,77,20130709,010203"), entries),
            Progress::kComplete);
  ASSERT_EQ(entries.size(), 1u);
  EXPECT_EQ(entries[0].name, L"plain");
  EXPECT_EQ(entries[0].size, 2147483647u);
  const SYSTEMTIME& time = entries[0].time;
  EXPECT_EQ(time.wYear, 2013);
  EXPECT_EQ(time.wMonth, 7);
  EXPECT_EQ(time.wDay, 9);
  EXPECT_EQ(time.wHour, 1);
  EXPECT_EQ(time.wMinute, 2);
  EXPECT_EQ(time.wSecond, 3);
}

TEST(DirectoryLogs, QuotesProtectCommasOfNames) {
  FileEntries entries;
  EXPECT_EQ(DecodeDirectory(AsciiLog("DIRENTA", "\"a,b\",5,0,20130709,010203"), entries),
            Progress::kComplete);
  ASSERT_EQ(entries.size(), 1u);
  EXPECT_EQ(entries[0].name, L"a,b");
  EXPECT_EQ(entries[0].size, 5u);
}

// Bytes between the logs are skipped; only the whole name begins a log.
TEST(DirectoryLogs, AreFoundAmongOtherFields) {
  FileEntries entries;
  const std::string text = "#DIRENTB,x;#direnta*" + Entry("a", 1) + "[COM1],;*\r\n,\r" + "," +
                           Entry("b", 0) + Entry("c", 0);
  EXPECT_EQ(DecodeDirectory(text, entries), Progress::kComplete);
  EXPECT_THAT(Names(entries), testing::ElementsAre(L"a", L"b"));  // nothing after the last
}

// A file may have the name of the log.
TEST(DirectoryLogs, NoLogBeginsInsideAnother) {
  FileEntries entries;
  const std::string text = AsciiLog("DIRENTA", "#DIRENTA,1,0,20121231,235959", 1) + Entry("b", 0);
  EXPECT_EQ(DecodeDirectory(text, entries), Progress::kComplete);
  EXPECT_THAT(Names(entries), testing::ElementsAre(L"#DIRENTA", L"b"));
}

TEST(DirectoryLogs, WithoutALogWaitForMore) {
  FileEntries entries;
  EXPECT_EQ(DecodeDirectory("#", entries), Progress::kMoreLogs);
  EXPECT_EQ(DecodeDirectory("\"#DIRENTA", entries), Progress::kNothing);
}

// A log that is cut off is distinguished from a complete one that is not the last.
TEST(DirectoryLogs, WaitForTheRestOfALogOrForTheNext) {
  FileEntries entries;
  const std::string whole = Entry("a", 1);
  EXPECT_EQ(DecodeDirectory(whole, entries), Progress::kMoreLogs);
  EXPECT_EQ(DecodeDirectory(whole + "#DIRENTA,COM1,0", entries), Progress::kMore);
  EXPECT_EQ(entries.size(), 1u);
}

TEST(DirectoryLogs, CountDownToTheLast) {
  FileEntries entries;
  const std::string text = Entry("a", 3) + Entry("b", 2) + Entry("c", 1) + Entry("d", 0);
  EXPECT_EQ(DecodeDirectory(text, entries), Progress::kComplete);
  EXPECT_THAT(Names(entries), testing::ElementsAre(L"a", L"b", L"c", L"d"));
}

TEST(DirectoryLogs, AGapIsAnErrorAndKeepsWhatWasRead) {
  FileEntries entries;
  EXPECT_EQ(DecodeDirectory(Entry("a", 3) + Entry("b", 1), entries), Progress::kContradiction);
  EXPECT_THAT(Names(entries), testing::ElementsAre(L"a", L"b"));
}

TEST(DirectoryLogs, SequencesAtTheEndOfTheirRangeDoNotOverflow) {
  FileEntries entries;
  EXPECT_EQ(DecodeDirectory(Entry("a", 2147483647) + Entry("b", 2147483647), entries),
            Progress::kContradiction);
}

// Each beginning of the text waits for more, and holds the complete logs.
TEST(DirectoryLogs, EveryBeginningWaitsForMore) {
  const std::string text = Entry("a", 1) + Entry("b", 0);
  const size_t first = Entry("a", 1).size();
  for (size_t length = 0; length < text.size(); ++length) {
    FileEntries entries;
    const Progress progress = DecodeDirectory(text.substr(0, length), entries);
    EXPECT_TRUE(progress == Progress::kMore || progress == Progress::kMoreLogs) << length;
    EXPECT_EQ(entries.size(), length < first ? 0u : 1u) << length;
  }
  FileEntries entries;
  EXPECT_EQ(DecodeDirectory(text, entries), Progress::kComplete);
}

TEST(DirectoryLogs, TheSameNumberTwiceIsAnError) {
  FileEntries entries;
  EXPECT_EQ(DecodeDirectory(Entry("a", 1) + Entry("b", 1), entries), Progress::kContradiction);
  EXPECT_EQ(DecodeDirectory(Entry("a", 1) + Entry("b", 2), entries), Progress::kContradiction);
  EXPECT_EQ(DecodeDirectory(Entry("a", 1) + Entry("b", -1), entries), Progress::kContradiction);
}

// A number below 0 is not that of the last log.
TEST(DirectoryLogs, CountOnBelowZero) {
  FileEntries entries;
  EXPECT_EQ(DecodeDirectory(Entry("a", -1) + Entry("b", -2), entries), Progress::kMoreLogs);
  EXPECT_EQ(entries.size(), 2u);
}

TEST(DirectoryLogs, StartAgainFromTheFirstByte) {
  FileEntries entries(5);
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
  EXPECT_EQ(DecodeFileHeader(Fields(30, "b,-7"), log), Progress::kComplete);
  EXPECT_EQ(log.file_name, L"b");
  EXPECT_EQ(log.file_size, -7);
}

TEST(FileHeaderLog, OfTooFewFieldsChangesNothing) {
  FileHeaderLog log{.file_name = L"before", .file_size = 5};
  for (const std::string& body :
       {std::string(), std::string("\""), Fields(22, "a,1"), Fields(22, "a,1") + ",\"x"}) {
    EXPECT_EQ(DecodeFileHeader(body, log), Progress::kMore) << body;
    EXPECT_EQ(log.file_name, L"before") << body;
    EXPECT_EQ(log.file_size, 5) << body;
  }
}

// --- COMCONFIG

std::string PortFields(const std::string& settings) {
  return "," + settings + ",ON,OFF,NOVATEL,NOVATEL,ON";
}

TEST(PortConfig, TakesThePortThatIsUsed) {
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

TEST(PortConfig, TakesTheFirstPortToo) {
  PortConfigLog log;
  const std::string body =
      "2" + PortFields("COM1,9600,N,8,1,N") + PortFields("COM2,115200,O,7,2,CTS");
  EXPECT_EQ(DecodePortConfig(body, L"COM1", log), Progress::kComplete);
  EXPECT_EQ(log.port_name, L"COM1");
  EXPECT_EQ(log.baud, 9600);
  EXPECT_EQ(log.data_bits, 8);
}

// The last that has the name.
TEST(PortConfig, OfAPortThatIsListedTwiceIsTheLast) {
  PortConfigLog log;
  const std::string body =
      "2" + PortFields("COM1,9600,E,8,1,XON") + PortFields("COM1,19200,x,7,2,x");
  EXPECT_EQ(DecodePortConfig(body, L"COM1", log), Progress::kComplete);
  EXPECT_EQ(log.baud, 19200);
  EXPECT_EQ(log.parity, 1);  // unknown words change nothing
  EXPECT_EQ(log.handshake, 1);
}

TEST(PortConfig, TheCountGivesTheNumberOfPorts) {
  PortConfigLog log;
  const std::string two = PortFields("COM1,1,N,8,1,N") + PortFields("COM2,2,N,8,1,N");
  EXPECT_EQ(DecodePortConfig("1" + two, L"COM2", log), Progress::kComplete);
  EXPECT_EQ(log.port_name, L"");
  EXPECT_EQ(DecodePortConfig("3" + two, L"COM2", log), Progress::kMore);
  EXPECT_EQ(DecodePortConfig("2" + two, L"COM2", log), Progress::kComplete);
  EXPECT_EQ(log.port_name, L"COM2");
}

TEST(PortConfig, WaitsForAllFields) {
  const std::string body = "1" + PortFields("COM1,9600,N,8,1,N");
  for (size_t length = 1; length < body.rfind(','); ++length) {
    PortConfigLog log;
    EXPECT_EQ(DecodePortConfig(body.substr(0, length), L"COM1", log), Progress::kMore) << length;
    EXPECT_EQ(log.port_name, L"");
  }
  PortConfigLog log;
  EXPECT_EQ(DecodePortConfig(body.substr(0, body.rfind(',') + 1), L"COM1", log),
            Progress::kComplete);
  EXPECT_EQ(DecodePortConfig(body + "\"", L"COM1", log), Progress::kMore);
  EXPECT_EQ(DecodePortConfig("\"", L"COM1", log), Progress::kNothing);
}

TEST(PortConfig, WordsCompareExactly) {
  for (const char* word : {"\"E\"", "e", "EVEN", "", " E"}) {
    PortConfigLog log{.port_name = L"", .parity = 9, .handshake = 9};
    DecodePortConfig("1" + PortFields(std::string("COM1,1,") + word + ",8,1,cts"), L"COM1", log);
    EXPECT_EQ(log.port_name, L"COM1");
    EXPECT_EQ(log.parity, 9) << word;
    EXPECT_EQ(log.handshake, 9) << word;
  }
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
  for (const char* count : {"2147483647", "390451573", "2"}) {  // the second one wraps
    EXPECT_EQ(DecodePortConfig(count + PortFields("COM1,1,N,8,1,N"), L"COM1", log), Progress::kMore)
        << count;
  }
  for (const char* count : {"-2147483648", "-1", "0", "x"}) {
    EXPECT_EQ(DecodePortConfig(count + PortFields("COM1,1,N,8,1,N"), L"COM1", log),
              Progress::kComplete)
        << count;
  }
  EXPECT_EQ(log.port_name, L"");
}

}  // namespace
