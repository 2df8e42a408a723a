#include "command_line.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <sstream>

#include "commands/commands.h"
#include "options.h"
#include "results.h"
#include "temporary_folder.h"

namespace cli {
namespace {

using Words = std::vector<std::string>;

CommandLine Parse(const Words& words) {
  return std::get<CommandLine>(ParseCommandLine(words, MakeCommands()));
}

std::string Help(const Words& words) {
  return std::get<HelpText>(ParseCommandLine(words, MakeCommands())).text;
}

// The failure of an invalid line.
Failure Refusal(const Words& words) {
  try {
    ParseCommandLine(words, MakeCommands());
  } catch (const Failure& failure) {
    return failure;
  }
  ADD_FAILURE() << "was understood";
  return {};
}

TEST(CommandLineTest, HasDefaults) {
  const CommandLine line = Parse({"find", "COM7"});
  EXPECT_STREQ(line.command->text().word, "find");
  const Arguments& arguments = line.arguments;
  EXPECT_EQ(arguments.port, L"COM7");
  EXPECT_EQ(arguments.link, eInstanceSerial);
  EXPECT_EQ(arguments.protocol, eProtocolAny);
  EXPECT_FALSE(arguments.speed);
  EXPECT_FALSE(arguments.rts);
  EXPECT_FALSE(arguments.json);
  EXPECT_FALSE(arguments.quiet);
  EXPECT_EQ(arguments.stall_timeout_s, 30U);
}

TEST(CommandLineTest, AcceptsEachCommand) {
  for (const Words& words : {Words{"ports"},
                             Words{"info", "COM7"},
                             Words{"ls", "COM7"},
                             Words{"get", "COM7", "a"},
                             Words{"get", "COM7", "--all", "-o", "out\\", "--force"},
                             Words{"rm", "COM7", "a"},
                             Words{"mv", "COM7", "a", "b"},
                             Words{"set", "COM7", "rts", "on"},
                             Words{"set", "COM7", "Parity", "EVEN", "--yes"},
                             Words{"check", "COM7"}}) {
    EXPECT_EQ(Parse(words).command->text().word, words.front());
  }
}

TEST(CommandLineTest, EachCommandHasItsHelp) {
  for (const auto& command : MakeCommands()) {
    const std::string word = command->text().word;
    const std::string help = Help({word, "--help"});
    EXPECT_NE(help.find(command->text().summary), std::string::npos) << help;
    EXPECT_NE(help.find("rcvlink-cli " + word), std::string::npos) << help;
    EXPECT_NE(Help({"--help"}).find("  " + word + "  "), std::string::npos) << word;
    EXPECT_NE(Refusal({}).meaning.find(word), std::string::npos) << word;
  }
}

TEST(CommandLineTest, OptionsStandBeforeOrAfterTheCommand) {
  const Words options = {"--link",
                         "any",
                         "--protocol=VELMAR",
                         "--speed",
                         "115200",
                         "--rts",
                         "handshake",
                         "--json",
                         "--quiet",
                         "--report",
                         "trace.txt",
                         "--stall-timeout",
                         "5"};
  Words before = options;
  before.insert(before.end(), {"ls", "COM7"});
  Words after = {"ls", "COM7"};
  after.insert(after.end(), options.begin(), options.end());
  for (const Words& words : {before, after}) {
    const CommandLine line = Parse(words);
    EXPECT_STREQ(line.command->text().word, "ls");
    const Arguments& arguments = line.arguments;
    EXPECT_EQ(arguments.link, eInstanceAny);
    EXPECT_EQ(arguments.protocol, eProtocolVelmar);
    EXPECT_EQ(arguments.speed, 115200U);
    EXPECT_EQ(arguments.rts, RtsMode::kHandshake);
    EXPECT_TRUE(arguments.json);
    EXPECT_TRUE(arguments.quiet);
    EXPECT_EQ(arguments.report, L"trace.txt");
    EXPECT_EQ(arguments.stall_timeout_s, 5U);
  }
}

// A command that shows what it was given.
class Probe : public Command {
 public:
  explicit Probe(std::vector<std::wstring>& names)
      : Command({"probe", "Take names", ""}), names_(names) {}
  void AddOptions(CLI::App& app, Arguments& arguments) override {
    AddPort(app, arguments);
    AddNames(app, "NAME", "Names", names_, 0, kMostNames);
  }
  Outcome Run(Context& /*context*/) override { return {}; }

 private:
  std::vector<std::wstring>& names_;
};

std::vector<std::wstring> NamesOf(const Words& words) {
  std::vector<std::wstring> names;
  Commands commands;
  commands.push_back(std::make_unique<Probe>(names));
  ParseCommandLine(words, std::move(commands));
  return names;
}

TEST(CommandLineTest, NamesAreTakenAsTheyAreTyped) {
  const std::vector<std::wstring> expected = {
      L"[a,b]", L"{}", L"%%", L"get", L"/x", L"gr\xFC\xDF", L"-y", L"--"};
  EXPECT_EQ(NamesOf({"probe",
                     "COM7",
                     "[a,b]",
                     "{}",
                     "%%",
                     "get",
                     "/x",
                     "gr\xC3\xBC\xC3\x9F",
                     "--",
                     "-y",
                     "--"}),
            expected);
  EXPECT_EQ(NamesOf({"probe", "COM7", "{}"}), std::vector<std::wstring>{L"{}"});
  EXPECT_EQ(NamesOf({"probe", "COM7", "a", "%%"}), (std::vector<std::wstring>{L"a", L"%%"}));
}

TEST(CommandLineTest, GetTakesNamesOrAll) {
  EXPECT_EQ(Refusal({"get", "COM7"}).exit, ExitCode::kUsage);
  EXPECT_EQ(Refusal({"get", "COM7", "a", "--all"}).exit, ExitCode::kUsage);
}

TEST(CommandLineTest, MoveTakesOldAndNew) {
  for (const Words& words : {Words{"mv", "COM7"},
                             Words{"mv", "COM7", "a"},
                             Words{"mv", "COM7", "a", "a"},
                             Words{"mv", "COM7", "a", "b", "c"}}) {
    EXPECT_EQ(Refusal(words).exit, ExitCode::kUsage);
  }
}

TEST(CommandLineTest, NamesThatMustNotBeSentAreRefused) {
  for (const char* name : {"a\"b", "a'b", "a\nb", "\x1b[m", "\x01[", "\x01-", ""}) {
    const Failure failure = Refusal({"rm", "COM7", name});
    EXPECT_EQ(failure.exit, ExitCode::kUsage);
    EXPECT_EQ(failure.port, "COM7");
  }
  EXPECT_EQ(Refusal({"mv", "COM7", "a", "b\"c"}).exit, ExitCode::kUsage);
}

TEST(CommandLineTest, InvalidLinesAreRefused) {
  for (const Words& words : {Words{},
                             Words{"bogus"},
                             Words{"find"},
                             Words{"find", ""},
                             Words{"find", "COM7", "--all"},
                             Words{"find", "COM7", "--bogus"},
                             Words{"find", "COM7", "--speed", "fast"},
                             Words{"find", "COM7", "--speed", "1"},
                             Words{"find", "COM7", "--link", "tin"},
                             Words{"find", "COM7", "--link", "usb", "--speed", "9600"},
                             Words{"find", "COM7", "--rts", "maybe"},
                             Words{"find", "COM7", "--stall-timeout", "-1"},
                             Words{"find", "COM7", "--report", "..\\a"},
                             Words{"rm", "COM7"},
                             Words{"set", "COM7", "parity", "odder"}}) {
    EXPECT_EQ(Refusal(words).exit, ExitCode::kUsage);
  }
}

TEST(CommandLineTest, HelpShowsCommandsExitCodesAndExamples) {
  const std::string help = Help({"--help"});
  for (const char* text : {"ports", "--stall-timeout", "Exit codes", "rcvlink-cli get COM7"}) {
    EXPECT_NE(help.find(text), std::string::npos) << text;
  }
  EXPECT_NE(Help({"get", "--help"}).find("PORT [NAME...]"), std::string::npos);
  EXPECT_NE(Help({"get", "--help"}).find("--force"), std::string::npos);
}

TEST(CommandLineTest, HelpFitsATerminal) {
  constexpr size_t kWidth = 100;
  for (const Words& words : {Words{"--help"}, Words{"get", "--help"}, Words{"set", "--help"}}) {
    std::istringstream help(Help(words));
    for (std::string line; std::getline(help, line);) EXPECT_LE(line.size(), kWidth) << line;
  }
}

TEST(CommandLineTest, HelpWorksInSeveralWays) {
  EXPECT_EQ(Help({"help"}), Help({"--help"}));
  EXPECT_EQ(Help({"/?"}), Help({"--help"}));
  EXPECT_EQ(Help({"help", "get"}), Help({"get", "--help"}));
  EXPECT_EQ(Help({"get", "/?"}), Help({"get", "--help"}));
  EXPECT_EQ(NamesOf({"probe", "COM7", "--", "/?"}), std::vector<std::wstring>{L"/?"});
}

TEST(CommandLineTest, TheHelpOfACommandHasTheOptionsOfAll) {
  for (const auto& command : MakeCommands()) {
    const std::string help = Help({command->text().word, "--help"});
    EXPECT_NE(help.find("--speed BITS/S"), std::string::npos) << help;
    EXPECT_EQ(help.find("--version"), std::string::npos);
    EXPECT_NE(help.find("Example"), std::string::npos) << help;
  }
}

TEST(CommandLineTest, AMistypedCommandGetsASuggestion) {
  EXPECT_NE(Refusal({"fnid", "COM7"}).meaning.find("did you mean find?"), std::string::npos);
  EXPECT_NE(Refusal({"PORTS"}).meaning.find("did you mean ports?"), std::string::npos);
  EXPECT_NE(Refusal({"dance", "COM7"}).meaning.find("the commands are ports, "), std::string::npos);
  EXPECT_EQ(Refusal({"info", "COM7", "fnid"}).meaning.find("did you mean"), std::string::npos);
}

TEST(CommandLineTest, PortsAreTakenHoweverTheyAreWritten) {
  EXPECT_EQ(Parse({"find", "com7:"}).arguments.port, L"COM7");
  EXPECT_EQ(Parse({"find", "\\\\.\\COM7"}).arguments.port, L"COM7");
}

// An environment variable during a test.
class Variable {
 public:
  Variable(std::string name, const std::string& value) : name_(std::move(name)) {
    _putenv_s(name_.c_str(), value.c_str());
  }
  ~Variable() { _putenv_s(name_.c_str(), ""); }
  Variable(const Variable&) = delete;
  Variable& operator=(const Variable&) = delete;

 private:
  std::string name_;
};

TEST(CommandLineTest, TheEnvironmentIsRead) {
  const Variable port("RCVLINK_PORT", "com7:");
  const Variable link("RCVLINK_LINK", "any");
  const Variable protocol("RCVLINK_PROTOCOL", "velmar");
  const Variable speed("RCVLINK_SPEED", "57600");
  const Arguments arguments = Parse({"find"}).arguments;
  EXPECT_EQ(arguments.port, L"COM7");
  EXPECT_EQ(arguments.link, eInstanceAny);
  EXPECT_EQ(arguments.protocol, eProtocolVelmar);
  EXPECT_EQ(arguments.speed, 57600U);
  EXPECT_EQ(Parse({"find", "COM8", "--speed", "9600"}).arguments.port, L"COM8");
  EXPECT_EQ(Parse({"find", "COM8", "--speed", "9600"}).arguments.speed, 9600U);
}

// The first word of a command is the port if it looks like one.
TEST(CommandLineTest, ThePortOfTheEnvironmentLeavesNamesAlone) {
  const Variable port("RCVLINK_PORT", "COM7");
  EXPECT_EQ(Parse({"get", "a.jps"}).arguments.port, L"COM7");
  EXPECT_EQ(Parse({"get", "b.jps", "a.jps"}).arguments.port, L"COM7");
  EXPECT_EQ(Parse({"get", "com8:", "a.jps"}).arguments.port, L"COM8");
  EXPECT_EQ(Parse({"get", R"(\\?\usb#1)", "a.jps"}).arguments.port, LR"(\\?\usb#1)");
  EXPECT_EQ(Parse({"mv", "a", "b"}).arguments.port, L"COM7");
  EXPECT_EQ(Parse({"mirror", "D:\\survey", "*.JPS"}).arguments.port, L"COM7");
  EXPECT_EQ(Parse({"ls"}).arguments.port, L"COM7");
  EXPECT_EQ(Refusal({"ls", "a.jps"}).exit, ExitCode::kUsage);
}

TEST(CommandLineTest, ThePortOfTheEnvironmentIsNoneOfFindAll) {
  const Variable port("RCVLINK_PORT", "COM7");
  EXPECT_NO_THROW(Parse({"find", "--all"}));
  EXPECT_EQ(Refusal({"find", "COM8", "--all"}).exit, ExitCode::kUsage);
}

TEST(CommandLineTest, SkippingNeedsFilesThatCanBeHere) {
  EXPECT_EQ(Refusal({"get", "COM7", "a", "-o", "NUL", "--skip-existing"}).exit, ExitCode::kUsage);
  EXPECT_EQ(Refusal({"get", "COM7", "*.jps", "-o", "-"}).exit, ExitCode::kUsage);
}

TEST(CommandLineTest, OptionsAreReadFromAFileToo) {
  const TemporaryFolder folder;
  folder.Write(L"my.ini", "speed = 57600\njson = true\nprogress = none\n");
  const std::string path = (folder.path() / L"my.ini").string();
  const Arguments arguments = Parse({"find", "COM7", "--config", path}).arguments;
  EXPECT_EQ(arguments.speed, 57600U);
  EXPECT_TRUE(arguments.json);
  EXPECT_EQ(arguments.progress, ProgressMode::kNone);
  EXPECT_EQ(Parse({"find", "COM7", "--config", path, "--speed", "9600"}).arguments.speed, 9600U);
  EXPECT_EQ(Refusal({"find", "COM7", "--config", path + "none"}).exit, ExitCode::kUsage);
}

TEST(CommandLineTest, AWordThatTheFileMistypesIsRefused) {
  const TemporaryFolder folder;
  folder.Write(L"my.ini", "protcol = velmar\n");
  const std::string path = (folder.path() / L"my.ini").string();
  EXPECT_EQ(Refusal({"find", "COM7", "--config", path}).exit, ExitCode::kUsage);
}

TEST(CommandLineTest, ASpeedOfTheEnvironmentIsNotForUsb) {
  const Variable speed("RCVLINK_SPEED", "9600");
  EXPECT_EQ(Parse({"find", R"(\\?\x)", "--link", "usb"}).arguments.link, eInstanceUSB);
}

TEST(CommandLineTest, CodesToExplainAreNumbers) {
  EXPECT_STREQ(Parse({"explain", "0x8007048F"}).command->text().word, "explain");
  EXPECT_STREQ(Parse({"explain"}).command->text().word, "explain");
  EXPECT_EQ(Refusal({"explain", "all"}).exit, ExitCode::kUsage);
}

TEST(CommandLineTest, ListsCommandsAndOptions) {
  const std::vector<CommandWords> words = WordsOf(MakeCommands());
  ASSERT_EQ(words.size(), MakeCommands().size() + 1);
  const auto has = [](const CommandWords& command, const std::string& option) {
    return std::any_of(command.options.begin(), command.options.end(), [&](const auto& word) {
      return word.word == option && !word.description.empty();
    });
  };
  EXPECT_EQ(words.front().command.word, "");
  EXPECT_TRUE(has(words.front(), "--json"));
  const auto get = std::find_if(
      words.begin(), words.end(), [](const auto& entry) { return entry.command.word == "get"; });
  ASSERT_NE(get, words.end());
  EXPECT_EQ(get->command.description, "Download files");
  EXPECT_TRUE(has(*get, "--all"));
  EXPECT_TRUE(has(*get, "-o"));
  EXPECT_FALSE(has(*get, "PORT"));
  EXPECT_FALSE(has(*get, "--json"));
}

TEST(CommandLineTest, PrintsItsVersion) { EXPECT_EQ(Help({"--version"}).find("rcvlink-cli "), 0U); }

}  // namespace
}  // namespace cli
