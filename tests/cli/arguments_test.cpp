#include "arguments.h"

#include <gtest/gtest.h>

#include "results.h"

namespace cli {
namespace {

using Words = std::vector<std::string>;

Arguments Parse(const Words& words) { return std::get<Arguments>(ParseCommandLine(words)); }

std::string Help(const Words& words) { return std::get<HelpText>(ParseCommandLine(words)).text; }

/// The failure of a line that makes no sense.
Failure Refusal(const Words& words) {
  try {
    ParseCommandLine(words);
  } catch (const Failure& failure) {
    return failure;
  }
  ADD_FAILURE() << "was understood";
  return {};
}

TEST(ArgumentsTest, Defaults) {
  const Arguments arguments = Parse({"find", "COM7"});
  EXPECT_EQ(arguments.command, Command::kFind);
  EXPECT_EQ(arguments.port, L"COM7");
  EXPECT_EQ(arguments.link, eInstanceSerial);
  EXPECT_EQ(arguments.protocol, eProtocolAny);
  EXPECT_FALSE(arguments.speed);
  EXPECT_FALSE(arguments.rts);
  EXPECT_FALSE(arguments.json);
  EXPECT_FALSE(arguments.quiet);
  EXPECT_EQ(arguments.stall_timeout_s, 30U);
}

TEST(ArgumentsTest, Commands) {
  EXPECT_EQ(Parse({"ports"}).command, Command::kPorts);
  EXPECT_EQ(Parse({"info", "COM7"}).command, Command::kInfo);
  EXPECT_EQ(Parse({"ls", "COM7"}).command, Command::kList);
  EXPECT_EQ(Parse({"get", "COM7", "a"}).command, Command::kGet);
  EXPECT_EQ(Parse({"rm", "COM7", "a"}).command, Command::kRemove);
  EXPECT_EQ(Parse({"mv", "COM7", "a", "b"}).command, Command::kMove);
  EXPECT_EQ(Parse({"set", "COM7", "rts", "on"}).command, Command::kSet);
  EXPECT_EQ(Parse({"check", "COM7"}).command, Command::kCheck);
}

TEST(ArgumentsTest, OptionsStandBeforeOrAfterTheCommand) {
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
    const Arguments arguments = Parse(words);
    EXPECT_EQ(arguments.command, Command::kList);
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

TEST(ArgumentsTest, NamesAreTakenAsTheyAreTyped) {
  const Arguments arguments =
      Parse({"get", "COM7", "[a,b]", "{}", "get", "/x", "gr\xC3\xBC\xC3\x9F", "--", "-y", "--"});
  const std::vector<std::wstring> expected = {
      L"[a,b]", L"{}", L"get", L"/x", L"gr\xFC\xDF", L"-y", L"--"};
  EXPECT_EQ(arguments.names, expected);
}

TEST(ArgumentsTest, GetTakesNamesOrAll) {
  const Arguments arguments = Parse({"get", "COM7", "--all", "-o", "out\\", "--force"});
  EXPECT_TRUE(arguments.all);
  EXPECT_TRUE(arguments.force);
  EXPECT_EQ(arguments.output, L"out\\");
  EXPECT_EQ(Refusal({"get", "COM7"}).exit, ExitCode::kUsage);
  EXPECT_EQ(Refusal({"get", "COM7", "a", "--all"}).exit, ExitCode::kUsage);
}

TEST(ArgumentsTest, MoveTakesOldAndNew) {
  const std::vector<std::wstring> expected = {L"a", L"b"};
  EXPECT_EQ(Parse({"mv", "COM7", "a", "b"}).names, expected);
  for (const Words& words : {Words{"mv", "COM7"},
                             Words{"mv", "COM7", "a"},
                             Words{"mv", "COM7", "a", "a"},
                             Words{"mv", "COM7", "a", "b", "c"}}) {
    EXPECT_EQ(Refusal(words).exit, ExitCode::kUsage);
  }
}

TEST(ArgumentsTest, SetTakesWordsInAnyCase) {
  const Arguments arguments = Parse({"set", "COM7", "Parity", "EVEN"});
  EXPECT_EQ(arguments.change.setting, Setting::kParity);
  EXPECT_EQ(ValueWord(arguments.change), "even");
}

TEST(ArgumentsTest, NamesThatMustNotBeSentAreRefused) {
  for (const char* name : {"a\"b", "a'b", "a\nb", "\x1b[m", "\x01[", "\x01-", ""}) {
    const Failure failure = Refusal({"rm", "COM7", name});
    EXPECT_EQ(failure.exit, ExitCode::kUsage);
    EXPECT_EQ(failure.port, "COM7");
  }
  EXPECT_EQ(Refusal({"mv", "COM7", "a", "b\"c"}).exit, ExitCode::kUsage);
}

TEST(ArgumentsTest, SenselessLinesAreRefused) {
  for (const Words& words : {Words{},
                             Words{"bogus"},
                             Words{"find"},
                             Words{"find", ""},
                             Words{"find", "COM7", "COM8"},
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

TEST(ArgumentsTest, HelpTellsCommandsExitCodesAndExamples) {
  const std::string help = Help({"--help"});
  for (const char* text : {"ports", "--stall-timeout", "Exit codes", "rcvlink-cli get COM7"}) {
    EXPECT_NE(help.find(text), std::string::npos) << text;
  }
  EXPECT_NE(Help({"get", "--help"}).find("PORT [NAME...]"), std::string::npos);
  EXPECT_NE(Help({"get", "--help"}).find("--force"), std::string::npos);
}

TEST(ArgumentsTest, HelpFitsATerminal) {
  constexpr std::size_t kWidth = 100;
  for (const Words& words : {Words{"--help"}, Words{"get", "--help"}, Words{"set", "--help"}}) {
    std::istringstream help(Help(words));
    for (std::string line; std::getline(help, line);) EXPECT_LE(line.size(), kWidth) << line;
  }
}

TEST(ArgumentsTest, TellsItsVersion) { EXPECT_EQ(Help({"--version"}).find("rcvlink-cli "), 0U); }

}  // namespace
}  // namespace cli
