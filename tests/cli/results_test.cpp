#include "results.h"

#include <gtest/gtest.h>
#include <windows.h>

#include "context.h"

namespace cli {
namespace {

TEST(ResultsTest, EveryCodeOfTheLibraryHasItsOwnText) {
  EXPECT_EQ(MeaningOf(S_OK), "done");
  EXPECT_EQ(MeaningOf(S_FALSE), "no result: nothing found, aborted, or ended by the receiver");
  EXPECT_EQ(MeaningOf(E_INVALIDARG), "invalid argument");
  EXPECT_EQ(MeaningOf(E_OUTOFMEMORY), "this computer is out of memory");
  EXPECT_EQ(MeaningOf(E_NOTIMPL), "not supported by this receiver family or by this version");
  EXPECT_EQ(MeaningOf(E_FAIL), "internal failure");
  EXPECT_EQ(MeaningOf(E_UNEXPECTED), "unexpected kind of link");
  EXPECT_EQ(MeaningOf(static_cast<long>(0x8007048F)),
            "no connection, no complete reply, or the receiver refused the command");
  EXPECT_EQ(MeaningOf(static_cast<long>(0x800705B4)), "the receiver did not answer in time");
  EXPECT_EQ(MeaningOf(static_cast<long>(0x80070002)), "it does not exist");
  EXPECT_EQ(MeaningOf(static_cast<long>(0x80070005)), "access denied: in use, or not allowed");
}

TEST(ResultsTest, OtherCodesHaveTheTextOfWindows) {
  const std::string text = MeaningOf(ResultOfWin32(ERROR_DISK_FULL));
  EXPECT_FALSE(text.empty());
  EXPECT_EQ(text.find_first_of("\r\n"), std::string::npos);
  EXPECT_EQ(MeaningOf(static_cast<long>(0x8007FFF0)), "unknown result code");
}

TEST(ResultsTest, ExitCodesDiffer) {
  EXPECT_EQ(static_cast<int>(ExitCode::kDone), 0);
  EXPECT_EQ(static_cast<int>(ExitCode::kFailed), 1);
  EXPECT_EQ(static_cast<int>(ExitCode::kUsage), 2);
  EXPECT_EQ(static_cast<int>(ExitCode::kNoReceiver), 3);
  EXPECT_EQ(static_cast<int>(ExitCode::kCancelled), 4);
  EXPECT_EQ(static_cast<int>(ExitCode::kLocalFile), 5);
  for (const char* line : {"  0  ", "  1  ", "  2  ", "  3  ", "  4  ", "  5  "}) {
    EXPECT_NE(ExitCodeTable().find(line), std::string::npos) << line;
  }
}

TEST(ResultsTest, AFailureShowsWhatWhereCodeAndMeaning) {
  const Failure failure{.tried = "download A.DAT",
                        .port = "COM7",
                        .code = ResultOfWin32(ERROR_TIMEOUT),
                        .hint = "Try again."};
  EXPECT_EQ(Describe(failure),
            "rcvlink-cli: COM7: could not download A.DAT: 0x800705B4, the receiver did not answer "
            "in time\n"
            "  Try again.\n");
}

TEST(ResultsTest, EachExplainedCodeGivesAHint) {
  const Failure failure{.tried = "delete A.DAT", .code = ResultOfWin32(ERROR_DEVICE_NOT_CONNECTED)};
  EXPECT_NE(Describe(failure).find("`rcvlink-cli explain 0x8007048F`"), std::string::npos);
  EXPECT_EQ(HintOf(Failure{.code = ResultOfWin32(ERROR_ARENA_TRASHED)}), "");
}

TEST(ResultsTest, ACodeThatReadsAsASuccessIsNotShown) {
  for (const long code : {long{S_OK}, long{S_FALSE}}) {
    const Failure failure{.tried = "delete A.DAT", .code = code, .meaning = "it is still there"};
    EXPECT_EQ(Describe(failure).find("rcvlink-cli: could not delete A.DAT: it is still there\n"),
              0U)
        << Describe(failure);
  }
}

TEST(ResultsTest, TheKeptFileIsShown) {
  const Failure failure{.tried = "download A.DAT", .code = S_OK, .hint = "x", .kept = "A.DAT.part"};
  EXPECT_NE(Describe(failure).find("kept in A.DAT.part\n"), std::string::npos);
  EXPECT_EQ(ToJson(failure).at("kept"), "A.DAT.part");
}

TEST(ResultsTest, ACancellationIsNoFailure) {
  const Failure failure{.exit = ExitCode::kCancelled,
                        .tried = "download A.DAT",
                        .port = "COM7",
                        .code = S_FALSE,
                        .meaning = "ended by Ctrl-C"};
  EXPECT_EQ(Describe(failure),
            "rcvlink-cli: COM7: cancelled: did not download A.DAT: ended by Ctrl-C\n");
}

TEST(ResultsTest, AFailureIsAlsoJson) {
  const Failure failure{.exit = ExitCode::kNoReceiver,
                        .tried = "find a receiver",
                        .port = "COM7",
                        .code = S_FALSE,
                        .meaning = "no receiver answered"};
  const Json expected = {{"tried", "find a receiver"},
                         {"port", "COM7"},
                         {"code", "0x00000001"},
                         {"meaning", "no receiver answered"},
                         {"hint", "`rcvlink-cli explain 0x00000001` says what to try."},
                         {"exit", 3}};
  EXPECT_EQ(ToJson(failure), expected);
  EXPECT_TRUE(ToJson(Failure{})["port"].is_null());
}

}  // namespace
}  // namespace cli
