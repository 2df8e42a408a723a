// The program with a Velmar receiver, whose refusals the library does not report.
#include <chrono>
#include <deque>
#include <nlohmann/json.hpp>

#include "tests/cli_run/cli.h"

namespace cli_run {
namespace {

using nlohmann::json;
using testing::ElementsAre;
using testing::HasSubstr;

class VelmarCli : public Cli {
 protected:
  bed::ProgramResult RunOn(const bed::SimulatedPort& receiver,
                           std::vector<std::string> arguments) const {
    arguments.insert(arguments.end(), {"--protocol", "velmar"});
    return Cli::RunOn(receiver, std::move(arguments));
  }
  std::vector<std::string> NamesOn(const bed::SimulatedPort& receiver) const {
    std::vector<std::string> names;
    const json list = json::parse(RunOn(receiver, {"ls", "--json"}).output);
    for (const json& file : list.at("files")) {
      names.push_back(file.at("name"));
    }
    return names;
  }
};

TEST_F(VelmarCli, FindAndInfoShowTheFamily) {
  const bed::SimulatedPort receiver({"velmar", "--id", "VM7", "--model", "VR9"});
  const auto found = RunOn(receiver, {"find"});
  EXPECT_EQ(found.status, kDone) << found.errors;
  EXPECT_THAT(found.output, HasSubstr("Velmar receiver, model VR9, id VM7"));

  const auto result = RunOn(receiver, {"info", "--json"});
  ASSERT_EQ(result.status, kDone) << result.errors;
  const json info = json::parse(result.output);
  EXPECT_EQ(info.at("protocol"), "velmar");
  EXPECT_EQ(info.at("id"), "VM7");
  EXPECT_EQ(info.at("model"), "VR9");
  EXPECT_EQ(info.at("features"), 13);
  EXPECT_EQ(info.at("variant"), 2);
  EXPECT_EQ(info.at("renaming"), true);
}

TEST_F(VelmarCli, ListShowsNamesSizesAndTotal) {
  const bed::SimulatedPort receiver({"velmar"}, {{"a.log", Content(700)}, {"b.log", Content(30)}});
  const auto result = RunOn(receiver, {"ls"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(result.output, HasSubstr("a.log"));
  EXPECT_THAT(result.output, HasSubstr("b.log"));
  EXPECT_THAT(result.output, HasSubstr("2 files, 730 bytes"));
}

// The list is cut at the end of the library's buffer; the user must be warned.
TEST_F(VelmarCli, AListThatMayBeCutGivesAWarning) {
  Files files;
  const auto add_until = [&](size_t count) {
    while (files.size() < count) files.emplace("file" + std::to_string(100 + files.size()), "x");
  };
  add_until(30);
  const bed::SimulatedPort few({"velmar"}, files);
  const auto all = RunOn(few, {"ls"});
  EXPECT_EQ(all.status, kDone);
  EXPECT_THAT(all.errors, testing::Not(HasSubstr("may be missing")));
  add_until(120);
  const bed::SimulatedPort many({"velmar"}, files);
  const auto result = RunOn(many, {"ls", "--json"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("may be missing"));
  const size_t listed = json::parse(result.output).at("files").size();
  EXPECT_GT(listed, 50U);
  EXPECT_LT(listed, files.size());

  const bed::SimulatedPort quorin({"quorin"}, files);
  const auto whole = Cli::RunOn(quorin, {"ls", "--json", "--protocol", "quorin"});
  EXPECT_EQ(json::parse(whole.output).at("files").size(), files.size());
  EXPECT_THAT(whole.errors, testing::Not(HasSubstr("may be missing")));
}

TEST_F(VelmarCli, GetBringsTheFile) {
  const bed::SimulatedPort receiver({"velmar"}, {{"a.log", Content(3000)}});
  const auto result = RunOn(receiver, {"get", "a.log"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_EQ(folder.Read("a.log"), Content(3000));
  EXPECT_THAT(LocalFiles(), ElementsAre("a.log"));
}

TEST_F(VelmarCli, AFileOfAnotherSizeThanListedIsAFailure) {
  const bed::SimulatedPort receiver({"velmar", "--lie-size", "a.log=4000"},
                                    {{"a.log", Content(3000)}});
  const auto result = RunOn(receiver, {"get", "a.log"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("listed 4000 bytes, but 3000 arrived"));
  EXPECT_THAT(LocalFiles(), ElementsAre("a.log.part"));
  EXPECT_EQ(folder.Read("a.log.part"), Content(3000));
}

// The driver does not check the checksums.
TEST_F(VelmarCli, VerifyFindsADamagedByte) {
  const bed::SimulatedPort receiver({"velmar", "--flipped-bit", "1@2"}, {{"a.log", Content(3000)}});
  EXPECT_EQ(RunOn(receiver, {"get", "a.log"}).status, kDone);
  EXPECT_NE(folder.Read("a.log"), Content(3000));
  const auto verified = RunOn(receiver, {"get", "a.log", "-o", "b.log", "--verify"});
  EXPECT_EQ(verified.status, kFailed);
  EXPECT_THAT(verified.errors, HasSubstr("differs from the first"));
  EXPECT_THAT(LocalFiles(), ElementsAre("a.log"));
  const auto sound = RunOn(receiver, {"get", "a.log", "-o", "c.log", "--verify", "--json"});
  EXPECT_EQ(sound.status, kDone);
  EXPECT_EQ(json::parse(sound.output).at("files").at(0).at("verified"), true);
  EXPECT_EQ(folder.Read("c.log"), Content(3000));
}

// The files exist already, to keep the test short.
TEST_F(VelmarCli, AllWarnsWhenTheListMayBeCut) {
  Files files;
  while (files.size() < 80) files.emplace("file" + std::to_string(100 + files.size()), "x");
  for (const auto& [name, content] : files) folder.Write(name, content);
  const bed::SimulatedPort receiver({"velmar"}, files);
  const auto result = RunOn(receiver, {"get", "--all", "--quiet", "--json"});
  EXPECT_NE(result.status, kDone);
  const json document = json::parse(result.output);
  EXPECT_EQ(document.at("complete"), false);
  EXPECT_GT(document.at("files").size(), 50U);
  EXPECT_THAT(result.errors, HasSubstr("may be missing"));
}

TEST_F(VelmarCli, AllIsNeverDoneWhenTheListIsRefused) {
  const bed::SimulatedPort receiver({"velmar", "--refuse", "log direnta"}, {{"a.log", "a"}});
  const auto result = RunOn(receiver, {"get", "--all", "--quiet"});
  EXPECT_EQ(result.status, kFailed) << result.output;
  EXPECT_THAT(result.errors, HasSubstr("may be missing"));
}

// Each of them waits twice for 30 s, so they run at the same time.
TEST_F(VelmarCli, AListThatIsNotAnsweredIsNeverDone) {
  const std::vector<std::vector<std::string>> commands = {
      {"ls", "--json"}, {"get", "--all", "--json"}, {"mirror", "out", "--json"}};
  std::deque<bed::SimulatedPort> receivers;
  std::deque<bed::Program> programs;
  for (std::vector<std::string> command : commands) {
    receivers.emplace_back(std::vector<std::string>{"velmar", "--mute", "log direnta"},
                           Files{{"a.log", "a"}});
    command.insert(command.end(), {"--protocol", "velmar"});
    programs.emplace_back(
        kProgram, On(receivers.back(), command), bed::Output::kPipe, folder.unix_path());
  }
  for (size_t i = 0; i < programs.size(); ++i) {
    const auto result = programs[i].Finish(std::chrono::seconds(150));
    EXPECT_EQ(result.status, kFailed) << commands[i][0];
    EXPECT_THAT(result.errors, HasSubstr("files may be missing")) << commands[i][0];
    const json document = json::parse(result.output);
    EXPECT_EQ(document.at("complete"), false) << commands[i][0];
    EXPECT_THAT(document.at("warning"), HasSubstr("did not answer")) << commands[i][0];
    EXPECT_EQ(document.at("files"), json::array()) << commands[i][0];
  }
  EXPECT_THAT(LocalFiles(), testing::IsEmpty());
}

TEST_F(VelmarCli, AListThatWasRefusedIsReadAgain) {
  const bed::SimulatedPort receiver({"velmar", "--refuse", "log direnta@1"},
                                    {{"a.log", Content(30)}});
  const auto result = RunOn(receiver, {"get", "--all"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_EQ(folder.Read("a.log"), Content(30));
}

// The rest of a list that did not fit is still arriving when the next command is sent.
TEST_F(VelmarCli, AListThatDoesNotFitDoesNotDisturbTheNextCommand) {
  constexpr size_t kFiles = 110;
  Files files;
  while (files.size() < kFiles) {
    files.emplace("file" + std::to_string(100 + files.size()), Content(30));
  }
  // Not paced: a greeting that comes byte by byte may lose its beginning to a purge.
  const bed::SimulatedPort receiver({"velmar", "--pieces", "1000", "--piece-gap", "50"}, files);
  const auto result = RunOn(receiver, {"get", "file103"});
  EXPECT_EQ(result.status, kDone) << result.errors << receiver.Transcript();
  EXPECT_EQ(folder.Read("file103"), Content(30));
}

TEST_F(VelmarCli, APatternOnAListThatDoesNotFitIsNotDone) {
  Files files;
  while (files.size() < 110) {
    files.emplace("file" + std::to_string(100 + files.size()), Content(30));
  }
  const bed::SimulatedPort receiver({"velmar"}, files);
  const auto result = RunOn(receiver, {"get", "*103", "--json"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_EQ(json::parse(result.output).at("complete"), false);
  EXPECT_TRUE(Has("file103"));
}

TEST_F(VelmarCli, MoveRenamesTheFile) {
  const bed::SimulatedPort receiver({"velmar"}, {{"a.log", "a"}, {"b.log", "b"}});
  const auto result = RunOn(receiver, {"mv", "a.log", "c.log"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(NamesOn(receiver), testing::UnorderedElementsAre("b.log", "c.log"));
}

TEST_F(VelmarCli, ARefusedMoveIsNoticed) {
  const bed::SimulatedPort receiver({"velmar", "--refuse", "rename"}, {{"a.log", "a"}});
  const auto result = RunOn(receiver, {"mv", "a.log", "c.log"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("file list does not show the change"));
}

TEST_F(VelmarCli, RemoveDeletesTheFile) {
  const bed::SimulatedPort receiver({"velmar"}, {{"a.log", "a"}, {"b.log", "b"}});
  const auto result = RunOn(receiver, {"rm", "a.log"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(NamesOn(receiver), ElementsAre("b.log"));
}

TEST_F(VelmarCli, ARefusedRemoveIsNoticed) {
  const bed::SimulatedPort receiver({"velmar", "--refuse", "del"}, {{"a.log", "a"}});
  const auto result = RunOn(receiver, {"rm", "a.log"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("a.log"));
  EXPECT_THAT(result.errors, HasSubstr("still has the file"));
}

// The two families use opposite numbers for odd and even parity.
TEST_F(VelmarCli, ParitiesReachTheReceiverInItsOwnWords) {
  const bed::SimulatedPort receiver({"velmar"});
  EXPECT_EQ(RunOn(receiver, {"set", "parity", "even", "--yes"}).status, kDone);
  EXPECT_THAT(receiver.Transcript(), HasSubstr(R"(> COM 9600 E 8 1 N\r)"));
  EXPECT_EQ(RunOn(receiver, {"set", "parity", "odd", "--yes"}).status, kDone);
  EXPECT_THAT(receiver.Transcript(), HasSubstr(R"(> COM 9600 O 8 1 N\r)"));
}

TEST_F(VelmarCli, TheRtsLineIsRefusedWithAMessage) {
  const bed::SimulatedPort receiver({"velmar"});
  const auto result = RunOn(receiver, {"set", "rts", "off"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("a Velmar receiver cannot change its RTS line"));
}

}  // namespace
}  // namespace cli_run
