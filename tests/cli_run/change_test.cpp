// The commands that change the receiver: rm, mv, set.
#include <nlohmann/json.hpp>

#include "tests/cli_run/cli.h"

namespace cli_run {
namespace {

using testing::HasSubstr;
using testing::Not;

TEST_F(Cli, RemoveDeletesEachFile) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", "a"}, {"b.jps", "b"}, {"c.jps", "c"}});
  const auto result = RunOn(receiver, {"rm", "a.jps", "c.jps"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  const auto files = nlohmann::json::parse(RunOn(receiver, {"ls", "--json"}).output).at("files");
  ASSERT_EQ(files.size(), 1u);
  EXPECT_EQ(files[0].at("name"), "b.jps");
}

TEST_F(Cli, RemoveThatIsRefusedShowsCodeAndMeaning) {
  const bed::SimulatedPort receiver({"quorin", "--refuse", "remove"}, {{"a.jps", "a"}});
  const auto result = RunOn(receiver, {"rm", "a.jps"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("a.jps"));
  EXPECT_THAT(result.errors, HasSubstr("0x8007048F"));
}

TEST_F(Cli, MoveIsRefusedWithAMessage) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", "a"}});
  const auto result = RunOn(receiver, {"mv", "a.jps", "b.jps"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("cannot rename files"));
}

TEST_F(Cli, SettingsReachTheReceiverInItsOwnWords) {
  bed::SimulatedPort receiver({"quorin", "--port-letter", "c"});
  EXPECT_EQ(RunOn(receiver, {"set", "parity", "odd", "--yes"}).status, kDone);
  EXPECT_EQ(RunOn(receiver, {"set", "stopbits", "2", "--yes"}).status, kDone);
  EXPECT_EQ(RunOn(receiver, {"set", "rts", "off"}).status, kDone);
  EXPECT_EQ(RunOn(receiver, {"set", "parity", "even", "--yes"}).status, kDone);
  EXPECT_EQ(RunOn(receiver, {"set", "parity", "none"}).status, kDone);
  EXPECT_EQ(RunOn(receiver, {"set", "baud", "57600"}).status, kDone);
  const std::string transcript = receiver.Transcript();
  size_t from = 0;
  for (const char* line : {"set,/par/dev/ser/c/parity,odd",
                           "set,/par/dev/ser/c/stops,2",
                           "set,/par/dev/ser/c/rts,off",
                           "set,/par/dev/ser/c/parity,even",
                           "set,/par/dev/ser/c/parity,N",
                           "set,/par/dev/ser/c/rate,57600"}) {
    from = transcript.find(line, from);
    ASSERT_NE(from, std::string::npos) << line << "\n" << transcript;
  }
}

// The program cannot check the RTS line.
TEST_F(Cli, AnRtsLineIsReportedAsNotConfirmed) {
  const bed::SimulatedPort receiver({"quorin"});
  const auto result = RunOn(receiver, {"set", "rts", "off", "--json"});
  EXPECT_EQ(result.status, kDone);
  EXPECT_EQ(nlohmann::json::parse(result.output).at("confirmed"), false);
  EXPECT_THAT(RunOn(receiver, {"set", "rts", "on"}).output, HasSubstr("could not be confirmed"));
}

TEST_F(Cli, ANewSpeedIsTried) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", "a"}});
  const auto result = RunOn(receiver, {"set", "baud", "57600"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(result.output, HasSubstr("it answers with that setting"));
  EXPECT_THAT(result.output, HasSubstr("--speed 57600"));
  // The receiver is checked: a handshake comes after the change.
  const std::string transcript = receiver.Transcript();
  EXPECT_NE(transcript.find("> dm", transcript.find("= speed 57600")), std::string::npos);
}

TEST_F(Cli, ARefusedSpeedIsReportedAsRefused) {
  for (const char* family : {"quorin", "velmar"}) {
    const bed::SimulatedPort receiver({family}, {{"a.jps", "a"}});
    const auto result = RunOn(receiver, {"set", "baud", "12345", "--protocol", family});
    EXPECT_EQ(result.status, kFailed) << result.output;
    EXPECT_THAT(result.errors, HasSubstr("refused"));
    EXPECT_EQ(RunOn(receiver, {"ls", "--protocol", family}).status, kDone);
  }
}

// The other family is not asked: that would take seconds without an answer.
TEST_F(Cli, ANewSpeedIsConfirmedByTheFamilyThatWasFound) {
  const bed::SimulatedPort receiver({"velmar"}, {{"a.log", "a"}});
  EXPECT_EQ(RunOn(receiver, {"set", "baud", "57600"}).status, kDone);
  const std::string transcript = receiver.Transcript();
  const size_t change = transcript.find("> COM 57600");
  ASSERT_NE(change, std::string::npos) << transcript;
  EXPECT_NE(transcript.find("> unlogall", change), std::string::npos);
  EXPECT_EQ(transcript.find("%", change), std::string::npos) << transcript;
}

// A command that is not needed costs time. Two commands of each count belong to the handshake; a
// download at a low speed raises the speed and puts it back.
TEST_F(Cli, CommandsSendOnlyWhatTheyNeed) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", "a"}, {"b.jps", "b"}});
  const auto questions = [&receiver] {
    const std::string transcript = receiver.Transcript();
    size_t count = 0;
    for (size_t at = 0; (at = transcript.find("\n> %", at)) != std::string::npos; ++at) ++count;
    return count;
  };
  size_t before = questions();
  for (const auto& [line, needed] :
       std::vector<std::pair<std::vector<std::string>, size_t>>{{{"find"}, 4},
                                                                {{"info"}, 4},
                                                                {{"ls"}, 3},
                                                                {{"get", "a.jps"}, 8},
                                                                {{"rm", "b.jps"}, 5},
                                                                {{"check"}, 4},
                                                                {{"set", "baud", "9600"}, 5}}) {
    EXPECT_EQ(RunOn(receiver, line).status, kDone) << line.front();
    EXPECT_EQ(questions() - before, needed) << line.front() << "\n" << receiver.Transcript();
    before = questions();
  }
}

class SetMemory : public Cli {
 protected:
  // Only one family is asked, because a family that does not answer takes long.
  bed::ProgramResult SetBaud(const bed::SimulatedPort& receiver,
                             const std::string& speed,
                             const std::string& option) const {
    return RunOn(receiver, {"set", "baud", speed, "--protocol", "quorin", option});
  }
  // The first try of a search.
  std::string FirstTry(const bed::SimulatedPort& receiver) const {
    bed::Program search(kProgram,
                        {"find", Port(receiver), "--protocol", "quorin"},
                        bed::Output::kTerminal,
                        folder.unix_path());
    search.Expect("try 1 of ");
    search.Interrupt();
    for (const std::string& line : search.Finish().history) {
      if (line.find("try 1 of ") != std::string::npos) return line;
    }
    return "";
  }
};

// A speed that is not among the first tries of a search.
constexpr char kOtherSpeed[] = "57600";

TEST_F(SetMemory, ANewSpeedIsRemembered) {
  const bed::SimulatedPort receiver({"quorin"});
  EXPECT_EQ(SetBaud(receiver, kOtherSpeed, "--quiet").status, kDone);
  EXPECT_THAT(FirstTry(receiver), HasSubstr(": 57600 bit/s, RTS on"));
}

TEST_F(SetMemory, ASpeedThatWasRefusedIsNotRemembered) {
  const bed::SimulatedPort receiver({"quorin"});
  EXPECT_EQ(SetBaud(receiver, "12345", "--quiet").status, kFailed);
  EXPECT_THAT(FirstTry(receiver), HasSubstr(": 9600 bit/s, RTS on"));
}

TEST_F(SetMemory, WithoutMemoryANewSpeedIsNotRemembered) {
  const bed::SimulatedPort receiver({"quorin"});
  ASSERT_EQ(RunOn(receiver, {"find", "--rts", "off"}).status, kDone);
  EXPECT_EQ(SetBaud(receiver, kOtherSpeed, "--no-memory").status, kDone);
  EXPECT_THAT(FirstTry(receiver), HasSubstr(": 9600 bit/s, RTS off"));
}

TEST_F(SetMemory, ALostReceiverIsReportedAndForgotten) {
  const bed::SimulatedPort receiver({"quorin", "--stray-speed", "19200"});
  const auto result = SetBaud(receiver, kOtherSpeed, "--json");
  EXPECT_EQ(result.status, kNoReceiver);
  const auto error = nlohmann::json::parse(result.output).at("error");
  EXPECT_EQ(error.at("exit"), kNoReceiver);
  EXPECT_EQ(error.at("tried"), "set the receiver's baud rate to 57600");
  EXPECT_THAT(error.at("meaning"),
              HasSubstr("answers neither with the new setting nor with the old one"));
  EXPECT_THAT(error.at("hint"), HasSubstr("rcvlink-cli find"));
  EXPECT_THAT(FirstTry(receiver), HasSubstr(": 115200 bit/s, RTS on"));
}

// Nobody knows then at which speed the receiver is.
TEST_F(SetMemory, AnInterruptedConfirmationForgetsNothing) {
  const bed::SimulatedPort receiver({"quorin", "--stray-speed", "19200"});
  bed::Program program(kProgram,
                       On(receiver, {"set", "baud", kOtherSpeed, "--protocol", "quorin"}),
                       bed::Output::kTerminal,
                       folder.unix_path());
  receiver.WaitForTranscript("not heard at 57600");
  program.Interrupt();
  const auto result = program.Finish();
  EXPECT_EQ(result.status, kCancelled) << result.output;
  EXPECT_THAT(FirstTry(receiver), HasSubstr(": 9600 bit/s, RTS on"));
}

TEST_F(Cli, ASettingThatLosesTheReceiverNeedsTheYesOption) {
  const bed::SimulatedPort receiver({"quorin"});
  for (const std::vector<std::string>& change :
       std::vector<std::vector<std::string>>{{"set", "parity", "odd"}, {"set", "stopbits", "2"}}) {
    const auto result = RunOn(receiver, change);
    EXPECT_EQ(result.status, kUsage);
    EXPECT_THAT(result.errors, HasSubstr("--yes"));
  }
  EXPECT_THAT(receiver.Transcript(), Not(HasSubstr("set,")));
  EXPECT_EQ(RunOn(receiver, {"set", "parity", "none"}).status, kDone);
}

}  // namespace
}  // namespace cli_run
