// rcvlink-cli get: what lands on the disk, and what never does.
#include <nlohmann/json.hpp>

#include "tests/cli_run/cli.h"

namespace cli_run {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

TEST_F(Cli, GetBringsTheFile) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(3000)}});
  const auto result = RunOn(receiver, {"get", "a.jps"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_EQ(folder.Read("a.jps"), Content(3000));
  EXPECT_THAT(LocalFiles(), ElementsAre("a.jps"));
  EXPECT_THAT(result.output, HasSubstr("3000 bytes"));
}

TEST_F(Cli, GetSpeaksLittleWhenQuiet) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(30)}});
  const auto result = RunOn(receiver, {"get", "a.jps", "--quiet"});
  EXPECT_EQ(result.status, kDone);
  EXPECT_EQ(result.output, "");
  EXPECT_EQ(result.errors, "");
  EXPECT_EQ(folder.Read("a.jps"), Content(30));
}

TEST_F(Cli, GetTakesAllIntoAFolder) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(30)}, {"b.jps", Content(1000)}});
  const auto result = RunOn(receiver, {"get", "--all", "-o", "out\\", "--json"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_EQ(folder.Read("out/a.jps"), Content(30));
  EXPECT_EQ(folder.Read("out/b.jps"), Content(1000));
  EXPECT_EQ(nlohmann::json::parse(result.output).at("files").size(), 2u);
}

TEST_F(Cli, GetNeverOverwritesUnlessForced) {
  folder.Write("a.jps", "mine");
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(30)}});
  const auto refused = RunOn(receiver, {"get", "a.jps"});
  EXPECT_EQ(refused.status, kLocalFile);
  EXPECT_THAT(refused.errors, HasSubstr("exists"));
  EXPECT_EQ(folder.Read("a.jps"), "mine");
  EXPECT_EQ(RunOn(receiver, {"get", "a.jps", "--force"}).status, kDone);
  EXPECT_EQ(folder.Read("a.jps"), Content(30));
  EXPECT_THAT(LocalFiles(), ElementsAre("a.jps"));
}

TEST_F(Cli, GetOfAnUnknownFileTransfersNothing) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(30)}});
  const auto result = RunOn(receiver, {"get", "a.jps", "b.jps"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("b.jps"));
  EXPECT_THAT(LocalFiles(), IsEmpty());
}

// The library calls it a success; the program knows better.
TEST_F(Cli, AFileOfAnotherSizeThanListedIsAFailure) {
  const bed::SimulatedPort receiver({"quorin", "--lie-size", "a.jps=4000"},
                                    {{"a.jps", Content(3000)}});
  const auto result = RunOn(receiver, {"get", "a.jps"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("4000"));
  EXPECT_THAT(LocalFiles(), IsEmpty());
}

TEST_F(Cli, ATransferEndedByTheReceiverLeavesNothing) {
  const bed::SimulatedPort receiver({"quorin", "--end-block", "2"}, {{"a.jps", Content(3000)}});
  const auto result = RunOn(receiver, {"get", "a.jps"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(LocalFiles(), IsEmpty());
}

TEST_F(Cli, AFolderThatCannotBeMadeIsALocalError) {
  folder.Write("taken", "a file");
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(30)}});
  const auto result = RunOn(receiver, {"get", "a.jps", "-o", "taken\\deep\\a.jps"});
  EXPECT_EQ(result.status, kLocalFile);
  EXPECT_THAT(LocalFiles(), ElementsAre("taken"));
}

// Names that would climb out of the folder or open a device are kept inside, under another name.
TEST_F(Cli, NamesOfTheReceiverStayInTheFolder) {
  std::filesystem::create_directory(folder / "in");
  folder.Write("in/keep", "");
  const bed::SimulatedPort receiver(
      {"quorin"},
      {{"..\\evil.txt", Content(30)}, {"C:evil.txt", Content(31)}, {"NUL.txt", Content(32)}});
  const auto result = RunOn(receiver, {"get", "--all", "-o", "in\\"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(LocalFiles(), ElementsAre("in"));
  size_t files = 0;
  for (const auto& entry : std::filesystem::directory_iterator(folder / "in")) {
    files += entry.is_regular_file();
  }
  EXPECT_EQ(files, 4u);
}

TEST_F(Cli, ASilentTransferIsEndedAfterTheStallTimeOut) {
  const bed::SimulatedPort receiver({"quorin", "--block-silence", "3:600@always"},
                                    {{"a.jps", Content(5000)}});
  const auto result = RunOn(receiver, {"get", "a.jps", "--stall-timeout", "2"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("nothing new"));
  EXPECT_THAT(LocalFiles(), IsEmpty());
}

TEST_F(Cli, CtrlCEndsADownloadAndLeavesNothing) {
  const bed::SimulatedPort receiver({"quorin", "--pace"}, {{"a.jps", Content(200000)}});
  bed::Program program(
      kProgram, On(receiver, {"get", "a.jps"}), bed::Output::kTerminal, folder.unix_path());
  receiver.WaitForTranscript("seq=5");
  program.Interrupt();
  const auto result = program.Finish();
  EXPECT_EQ(result.status, kCancelled) << result.output;
  EXPECT_THAT(result.output, HasSubstr("cancelled"));
  EXPECT_THAT(LocalFiles(), IsEmpty());
  receiver.WaitForTranscript("= speed 9600");
}

TEST_F(Cli, CtrlCEndsASearch) {
  const bed::SimulatedPort receiver({"quorin", "--mute", "ping"});
  bed::Program program(
      kProgram, On(receiver, {"find"}), bed::Output::kTerminal, folder.unix_path());
  receiver.WaitForTranscript("> dm");
  program.Interrupt();
  EXPECT_EQ(program.Finish().status, kCancelled);
}

TEST_F(Cli, ATerminalGetsAProgressBar) {
  const bed::SimulatedPort receiver({"quorin", "--pace"}, {{"a.jps", Content(30000)}});
  bed::Program program(
      kProgram, On(receiver, {"get", "a.jps"}), bed::Output::kTerminal, folder.unix_path());
  const auto result = program.Finish();
  EXPECT_EQ(result.status, kDone) << result.output;
  size_t bars = 0;
  for (const std::string& line : result.history) {
    bars += line.find('[') != std::string::npos && line.find(" %") != std::string::npos &&
            line.find("left") != std::string::npos;
  }
  EXPECT_GT(bars, 5u);
  EXPECT_EQ(folder.Read("a.jps"), Content(30000));
}

}  // namespace
}  // namespace cli_run
