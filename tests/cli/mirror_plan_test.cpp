#include "mirror_plan.h"

#include <gtest/gtest.h>

namespace cli {
namespace {

TEST(MirrorPlanTest, DownloadsWhatIsMissingOrDiffersInSize) {
  EXPECT_EQ(StepFor(100, std::nullopt, false), MirrorStep::kDownload);
  EXPECT_EQ(StepFor(100, 99, false), MirrorStep::kDownload);
  EXPECT_EQ(StepFor(100, 101, false), MirrorStep::kDownload);
  EXPECT_EQ(StepFor(100, 0, true), MirrorStep::kDownload);
  EXPECT_EQ(StepFor(100, 100, false), MirrorStep::kNothing);
}

TEST(MirrorPlanTest, WhatIsToBeDeletedIsComparedFirst) {
  EXPECT_EQ(StepFor(100, 100, true), MirrorStep::kCompare);
}

TEST(MirrorPlanTest, AnEmptyFileIsNotTransferred) {
  EXPECT_EQ(StepFor(0, std::nullopt, false), MirrorStep::kMakeEmpty);
  EXPECT_EQ(StepFor(0, std::nullopt, true), MirrorStep::kMakeEmpty);
  EXPECT_EQ(StepFor(0, 0, false), MirrorStep::kNothing);
  EXPECT_EQ(StepFor(0, 0, true), MirrorStep::kNothing);
}

TEST(MirrorPlanTest, TheWorstExitCodeCounts) {
  EXPECT_EQ(Worse(ExitCode::kDone, ExitCode::kLocalFile), ExitCode::kLocalFile);
  EXPECT_EQ(Worse(ExitCode::kLocalFile, ExitCode::kDone), ExitCode::kLocalFile);
  EXPECT_EQ(Worse(ExitCode::kFailed, ExitCode::kLocalFile), ExitCode::kFailed);
  EXPECT_EQ(Worse(ExitCode::kFailed, ExitCode::kCancelled), ExitCode::kCancelled);
  EXPECT_EQ(Worse(ExitCode::kNoReceiver, ExitCode::kFailed), ExitCode::kNoReceiver);
}

TEST(MirrorPlanTest, ShowsTheFileAndTheTimeLeftInTotal) {
  EXPECT_EQ(InWords(MirrorState{.file = 1, .files = 2, .total = 3000}, L"A.JPS", 1000),
            "File 1 of 2: A.JPS, 1.0 kB");
  const MirrorState state{
      .file = 3, .files = 300, .done = 2000, .total = 622'000, .elapsed_ms = 1000};
  EXPECT_EQ(InWords(state, L"A.JPS", 1'250'000),
            "File 3 of 300: A.JPS, 1.2 MB, 5 min 10 s left in total");
}

TEST(MirrorPlanTest, APartOfASecondCounts) {
  const MirrorState state{.file = 2, .files = 2, .done = 2000, .total = 2001, .elapsed_ms = 1000};
  EXPECT_EQ(InWords(state, L"A", 1), "File 2 of 2: A, 1 B, 1 s left in total");
}

// A log that is still being recorded may be larger than listed.
TEST(MirrorPlanTest, NoTimeIsLeftWhenMoreCameThanListed) {
  const MirrorState state{.file = 2, .files = 2, .done = 900, .total = 800, .elapsed_ms = 10'000};
  EXPECT_EQ(InWords(state, L"A", 0), "File 2 of 2: A, 0 B, 0 s left in total");
}

}  // namespace
}  // namespace cli
