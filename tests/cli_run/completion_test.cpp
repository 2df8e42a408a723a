// rcvlink-cli completion: the script for PowerShell, as far as it can be checked without
// PowerShell.
#include <algorithm>

#include "tests/cli_run/cli.h"

namespace cli_run {
namespace {

using testing::HasSubstr;

TEST_F(Cli, TheCompletionScriptKnowsCommandsAndOptions) {
  const auto result = Run({"completion"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(result.output, HasSubstr("'get' = 'Download files'"));
  EXPECT_THAT(result.output, HasSubstr("'--skip-existing' = 'Skip files"));
  EXPECT_THAT(result.output, HasSubstr("'--json' = "));
}

// An apostrophe in a description does not end its string.
TEST_F(Cli, TheCompletionScriptIsWellFormed) {
  const std::string script = Run({"completion"}).output;
  EXPECT_THAT(script, HasSubstr("the receiver''s files"));
  EXPECT_EQ(std::ranges::count(script, '\'') % 2, 0);
  EXPECT_EQ(std::ranges::count(script, '{'), std::ranges::count(script, '}'));
  EXPECT_EQ(std::ranges::count(script, '('), std::ranges::count(script, ')'));
}

}  // namespace
}  // namespace cli_run
