// rcvlink-cli mirror: what is downloaded, what is kept, what is deleted, and the exit codes.
#include <windows.h>

#include <chrono>
#include <nlohmann/json.hpp>

#include "tests/cli_run/cli.h"

namespace cli_run {
namespace {

using nlohmann::json;
using testing::AllOf;
using testing::HasSubstr;
using testing::Not;

class Mirror : public Cli {
 protected:
  Mirror() { std::filesystem::create_directory(folder / "out"); }

  // mirror PORT out, with more arguments.
  bed::ProgramResult RunMirror(const bed::SimulatedPort& receiver,
                               std::vector<std::string> arguments = {}) const {
    arguments.insert(arguments.begin(), {"mirror", "out"});
    return RunOn(receiver, std::move(arguments));
  }
  static json FileOf(const json& document, const std::string& name) {
    for (const json& file : document.at("files")) {
      if (file.at("name") == name) return file;
    }
    return {};
  }
  std::vector<std::string> NamesOn(const bed::SimulatedPort& receiver) const {
    std::vector<std::string> names;
    const json list = json::parse(RunOn(receiver, {"ls", "--json"}).output);
    for (const json& file : list.at("files")) {
      names.push_back(file.at("name"));
    }
    return names;
  }
  // The files in the folder of the mirror.
  std::vector<std::string> Mirrored() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(folder / "out")) {
      names.push_back(entry.path().filename().string());
    }
    std::sort(names.begin(), names.end());
    return names;
  }
};

using Names = std::vector<std::string>;

TEST_F(Mirror, BringsWhatIsMissingOrHasGrown) {
  const std::string mine(30, 'm');
  folder.Write("out/a.jps", mine);
  folder.Write("out/b.jps", Content(1000));
  const bed::SimulatedPort receiver(
      {"quorin"}, {{"a.jps", Content(30)}, {"b.jps", Content(3000)}, {"c.jps", Content(700)}});
  const auto result = RunMirror(receiver);
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_EQ(folder.Read("out/a.jps"), mine);
  EXPECT_EQ(folder.Read("out/b.jps"), Content(3000));
  EXPECT_EQ(folder.Read("out/c.jps"), Content(700));
  EXPECT_EQ(Mirrored(), (Names{"a.jps", "b.jps", "c.jps"}));
  EXPECT_THAT(result.errors,
              AllOf(HasSubstr("File 1 of 2: b.jps"), HasSubstr("File 2 of 2: c.jps")));
  EXPECT_THAT(result.output, HasSubstr("2 downloaded, 1 already here, 0 failed"));

  EXPECT_THAT(RunMirror(receiver).output, HasSubstr("0 downloaded, 3 already here, 0 failed"));
}

TEST_F(Mirror, TakesOnlyNamesThatFitAPattern) {
  const bed::SimulatedPort receiver(
      {"quorin"}, {{"a.jps", Content(30)}, {"b.PDC", Content(31)}, {"c.txt", Content(32)}});
  EXPECT_EQ(RunMirror(receiver, {"*.JPS", "?.pdc"}).status, kDone);
  EXPECT_EQ(Mirrored(), (Names{"a.jps", "b.PDC"}));
}

TEST_F(Mirror, MakesItsFolder) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(30)}});
  EXPECT_EQ(RunOn(receiver, {"mirror", "new\\deep"}).status, kDone);
  EXPECT_EQ(folder.Read("new/deep/a.jps"), Content(30));
}

// The numbers of logs start again when a receiver's files were deleted. The old log must not be
// lost.
TEST_F(Mirror, AnotherFileOfTheSameNameStays) {
  folder.Write("out/a.jps", "yesterday's log");
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(300)}, {"b.jps", Content(30)}});
  const auto result = RunMirror(receiver);
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("is not the beginning of the receiver's file"));
  EXPECT_EQ(folder.Read("out/a.jps"), "yesterday's log");
  EXPECT_EQ(folder.Read("out/b.jps"), Content(30));
  // Nor is the download lost.
  EXPECT_EQ(folder.Read("out/a.jps.part"), Content(300));
  EXPECT_EQ(Mirrored(), (Names{"a.jps", "a.jps.part", "b.jps"}));

  EXPECT_EQ(RunMirror(receiver, {"--force"}).status, kDone);
  EXPECT_EQ(folder.Read("out/a.jps"), Content(300));
}

TEST_F(Mirror, GoesOnAfterAFileThatFailed) {
  const bed::SimulatedPort receiver({"quorin", "--lie-size", "a.jps=4000"},
                                    {{"a.jps", Content(3000)}, {"b.jps", Content(30)}});
  const auto result = RunMirror(receiver, {"--json"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_EQ(folder.Read("out/b.jps"), Content(30));
  // Its data is kept: it may be a log that is still being recorded.
  EXPECT_EQ(Mirrored(), (Names{"a.jps.part", "b.jps"}));
  const json document = json::parse(result.output);
  EXPECT_TRUE(FileOf(document, "a.jps").contains("error"));
  EXPECT_EQ(FileOf(document, "b.jps").at("done"), "downloaded");
  EXPECT_EQ(document.at("summary").at("downloaded"), 1);
  EXPECT_EQ(document.at("summary").at("failed"), 1);

  // The next run does not touch it.
  const bed::SimulatedPort ready({"quorin"}, {{"a.jps", Content(4000)}, {"b.jps", Content(30)}});
  EXPECT_EQ(RunMirror(ready).status, kLocalFile);
  EXPECT_EQ(folder.Read("out/a.jps.part"), Content(3000));
  EXPECT_EQ(RunMirror(ready, {"--force"}).status, kDone);
  EXPECT_EQ(Mirrored(), (Names{"a.jps", "b.jps"}));
  EXPECT_EQ(folder.Read("out/a.jps"), Content(4000));
}

TEST_F(Mirror, TheWorstFailureCounts) {
  folder.Write("out/b.jps.part", "left");
  const bed::SimulatedPort receiver({"quorin", "--lie-size", "a.jps=4000"},
                                    {{"a.jps", Content(3000)}, {"b.jps", Content(30)}});
  EXPECT_EQ(RunMirror(receiver).status, kFailed);
}

TEST_F(Mirror, AFileThatTheProtocolCannotNumberIsLeftOut) {
  const bed::SimulatedPort receiver({"quorin", "--lie-size", "a.jps=33554433"},
                                    {{"a.jps", Content(3000)}});
  const auto result = RunMirror(receiver);
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("33554432"));
  EXPECT_THAT(receiver.Transcript(), Not(HasSubstr("get,")));
}

TEST_F(Mirror, AFileThatIsLeftFromAnEarlierRunStopsOnlyItsOwn) {
  folder.Write("out/a.jps.part", "left");
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(300)}, {"b.jps", Content(30)}});
  EXPECT_EQ(RunMirror(receiver).status, kLocalFile);
  EXPECT_EQ(folder.Read("out/a.jps.part"), "left");
  EXPECT_EQ(Mirrored(), (Names{"a.jps.part", "b.jps"}));
}

TEST_F(Mirror, ADownloadThatCannotGetItsNameIsKept) {
  folder.Write("out/a.jps", Content(100));
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(3000)}});
  const HANDLE open = CreateFileW((folder / "out/a.jps").c_str(),
                                  GENERIC_READ,
                                  FILE_SHARE_READ,
                                  nullptr,
                                  OPEN_EXISTING,
                                  0,
                                  nullptr);
  ASSERT_NE(open, INVALID_HANDLE_VALUE);
  const auto result = RunMirror(receiver);
  CloseHandle(open);
  EXPECT_EQ(result.status, kLocalFile);
  EXPECT_THAT(result.errors, HasSubstr("a.jps.part"));
  EXPECT_EQ(folder.Read("out/a.jps.part"), Content(3000));
  EXPECT_EQ(folder.Read("out/a.jps"), Content(100));
}

TEST_F(Mirror, ALongerFileHereIsRefusedBeforeTheFirstByte) {
  folder.Write("out/a.jps", Content(301));
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(300)}});
  EXPECT_EQ(RunMirror(receiver).status, kFailed);
  EXPECT_THAT(receiver.Transcript(), Not(HasSubstr("get,")));
  EXPECT_EQ(folder.Read("out/a.jps"), Content(301));
}

TEST_F(Mirror, EndsWhenTheReceiverIsGone) {
  const bed::SimulatedPort receiver({"quorin", "--vanish-after", "2"},
                                    {{"a.jps", Content(3000)}, {"b.jps", Content(30)}});
  const auto result = RunMirror(receiver);
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.output, HasSubstr("1 failed, 1 not tried"));
  EXPECT_EQ(Mirrored(), Names{});
}

TEST_F(Mirror, AnEmptyFileIsMadeWithoutATransfer) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", ""}});
  EXPECT_EQ(RunMirror(receiver).status, kDone);
  EXPECT_TRUE(Has("out/a.jps"));
  EXPECT_THAT(receiver.Transcript(), Not(HasSubstr("get,")));
}

TEST_F(Mirror, AnEmptyFileReplacesAnotherOnlyWhenForced) {
  folder.Write("out/a.jps", "mine");
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", ""}});
  const auto result = RunMirror(receiver);
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("the receiver's file is empty, but the file of that name"));
  EXPECT_EQ(folder.Read("out/a.jps"), "mine");
  EXPECT_EQ(RunMirror(receiver, {"--force"}).status, kDone);
  EXPECT_EQ(folder.Read("out/a.jps"), "");
}

// It was not verified by a second download.
TEST_F(Mirror, AnEmptyFileIsNotDeleted) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", ""}});
  EXPECT_EQ(RunMirror(receiver, {"--then-delete"}).status, kDone);
  EXPECT_EQ(NamesOn(receiver), Names{"a.jps"});
}

TEST_F(Mirror, KeepsFileTimesAndShowsTheZone) {
  const bed::TempFolder source;
  source.Write("a.jps", Content(30));
  const auto time = std::filesystem::last_write_time(source / "a.jps") - std::chrono::hours(30);
  std::filesystem::last_write_time(source / "a.jps", time);
  const bed::SimulatedPort receiver({"quorin", "--folder", source.unix_path()});
  const auto result = RunMirror(receiver, {"--times", "utc"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(result.errors, HasSubstr("File times are taken as UTC"));
  const auto kept = std::filesystem::last_write_time(folder / "out" / "a.jps");
  EXPECT_LT(std::chrono::abs(kept - time), std::chrono::seconds(3));
}

TEST_F(Mirror, DeletesOnlyWhatASecondDownloadVerified) {
  folder.Write("out/same.jps", Content(600));
  folder.Write("out/other.jps", std::string(600, 'o'));
  const bed::SimulatedPort receiver({"quorin"},
                                    {{"new.jps", Content(700)},
                                     {"same.jps", Content(600)},
                                     {"other.jps", Content(600)},
                                     {"kept.txt", Content(30)}});
  const auto result = RunMirror(receiver, {"*.jps", "--then-delete", "--json"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(NamesOn(receiver), testing::UnorderedElementsAre("other.jps", "kept.txt"));
  EXPECT_EQ(folder.Read("out/new.jps"), Content(700));
  EXPECT_EQ(folder.Read("out/other.jps"), std::string(600, 'o'));
  EXPECT_EQ(Mirrored(), (Names{"new.jps", "other.jps", "same.jps"}));
  const json document = json::parse(result.output);
  EXPECT_EQ(FileOf(document, "new.jps").at("deleted"), true);
  EXPECT_EQ(FileOf(document, "same.jps").at("deleted"), true);
  EXPECT_THAT(FileOf(document, "other.jps").at("error").at("meaning"),
              HasSubstr("different bytes"));
  // Two downloads of the missing file, one of each existing file.
  size_t downloads = 0;
  const std::string transcript = receiver.Transcript();
  for (size_t at = 0; (at = transcript.find("get,", at)) != std::string::npos; ++at) ++downloads;
  EXPECT_EQ(downloads, 4U) << transcript;
}

TEST_F(Mirror, ShowsTheCurrentFileAndTheTimeLeft) {
  const bed::SimulatedPort receiver({"quorin"},
                                    {{"a.jps", Content(30000)}, {"b.jps", Content(40)}});
  const auto result = RunMirror(receiver, {});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(result.errors, HasSubstr("File 1 of 2: a.jps, 30.0 kB\n"));
  EXPECT_THAT(result.errors, HasSubstr("File 2 of 2: b.jps, 40 B, 1 s left in total\n"));
}

TEST_F(Mirror, WithoutThenDeleteNothingIsDeleted) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(30)}});
  EXPECT_EQ(RunMirror(receiver, {"--verify"}).status, kDone);
  EXPECT_EQ(NamesOn(receiver), Names{"a.jps"});
}

TEST_F(Mirror, CtrlCEndsItAndLeavesNoPartialFile) {
  const bed::SimulatedPort receiver({"quorin", "--pace"},
                                    {{"a.jps", Content(30)}, {"b.jps", Content(200000)}});
  bed::Program program(
      kProgram, On(receiver, {"mirror", "out"}), bed::Output::kTerminal, folder.unix_path());
  receiver.WaitForTranscript("seq=5");
  program.Interrupt();
  EXPECT_EQ(program.Finish().status, kCancelled);
  EXPECT_EQ(Mirrored(), Names{"a.jps"});
}

class VelmarMirror : public Mirror {
 protected:
  bed::ProgramResult RunMirror(const bed::SimulatedPort& receiver,
                               std::vector<std::string> arguments) const {
    arguments.insert(arguments.end(), {"--protocol", "velmar"});
    return Mirror::RunMirror(receiver, std::move(arguments));
  }
};

// The first download has a wrong bit, which the protocol does not detect.
TEST_F(VelmarMirror, WhatASecondDownloadDoesNotVerifyIsNeitherKeptNorDeleted) {
  const bed::SimulatedPort receiver({"velmar", "--flipped-bit", "0@1"}, {{"a.log", Content(30)}});
  const auto result = RunMirror(receiver, {"--then-delete"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("differs from the first"));
  EXPECT_EQ(Mirrored(), Names{});
  EXPECT_EQ(NamesOn(receiver), Names{"a.log"});

  EXPECT_EQ(RunMirror(receiver, {"--verify"}).status, kDone);
  EXPECT_EQ(folder.Read("out/a.log"), Content(30));
}

TEST_F(VelmarMirror, ARefusedDeletionIsNoticed) {
  const bed::SimulatedPort receiver({"velmar", "--refuse", "del"}, {{"a.log", Content(30)}});
  const auto result = RunMirror(receiver, {"--then-delete"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("still has the file"));
  EXPECT_EQ(folder.Read("out/a.log"), Content(30));
}

// The listed file was downloaded, but another file that matches may be missing from the list.
TEST_F(VelmarMirror, ADirectoryThatDidNotFitIsNeverDone) {
  Files files;
  while (files.size() < 120) {
    files.emplace("file" + std::to_string(100 + files.size()), Content(30));
  }
  const bed::SimulatedPort receiver({"velmar"}, files);
  const auto result = RunMirror(receiver, {"file100", "--quiet", "--json"});
  EXPECT_EQ(result.status, kFailed);
  const json document = json::parse(result.output);
  EXPECT_EQ(document.at("complete"), false);
  EXPECT_THAT(document.at("warning"), HasSubstr("8192 bytes"));
  EXPECT_EQ(Mirrored(), Names{"file100"});
  EXPECT_THAT(RunMirror(receiver, {"file100", "--quiet"}).errors, HasSubstr("may be missing"));
}

TEST_F(VelmarMirror, FilesThatTheDiskHasNoRoomForAreRefusedAtOnce) {
  const auto owned = ReceiverOfMoreThanTheDisk();
  if (!owned) GTEST_SKIP() << "this disk has room for all that can be listed";
  const bed::SimulatedPort& receiver = *owned;
  const auto result = RunMirror(receiver, {});
  EXPECT_EQ(result.status, kLocalFile);
  EXPECT_THAT(result.errors, HasSubstr("the disk has room for"));
  EXPECT_EQ(Mirrored(), Names{});
}

TEST_F(VelmarMirror, ADirectoryThatWasRefusedIsNeverDone) {
  const bed::SimulatedPort receiver({"velmar", "--refuse", "log direnta"},
                                    {{"a.log", Content(30)}});
  const auto result = RunMirror(receiver, {"--quiet"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("files may be missing"));
}

}  // namespace
}  // namespace cli_run
