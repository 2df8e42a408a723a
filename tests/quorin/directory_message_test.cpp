#include "quorin/directory_message.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <ctime>
#include <optional>
#include <string>

#include "tests/support/guarded_bytes.h"

using namespace QuorinCommands;
using Kind = QuorinCommands::DirectoryMessage::Kind;

namespace {

constexpr int64_t kMinute = 60;
constexpr int64_t kHour = 60 * kMinute;
constexpr int64_t kDay = 24 * kHour;

DirectoryMessage Parse(std::string_view text) {
  const GuardedBytes guarded(text);
  return ParseDirectoryMessage(guarded.View());
}

// Year, month, day, weekday, hour, minute, second, milliseconds.
std::string Text(const SYSTEMTIME& time) {
  std::string text;
  for (const WORD field : {time.wYear,
                           time.wMonth,
                           time.wDay,
                           time.wDayOfWeek,
                           time.wHour,
                           time.wMinute,
                           time.wSecond,
                           time.wMilliseconds}) {
    text += std::to_string(field) + " ";
  }
  return text;
}

constexpr char kNoTime[] = "0 0 0 0 0 0 0 0 ";
constexpr char kZeroTime[] = "1988 1 1 5 0 0 0 0 ";

TEST(QuorinDirectoryMessage, IsNothingWhenItEndsAmongBracesAndBlanks) {
  for (const std::string_view text : {"", " ", "{", "{{", "{ { "}) {
    EXPECT_EQ(Parse(text).kind, Kind::kNothing) << text;
  }
}

TEST(QuorinDirectoryMessage, IsTheEndWhenABraceCloses) {
  for (const std::string_view text : {"}", "{}", "{{}}", " { }", "}name,1,2}", "{}}name,1,2"}) {
    EXPECT_EQ(Parse(text).kind, Kind::kEnd) << text;
  }
}

TEST(QuorinDirectoryMessage, HoldsAnEntry) {
  const DirectoryMessage message = Parse("{A0101.log,1234,86400}");
  EXPECT_EQ(message.kind, Kind::kEntry);
  EXPECT_EQ(message.entry.name, L"A0101.log");
  EXPECT_EQ(message.entry.size, 1234U);
  EXPECT_EQ(Text(message.entry.time), "1988 1 2 6 0 0 0 0 ");
  EXPECT_FALSE(message.last);
}

TEST(QuorinDirectoryMessage, OpensWithAnyRunOfBracesAndBlanks) {
  for (const std::string_view text : {"n,1,2}", "{n,1,2}", "{{n,1,2}", " { {  n,1,2}"}) {
    EXPECT_EQ(Parse(text).entry.name, L"n") << text;
    EXPECT_EQ(Parse(text).entry.size, 1U) << text;
  }
}

TEST(QuorinDirectoryMessage, IsTheLastWithTwoClosingBraces) {
  EXPECT_TRUE(Parse("{{n,1,2}}").last);
  EXPECT_TRUE(Parse("{n,1,2 }}\r\n").last);
  EXPECT_TRUE(Parse("{n,}}").last);
  EXPECT_FALSE(Parse("{n,1,2}").last);
  EXPECT_FALSE(Parse("{n,1,2} }").last);
  EXPECT_FALSE(Parse("{{n,1,2").last);
}

TEST(QuorinDirectoryMessage, IsNotTheLastForBracesInTheName) {
  const DirectoryMessage message = Parse("{a}}b,1,2}");
  EXPECT_EQ(message.entry.name, L"a}}b");
  EXPECT_FALSE(message.last);
}

TEST(QuorinDirectoryMessage, KeepsANameAsItIs) {
  EXPECT_EQ(Parse("{ a b {c} ,1,2}").entry.name, L"a b {c} ");
  EXPECT_EQ(Parse("{,1,2}").entry.name, L"");
  EXPECT_EQ(Parse("{,1,2}").entry.size, 1U);
}

TEST(QuorinDirectoryMessage, KeepsThirtyTwoBytesOfTheName) {
  const std::string exact(32, 'n');
  EXPECT_EQ(Parse("{" + exact + ",7,0}").entry.name, std::wstring(32, L'n'));
  const DirectoryMessage cut = Parse("{" + exact + "x,7,86400}}");
  EXPECT_EQ(cut.entry.name, std::wstring(32, L'n'));
  EXPECT_EQ(cut.entry.size, 7U);
  EXPECT_EQ(Text(cut.entry.time), "1988 1 2 6 0 0 0 0 ");
  EXPECT_TRUE(cut.last);
}

TEST(QuorinDirectoryMessage, ReadsTheNameInTheCodePageOfTheThread) {
  const std::string name = "\xC4\xE9.log";
  wchar_t expected[16] = {};
  MultiByteToWideChar(CP_THREAD_ACP, 0, name.c_str(), -1, expected, 16);
  EXPECT_EQ(Parse(name + ",1,2}").entry.name, expected);
}

TEST(QuorinDirectoryMessage, WithoutACommaIsANameAlone) {
  const DirectoryMessage message = Parse("{name}");
  EXPECT_EQ(message.kind, Kind::kEntry);
  EXPECT_EQ(message.entry.name, L"name}");
  EXPECT_EQ(message.entry.size, 0U);
  EXPECT_FALSE(message.last);
  EXPECT_FALSE(Parse("{name}}").last);
}

TEST(QuorinDirectoryMessage, WithoutASizeHasNone) {
  EXPECT_EQ(Parse("{n,").entry.size, 0U);
  EXPECT_EQ(Parse("{n,,86400}").entry.size, 0U);
  EXPECT_EQ(Text(Parse("{n,,86400}").entry.time), "1988 1 2 6 0 0 0 0 ");
}

TEST(QuorinDirectoryMessage, WithoutATimeIsOfTheReceiversZero) {
  for (const std::string_view text : {"{n", "{n,", "{n,12", "{n,12,", "{n,12}", "{n,12,}}"}) {
    EXPECT_EQ(Text(Parse(text).entry.time), kZeroTime) << text;
  }
}

TEST(QuorinDirectoryMessage, HasItsTimeOneCharacterAfterTheSize) {
  EXPECT_EQ(Text(Parse("{n,12;86400}").entry.time), "1988 1 2 6 0 0 0 0 ");
  EXPECT_EQ(Text(Parse("{n,12, 86400}").entry.time), "1988 1 2 6 0 0 0 0 ");
  EXPECT_EQ(Text(Parse("{n,12;;86400}").entry.time), kZeroTime);
}

TEST(QuorinDirectoryMessage, HoldsSizesUpToFourGigabytes) {
  EXPECT_EQ(Parse("{n,4294967295,0}").entry.size, 4294967295U);
  EXPECT_EQ(Parse("{n,2147483648,0}").entry.size, 2147483648U);
}

TEST(QuorinDirectoryMessage, WithTooLargeASizeKeepsNameAndTime) {
  const DirectoryMessage message = Parse("{n,99999999999999999999999,86400}}");
  EXPECT_EQ(message.entry.name, L"n");
  EXPECT_EQ(message.entry.size, 4294967295U);
  EXPECT_EQ(Text(message.entry.time), "1988 1 2 6 0 0 0 0 ");
  EXPECT_TRUE(message.last);
}

TEST(QuorinDirectoryMessage, EndsAtAZeroByte) {
  const DirectoryMessage message = Parse(std::string_view("{n,1,2\0}}", 9));
  EXPECT_EQ(message.entry.size, 1U);
  EXPECT_FALSE(message.last);
}

TEST(QuorinDirectoryMessage, WithATimeThatCannotBeConvertedHasNone) {
  for (const char* const time : {"-9000000000", "99999999999999", "9223372036854775807"}) {
    const DirectoryMessage message = Parse("{n,5," + std::string(time) + "}");
    EXPECT_EQ(message.kind, Kind::kEntry) << time;
    EXPECT_EQ(message.entry.size, 5U) << time;
    EXPECT_EQ(Text(message.entry.time), kNoTime) << time;
  }
}

TEST(QuorinDirectoryMessage, IsNeverReadBeyondItsEnd) {
  const std::string text = "{ {name,123,456}}";
  for (size_t length = 0; length <= text.size(); ++length) {
    EXPECT_NO_THROW(Parse(std::string_view(text).substr(0, length)));
  }
}

// Time zones by the name that the runtime library gives them; the one in force comes back.
class QuorinFileTime : public testing::TestWithParam<const char*> {
 protected:
  void SetUp() override {
    _putenv(GetParam());
    _tzset();
  }
  void TearDown() override {
    _putenv("TZ=");
    _tzset();
  }

  static std::string TimeText(int64_t seconds) {
    const auto time = TimeFromReceiver(seconds);
    return time ? Text(*time) : "none";
  }

  // The same with the runtime library alone.
  static std::string ExpectedText(int64_t seconds) {
    std::tm start{};
    start.tm_year = 88;
    start.tm_mday = 1;
    start.tm_isdst = -1;
    const std::time_t sum = std::mktime(&start) + seconds;
    const std::tm local = *std::localtime(&sum);
    std::string text;
    for (const int field : {local.tm_year + 1900,
                            local.tm_mon + 1,
                            local.tm_mday,
                            local.tm_wday,
                            local.tm_hour,
                            local.tm_min,
                            local.tm_sec,
                            0}) {
      text += std::to_string(field) + " ";
    }
    return text;
  }
};

TEST_P(QuorinFileTime, StartsAtTheLocalNewYearOf1988) {
  EXPECT_EQ(TimeText(0), kZeroTime);
  EXPECT_EQ(TimeText(kHour + 2 * kMinute + 3), "1988 1 1 5 1 2 3 0 ");
  EXPECT_EQ(TimeText(-1), "1987 12 31 4 23 59 59 0 ");
}

TEST_P(QuorinFileTime, KnowsLeapDays) {
  EXPECT_EQ(TimeText(59 * kDay), "1988 2 29 1 0 0 0 0 ");
  EXPECT_EQ(TimeText(366 * kDay), "1989 1 1 0 0 0 0 0 ");
}

TEST_P(QuorinFileTime, MatchesTheRuntimeLibrary) {
  // Every eleven days and a bit: all seasons, both sides of each change of the clock.
  for (int64_t seconds = 0; seconds < 60 * 365 * kDay; seconds += 11 * kDay + 12345) {
    ASSERT_EQ(TimeText(seconds), ExpectedText(seconds)) << seconds;
  }
}

TEST_P(QuorinFileTime, DoesNotConvertTimesOutOfTheLibrarysRange) {
  EXPECT_EQ(TimeText(-100 * 365 * kDay), "none");
  EXPECT_EQ(TimeText(2000 * 365 * kDay), "none");
  EXPECT_EQ(TimeText(INT64_MAX), "none");
  EXPECT_EQ(TimeText(INT64_MIN), "none");
}

INSTANTIATE_TEST_SUITE_P(Zones,
                         QuorinFileTime,
                         testing::Values("TZ=", "TZ=UTC0", "TZ=EST5EDT", "TZ=IST-5:30"));

}  // namespace
