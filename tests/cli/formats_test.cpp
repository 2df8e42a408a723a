#include "formats.h"

#include <gtest/gtest.h>

namespace cli {
namespace {

TransferState State(uint64_t done, uint64_t total, uint64_t rate) {
  return {.name = L"LOG.DAT", .done = done, .total = total, .rate = rate};
}

TEST(FormatsTest, FormatsBytes) {
  EXPECT_EQ(FormatBytes(0), "0 B");
  EXPECT_EQ(FormatBytes(999), "999 B");
  EXPECT_EQ(FormatBytes(1000), "1.0 kB");
  EXPECT_EQ(FormatBytes(999'999), "999.9 kB");
  EXPECT_EQ(FormatBytes(1'000'000), "1.0 MB");
  EXPECT_EQ(FormatBytes(4'294'967'295), "4.2 GB");
  EXPECT_EQ(FormatBytes(5'000'000'000'000), "5000.0 GB");
}

TEST(FormatsTest, FormatsDurations) {
  EXPECT_EQ(FormatDuration(0), "0 s");
  EXPECT_EQ(FormatDuration(59), "59 s");
  EXPECT_EQ(FormatDuration(60), "1 min 00 s");
  EXPECT_EQ(FormatDuration(3599), "59 min 59 s");
  EXPECT_EQ(FormatDuration(3600), "1 h 00 min");
  EXPECT_EQ(FormatDuration(100'000), "27 h 46 min");
}

TEST(FormatsTest, FormatsTimes) {
  const SYSTEMTIME time = {2024, 5, 3, 1, 2, 4, 6, 0};
  EXPECT_EQ(FormatTime(time), "2024-05-01 02:04:06");
  EXPECT_EQ(FormatTime(time, 'T'), "2024-05-01T02:04:06");
  EXPECT_EQ(FormatTime(SYSTEMTIME{}), "-");
}

TEST(FormatsTest, PercentIsFullOnlyAtTheEnd) {
  EXPECT_EQ(PercentOf(State(0, 1000, 0)), 0U);
  EXPECT_EQ(PercentOf(State(999, 1000, 0)), 99U);
  EXPECT_EQ(PercentOf(State(1000, 1000, 0)), 100U);
  EXPECT_EQ(PercentOf(State(2000, 1000, 0)), 100U);
  EXPECT_EQ(PercentOf(State(0, 0, 0)), 100U);
}

TEST(FormatsTest, PercentOfTheLargestFile) {
  constexpr uint64_t kLargest = 4'294'967'295;
  EXPECT_EQ(PercentOf(State(kLargest / 2, kLargest, 0)), 49U);
  EXPECT_EQ(PercentOf(State(kLargest - 1, kLargest, 0)), 99U);
}

TEST(FormatsTest, MakesAProgressLine) {
  EXPECT_EQ(ProgressLine(State(500'000, 1'000'000, 10'000)),
            "LOG.DAT: 50 %, 500.0 kB of 1.0 MB, 10.0 kB/s, 50 s left");
  EXPECT_EQ(ProgressLine(State(0, 1'000'000, 0)), "LOG.DAT: 0 %, 0 B of 1.0 MB, 0 B/s, -- left");
}

TEST(FormatsTest, MakesJson) {
  EXPECT_EQ(ProgressJson(State(500, 1000, 250)),
            R"({"file":"LOG.DAT","done":500,"total":1000,"percent":50,"rate":250})");
}

TEST(FormatsTest, MakesAProgressBar) {
  EXPECT_EQ(ProgressBar(State(500'000, 1'000'000, 10'000), 100),
            "[##########          ]  50 %  500.0 kB of 1.0 MB   10.0 kB/s         50 s left  "
            "LOG.DAT");
}

TEST(FormatsTest, BarIsNeverWiderThanItsLine) {
  TransferState state = State(500'000, 1'000'000, 10'000);
  state.name = std::wstring(200, L'x');
  for (size_t width = 0; width < 120; ++width) {
    EXPECT_LE(ProgressBar(state, width).size(), width);
  }
}

TEST(FormatsTest, BarShowsNoControlCharacters) {
  TransferState state = State(1, 2, 1);
  state.name = L"a\x1B[31m";
  EXPECT_NE(ProgressBar(state, 100).find("a\\x1B[31m"), std::string::npos);
  for (size_t width = 0; width < 100; ++width) {
    EXPECT_LE(ProgressBar(state, width).size(), width);
  }
}

}  // namespace
}  // namespace cli
