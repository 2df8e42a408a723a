#include "commands/file_report.h"

#include <gtest/gtest.h>

namespace cli {
namespace {

class FileReportTest : public testing::Test {
 protected:
  static Arguments Quiet() {
    Arguments arguments;
    arguments.json = true;
    return arguments;
  }

  Arguments arguments_ = Quiet();
  Interrupt interrupt_{""};
  Output out_{STD_OUTPUT_HANDLE};
  Output err_{STD_ERROR_HANDLE};
  Context context_{arguments_, interrupt_, out_, err_};
  FileReport report_{context_};
};

TEST_F(FileReportTest, AWholeListIsDone) {
  report_.AddDone(L"a", {{"bytes", 1}});
  report_.SetComplete("");
  const Outcome outcome = std::move(report_).Finish();
  EXPECT_EQ(outcome.exit, ExitCode::kDone);
  EXPECT_EQ(outcome.document.at("complete"), true);
  EXPECT_EQ(outcome.document.at("files").at(0).at("bytes"), 1);
}

TEST_F(FileReportTest, AListInDoubtIsNotDone) {
  report_.AddDone(L"a", {{"bytes", 1}});
  report_.SetComplete("It was cut.");
  const Outcome outcome = std::move(report_).Finish();
  EXPECT_EQ(outcome.exit, ExitCode::kFailed);
  EXPECT_EQ(outcome.document.at("complete"), false);
  EXPECT_EQ(outcome.document.at("warning"), "It was cut.");
  EXPECT_NE(outcome.document.at("error").at("meaning").get<std::string>().find("It was cut."),
            std::string::npos);
}

TEST_F(FileReportTest, ADoubtHidesNoFailure) {
  report_.AddFailed(L"a", {.exit = ExitCode::kLocalFile, .tried = "keep a"});
  report_.SetComplete("It was cut.");
  EXPECT_EQ(std::move(report_).Finish().exit, ExitCode::kLocalFile);
}

}  // namespace
}  // namespace cli
