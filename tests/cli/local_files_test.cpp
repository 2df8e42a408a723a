#include "local_files.h"

#include <gtest/gtest.h>

#include "results.h"
#include "temporary_folder.h"

namespace cli {
namespace {

class LocalFilesTest : public testing::Test {
 protected:
  std::filesystem::path Write(const std::wstring& name, const std::string& text) const {
    folder_.Write(name, text);
    return folder_.path() / name;
  }

  TemporaryFolder folder_;
};

TEST_F(LocalFilesTest, ReturnsSizes) {
  EXPECT_EQ(SizeOf(Write(L"a", "12345")), 5U);
  EXPECT_EQ(SizeOf(folder_.path() / L"none"), std::nullopt);
}

TEST_F(LocalFilesTest, KnowsAFileThatHasGrown) {
  const std::string text = std::string(70'000, 'x') + "y";
  const auto old = Write(L"old", text);
  EXPECT_TRUE(BeginsWith(Write(L"new", text + "z"), old));
  EXPECT_TRUE(BeginsWith(Write(L"new", text), old));
  EXPECT_FALSE(BeginsWith(Write(L"new", std::string(70'000, 'x')), old));
  EXPECT_FALSE(BeginsWith(Write(L"new", std::string(70'000, 'x') + "wz"), old));
  EXPECT_FALSE(BeginsWith(Write(L"new", ""), old));
  EXPECT_TRUE(BeginsWith(old, Write(L"empty", "")));
}

TEST_F(LocalFilesTest, HashesAFile) {
  EXPECT_EQ(Sha256Of(Write(L"abc", "abc")),
            "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad");
  EXPECT_EQ(Sha256Of(Write(L"million", std::string(1'000'000, 'a'))),
            "cdc76e5c9914fb9281a1c7e284d73e67f1809a48a497200e046d39ccc7112cd0");
}

TEST_F(LocalFilesTest, AFileThatCannotBeReadIsAFailureOfThisComputer) {
  try {
    BeginsWith(folder_.path() / L"none", folder_.path() / L"none");
    ADD_FAILURE() << "was read";
  } catch (const Failure& failure) {
    EXPECT_EQ(failure.exit, ExitCode::kLocalFile);
  }
}

TEST_F(LocalFilesTest, MovesOverWhatIsThere) {
  const auto from = Write(L"from", "new");
  const auto target = Write(L"to", "old");
  MoveOver(from, target);
  EXPECT_EQ(folder_.Read(L"to"), "new");
  EXPECT_FALSE(folder_.Has(L"from"));
  EXPECT_THROW(MoveOver(from, target), Failure);
}

TEST_F(LocalFilesTest, MakesAnEmptyFile) {
  MakeEmpty(Write(L"a", "old"));
  EXPECT_EQ(SizeOf(folder_.path() / L"a"), 0U);
  EXPECT_THROW(MakeEmpty(folder_.path() / L"none" / L"a"), Failure);
}

SYSTEMTIME TimeOf(const std::filesystem::path& file) {
  WIN32_FILE_ATTRIBUTE_DATA data{};
  EXPECT_TRUE(GetFileAttributesExW(file.c_str(), GetFileExInfoStandard, &data));
  SYSTEMTIME time{};
  FileTimeToSystemTime(&data.ftLastWriteTime, &time);
  return time;
}

// A summer day at half past twelve.
constexpr SYSTEMTIME kNoon{2024, 7, 1, 1, 12, 30, 0, 0};

TEST_F(LocalFilesTest, SetsTheTimeOfAFile) {
  const auto file = Write(L"a", "");
  const auto time = ToFileTime(kNoon, TimeZone::kUtc);
  ASSERT_TRUE(time);
  SetTime(file, *time);
  const SYSTEMTIME kept = TimeOf(file);
  EXPECT_EQ(kept.wYear, 2024);
  EXPECT_EQ(kept.wHour, 12);
  EXPECT_EQ(kept.wMinute, 30);
}

TEST_F(LocalFilesTest, ALocalTimeIsThatOfTheZone) {
  TIME_ZONE_INFORMATION two_hours_east{};
  two_hours_east.Bias = -120;
  const auto utc = ToFileTime(kNoon, TimeZone::kLocal, &two_hours_east);
  ASSERT_TRUE(utc);
  SYSTEMTIME time{};
  FileTimeToSystemTime(&*utc, &time);
  EXPECT_EQ(time.wHour, 10);
  EXPECT_EQ(time.wMinute, 30);
}

TEST_F(LocalFilesTest, AnInvalidTimeIsIgnored) {
  EXPECT_EQ(ToFileTime({}, TimeZone::kUtc), std::nullopt);
  EXPECT_EQ(ToFileTime({}, TimeZone::kLocal), std::nullopt);
}

TEST_F(LocalFilesTest, TheZoneIsShown) {
  EXPECT_EQ(InWords(TimeZone::kUtc), "UTC");
  EXPECT_NE(InWords(TimeZone::kLocal).find("local time"), std::string::npos);
}

}  // namespace
}  // namespace cli
