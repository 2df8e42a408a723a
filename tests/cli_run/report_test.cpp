// The command that shows a report, with a report that the program has just written.
#include <filesystem>
#include <nlohmann/json.hpp>

#include "tests/cli_run/cli.h"

namespace cli_run {
namespace {

using nlohmann::json;
using testing::HasSubstr;

TEST_F(Cli, AReportBecomesAnExchangeAndAPage) {
  const std::string name =
      "cli-report-" + std::filesystem::path(folder.unix_path()).filename().string();
  const bed::SimulatedPort receiver({"quorin"});
  ASSERT_EQ(RunOn(receiver, {"info", "--report", name}).status, kDone);

  const auto text = Run({"report", name});
  EXPECT_EQ(text.status, kDone) << text.errors;
  EXPECT_THAT(text.output, HasSubstr("library -> receiver  read the model"));
  const json document = json::parse(Run({"report", name, "--json"}).output);
  EXPECT_EQ(document.at("failures"), 0);
  EXPECT_THAT(document.at("entries").at(0).at("line"), HasSubstr("rcvlink-cli 1."));

  EXPECT_EQ(Run({"report", name, "--html", "page.html"}).status, kDone);
  EXPECT_THAT(folder.Read("page.html"), HasSubstr("read the model"));
  folder.Write("page.html", "another's");
  const auto refused = Run({"report", name, "--html", "page.html"});
  EXPECT_EQ(refused.status, kLocalFile);
  EXPECT_THAT(refused.errors, HasSubstr("it already exists"));
  EXPECT_EQ(folder.Read("page.html"), "another's");
  EXPECT_EQ(Run({"report", name, "--html", "page.html", "--force"}).status, kDone);
  EXPECT_THAT(folder.Read("page.html"), HasSubstr("read the model"));
  std::filesystem::remove(std::filesystem::temp_directory_path() / name);
}

TEST_F(Cli, AFileThatIsNoReportIsRefused) {
  folder.Write("letter.txt", "Dear Sir\r\n");
  const auto letter = Run({"report", "letter.txt"});
  EXPECT_EQ(letter.status, kFailed);
  EXPECT_THAT(letter.errors, HasSubstr("the file contains no line of a report"));
  EXPECT_EQ(Run({"report", "none.txt"}).status, kLocalFile);

  const std::string report = "12:00:00.0000     36 Bye!\r\n";
  folder.Write("trace.txt", report);
  EXPECT_EQ(Run({"report", "trace.txt", "--html", "TRACE.TXT", "--force"}).status, kUsage);
  EXPECT_EQ(folder.Read("trace.txt"), report);
}

}  // namespace
}  // namespace cli_run
