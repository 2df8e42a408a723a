// rcvlink-cli get: which files are written, and which never are.
#include <windows.h>

#include <filesystem>
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

TEST_F(Cli, GetPrintsNothingWhenQuiet) {
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

// The library returns success; the program compares the sizes and keeps the data.
TEST_F(Cli, AFileOfAnotherSizeThanListedIsKeptAsAPart) {
  for (const char* listed : {"4000", "2000"}) {
    const bed::SimulatedPort receiver({"velmar", "--lie-size", std::string("a.jps=") + listed},
                                      {{"a.jps", Content(3000)}});
    const auto result = RunOn(receiver, {"get", "a.jps", "--force", "--protocol", "velmar"});
    EXPECT_EQ(result.status, kFailed);
    EXPECT_THAT(result.errors, HasSubstr(std::string("listed ") + listed + " bytes, but 3000"));
    EXPECT_THAT(result.errors, HasSubstr("kept in a.jps.part"));
    EXPECT_THAT(LocalFiles(), ElementsAre("a.jps.part"));
    EXPECT_EQ(folder.Read("a.jps.part"), Content(3000));
  }
}

TEST_F(Cli, AShorterFileOfAQuorinReceiverIsKeptToo) {
  const bed::SimulatedPort receiver({"quorin", "--lie-size", "a.jps=4000"},
                                    {{"a.jps", Content(3000)}});
  const auto result = RunOn(receiver, {"get", "a.jps", "--json"});
  EXPECT_EQ(result.status, kFailed);
  const auto error = nlohmann::json::parse(result.output).at("files").at(0).at("error");
  EXPECT_EQ(error.at("kept"), "a.jps.part");
  EXPECT_EQ(folder.Read("a.jps.part"), Content(3000));
}

TEST_F(Cli, ACompleteDownloadSurvivesARenameThatFails) {
  folder.Write("a.jps", "mine");
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(3000)}});
  const HANDLE open = CreateFileW((folder / "a.jps").c_str(),
                                  GENERIC_READ,
                                  FILE_SHARE_READ,
                                  nullptr,
                                  OPEN_EXISTING,
                                  0,
                                  nullptr);
  ASSERT_NE(open, INVALID_HANDLE_VALUE);
  const auto result = RunOn(receiver, {"get", "a.jps", "--force"});
  CloseHandle(open);
  EXPECT_EQ(result.status, kLocalFile);
  EXPECT_THAT(result.errors, HasSubstr("kept in a.jps.part"));
  EXPECT_EQ(folder.Read("a.jps.part"), Content(3000));
  EXPECT_EQ(folder.Read("a.jps"), "mine");
}

TEST_F(Cli, TheDataOfAFailedDownloadIsKeptWhenAskedFor) {
  const bed::SimulatedPort receiver({"quorin", "--end-block", "2"}, {{"a.jps", Content(3000)}});
  const auto result = RunOn(receiver, {"get", "a.jps", "--keep-partial"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(LocalFiles(), ElementsAre("a.jps.part"));
  EXPECT_EQ(folder.Read("a.jps.part"), Content(3000).substr(0, 1024));
}

TEST_F(Cli, GetTakesPatterns) {
  const bed::SimulatedPort receiver(
      {"quorin"}, {{"a.jps", Content(30)}, {"B.JPS", Content(40)}, {"c.log", Content(50)}});
  const auto result = RunOn(receiver, {"get", "*.jps", "a.*", "a.jps", "--json"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(LocalFiles(), ElementsAre("B.JPS", "a.jps"));
  EXPECT_EQ(nlohmann::json::parse(result.output).at("files").size(), 2u);
}

TEST_F(Cli, AnEmptyFileIsMadeWithoutATransfer) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", ""}, {"b.jps", Content(30)}});
  EXPECT_EQ(RunOn(receiver, {"get", "--all"}).status, kDone);
  EXPECT_EQ(folder.Read("a.jps"), "");
  EXPECT_EQ(folder.Read("b.jps"), Content(30));
}

TEST_F(Cli, APatternThatFitsNothingTransfersNothing) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(30)}});
  const auto result = RunOn(receiver, {"get", "a.jps", "*.log"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("could not download *.log"));
  EXPECT_THAT(LocalFiles(), IsEmpty());
}

TEST_F(Cli, ExistingFilesCanBeSkipped) {
  folder.Write("a.jps", Content(30));
  folder.Write("b.jps", "mine");
  const bed::SimulatedPort receiver(
      {"quorin"}, {{"a.jps", Content(30)}, {"b.jps", Content(40)}, {"c.jps", Content(50)}});
  const auto result = RunOn(receiver, {"get", "a.jps", "*.jps", "--skip-existing", "--json"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_EQ(folder.Read("b.jps"), "mine");
  EXPECT_EQ(folder.Read("c.jps"), Content(50));
  const auto files = nlohmann::json::parse(result.output).at("files");
  ASSERT_EQ(files.size(), 3u);
  EXPECT_EQ(files[0].at("skipped"), true);
  EXPECT_EQ(files[1].at("bytes"), 4);
  EXPECT_FALSE(files[2].contains("skipped"));
  // With --quiet only the file with another size is reported.
  EXPECT_EQ(result.errors, "b.jps: already exists, with 4 bytes; the receiver lists 40\n");
}

// "A.JPS" and "a.jps" are two files on a receiver.
TEST_F(Cli, AFileThatDiffersInCaseAloneIsNotSkippedInSilence) {
  folder.Write("A.JPS", Content(30));
  const bed::SimulatedPort receiver({"quorin"}, {{"A.JPS", Content(30)}, {"a.jps", Content(40)}});
  const auto result = RunOn(receiver, {"get", "--all", "--skip-existing"});
  EXPECT_EQ(result.status, kLocalFile);
  EXPECT_THAT(result.errors, HasSubstr("already used for another file"));
}

// An old .part, an existing file, and two names that are one on this computer.
TEST_F(Cli, WhatCannotBeKeptStopsNoOtherFile) {
  folder.Write("a.jps.part", "what came of an earlier download");
  folder.Write("b.jps", "mine");
  const bed::SimulatedPort receiver({"quorin"},
                                    {{"a.jps", Content(30)},
                                     {"b.jps", Content(40)},
                                     {"c.jps", Content(50)},
                                     {"d.jps", Content(60)},
                                     {"D.jps", Content(70)}});
  for (const std::vector<std::string>& line : std::vector<std::vector<std::string>>{
           {"get", "a.jps", "b.jps", "c.jps", "d.jps", "D.jps"}, {"get", "*.jps"}}) {
    const auto result = RunOn(receiver, line);
    EXPECT_EQ(result.status, kLocalFile);
    EXPECT_THAT(result.errors, HasSubstr("a.jps.part already exists"));
    EXPECT_THAT(result.errors, HasSubstr("b.jps already exists"));
    EXPECT_THAT(result.errors, HasSubstr("already used for another file"));
    EXPECT_EQ(folder.Read("c.jps"), Content(50));
    EXPECT_EQ(folder.Read("b.jps"), "mine");
    std::filesystem::remove(folder / "c.jps");
    std::filesystem::remove(folder / "d.jps");
    std::filesystem::remove(folder / "D.jps");
  }
}

TEST_F(Cli, AFileThatCannotGetItsNameStopsNoOther) {
  folder.Write("a.jps", "mine");
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(30)}, {"b.jps", Content(40)}});
  const HANDLE open = CreateFileW((folder / "a.jps").c_str(),
                                  GENERIC_READ,
                                  FILE_SHARE_READ,
                                  nullptr,
                                  OPEN_EXISTING,
                                  0,
                                  nullptr);
  ASSERT_NE(open, INVALID_HANDLE_VALUE);
  const auto result = RunOn(receiver, {"get", "--all", "--force"});
  CloseHandle(open);
  EXPECT_EQ(result.status, kLocalFile);
  EXPECT_EQ(folder.Read("a.jps.part"), Content(30));
  EXPECT_EQ(folder.Read("b.jps"), Content(40));
}

// Each error is reported although there is no receiver: the search comes later.
TEST_F(Cli, LocalErrorsAreReportedBeforeTheSearch) {
  folder.Write("taken", "a file");
  folder.Write("b.jps.part", "what came of an earlier download");
  for (const std::vector<std::string>& line :
       std::vector<std::vector<std::string>>{{"get", "COM99", "a.jps", "-o", "none\\a.jps"},
                                             {"get", "COM99", "a.jps", "-o", "taken\\a.jps"},
                                             {"get", "COM99", "--all", "-o", "taken\\"},
                                             {"get", "COM99", "--all", "-o", "taken"},
                                             {"get", "COM99", "a.jps", "-o", "a?b"},
                                             {"get", "COM99", "b.jps"}}) {
    EXPECT_EQ(Run(line).status, kLocalFile) << testing::PrintToString(line);
  }
  EXPECT_THAT(LocalFiles(), ElementsAre("b.jps.part", "taken"));
}

TEST_F(Cli, AFileThatTheProtocolCannotNumberIsRefusedAtOnce) {
  const bed::SimulatedPort receiver({"quorin", "--lie-size", "a.jps=33554433"},
                                    {{"a.jps", Content(3000)}, {"b.jps", Content(30)}});
  const auto one = RunOn(receiver, {"get", "a.jps"});
  EXPECT_EQ(one.status, kFailed);
  EXPECT_THAT(one.errors, HasSubstr("33554432"));
  EXPECT_THAT(receiver.Transcript(), testing::Not(HasSubstr("%get,")));
  const auto all = RunOn(receiver, {"get", "--all"});
  EXPECT_EQ(all.status, kFailed);
  EXPECT_THAT(LocalFiles(), ElementsAre("b.jps"));
}

TEST_F(Cli, FilesThatTheDiskHasNoRoomForAreRefusedAtOnce) {
  const auto owned = ReceiverOfMoreThanTheDisk();
  if (!owned) GTEST_SKIP() << "this disk has room for all that can be listed";
  const bed::SimulatedPort& receiver = *owned;
  const auto result = RunOn(receiver, {"get", "--all", "--protocol", "velmar"});
  EXPECT_EQ(result.status, kLocalFile);
  EXPECT_THAT(result.errors, HasSubstr("the disk has room for"));
  EXPECT_THAT(receiver.Transcript(), testing::Not(HasSubstr("filetransfer")));
  EXPECT_THAT(LocalFiles(), IsEmpty());
}

TEST_F(Cli, TheHashOfTheFileIsShown) {
  constexpr char kHashOfAbc[] = "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad";
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", "abc"}});
  const auto document =
      nlohmann::json::parse(RunOn(receiver, {"get", "a.jps", "--json"}).output).at("files").at(0);
  EXPECT_EQ(document.at("sha256"), kHashOfAbc);
  EXPECT_EQ(document.at("verified"), false);
  const auto verbose = RunOn(receiver, {"get", "a.jps", "--verbose", "--force", "--verify"});
  EXPECT_EQ(verbose.status, kDone);
  EXPECT_THAT(verbose.output, HasSubstr(kHashOfAbc));
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

// Names that would leave the folder or open a device are saved inside it under another name.
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
  EXPECT_THAT(result.errors, HasSubstr("no new data"));
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
  EXPECT_THAT(result.output, HasSubstr("Stopping"));
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

TEST_F(Cli, AFileGoesToTheStandardOutput) {
  const std::string text = "line one\nline two\n";
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", text}});
  const auto result = RunOn(receiver, {"get", "a.jps", "-o", "-"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_EQ(result.output, text);
  EXPECT_THAT(result.errors, HasSubstr("18 bytes"));
  EXPECT_EQ(RunOn(receiver, {"get", "a.jps", "-o", "-", "--json"}).status, kUsage);
  EXPECT_EQ(RunOn(receiver, {"get", "--all", "-o", "-"}).status, kUsage);
  EXPECT_THAT(LocalFiles(), IsEmpty());
}

TEST_F(Cli, AFileGoesToTheNullDevice) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(3000)}});
  const auto result = RunOn(receiver, {"get", "a.jps", "-o", "NUL"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(result.output, HasSubstr("3000 bytes"));
  EXPECT_THAT(LocalFiles(), IsEmpty());
}

TEST_F(Cli, ProgressIsShownAsAskedFor) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(3000)}});
  const auto get = [&](const char* how) {
    return RunOn(receiver, {"get", "a.jps", "--force", "--json", "--progress", how}).errors;
  };
  EXPECT_EQ(get("none"), "");
  EXPECT_EQ(get("auto"), "");
  EXPECT_THAT(get("lines"), HasSubstr("Downloading a.jps, 3.0 kB\n"));
  const std::string lines = get("json");
  const auto first = nlohmann::json::parse(lines.substr(0, lines.find('\n')));
  EXPECT_EQ(first.at("file"), "a.jps");
  EXPECT_EQ(first.at("total"), 3000);
}

// The preparation of a download and the reading of a list are shown, too.
TEST_F(Cli, ATerminalShowsWhatTheProgramWaitsFor) {
  const bed::SimulatedPort receiver({"quorin", "--reply-silence", "3:print,/log/@1"},
                                    {{"a.jps", Content(3000)}});
  bed::Program program(
      kProgram, On(receiver, {"get", "a.jps"}), bed::Output::kTerminal, folder.unix_path());
  program.Expect("Reading the list of files ... ");
  program.Expect("preparing");
  EXPECT_EQ(program.Finish().status, kDone);
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
