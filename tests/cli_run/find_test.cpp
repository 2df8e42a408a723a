// The search: the setting at which a receiver answers, what is remembered, several ports at once.
#include <windows.h>

#include <nlohmann/json.hpp>
#include <sstream>

#include "tests/cli_run/cli.h"
#include "tests/host/support/simulated_usb.h"

namespace cli_run {
namespace {

using nlohmann::json;
using testing::AllOf;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

class Find : public Cli {
 protected:
  static std::string NameOf(const bed::SimulatedPort& receiver) {
    const std::wstring name = receiver.name();
    return {name.begin(), name.end()};
  }
  // A command that searches for the speed.
  bed::ProgramResult Sweep(const bed::SimulatedPort& receiver,
                           std::vector<std::string> arguments) const {
    arguments.insert(arguments.begin() + 1, NameOf(receiver));
    arguments.insert(arguments.end(), {"--protocol", "quorin"});
    return Run(arguments);
  }
};

TEST_F(Find, ShowsTheSettingThatAnswered) {
  const bed::SimulatedPort receiver({"quorin"});
  const auto text = RunOn(receiver, {"find"});
  EXPECT_EQ(text.status, kDone) << text.errors;
  EXPECT_THAT(text.output, StartsWith(NameOf(receiver) + " (serial, 9600 bit/s, RTS on): Quorin"));
  const auto result = RunOn(receiver, {"find", "--rts", "off", "--json"});
  ASSERT_EQ(result.status, kDone) << result.errors;
  const json found = json::parse(result.output);
  EXPECT_EQ(found.at("speed"), 9600);
  EXPECT_EQ(found.at("rts"), "off");
}

TEST_F(Find, ShowsEachTryToo) {
  const bed::SimulatedPort receiver({"quorin", "--speed", "9600"});
  const auto result = Sweep(receiver, {"find", "--no-memory"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(result.errors, StartsWith(NameOf(receiver) + ": try 1 of "));
  EXPECT_THAT(result.errors,
              AllOf(HasSubstr(": 115200 bit/s, RTS on\n"),
                    HasSubstr("try 2 of "),
                    HasSubstr(": 9600 bit/s, RTS on\n")));
  EXPECT_THAT(result.errors, Not(HasSubstr("try 3 of ")));
  EXPECT_THAT(result.output, HasSubstr("(serial, 9600 bit/s, RTS on)"));
}

TEST_F(Find, EachTryIsAlsoJson) {
  const bed::SimulatedPort receiver({"quorin", "--speed", "9600"});
  const auto result = Sweep(receiver, {"find", "--no-memory", "--progress", "json"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  std::istringstream lines(result.errors);
  std::vector<json> tries;
  for (std::string line; std::getline(lines, line);) tries.push_back(json::parse(line));
  ASSERT_EQ(tries.size(), 2U) << result.errors;
  const json number_of_tries = tries[0].at("tries");
  EXPECT_GE(number_of_tries, 15);  // five speeds with three modes, and what the port has
  EXPECT_EQ(tries[0],
            (json{{"port", NameOf(receiver)},
                  {"try", 1},
                  {"tries", number_of_tries},
                  {"speed", 115200},
                  {"rts", "on"}}));
  EXPECT_EQ(tries[1],
            (json{{"port", NameOf(receiver)},
                  {"try", 2},
                  {"tries", number_of_tries},
                  {"speed", 9600},
                  {"rts", "on"}}));
  EXPECT_THAT(result.output, HasSubstr("(serial, 9600 bit/s, RTS on)"));
}

// One try at a given setting shows no progress.
TEST_F(Find, ASingleTryHasNoLine) {
  const bed::SimulatedPort receiver({"quorin"});
  EXPECT_EQ(RunOn(receiver, {"find", "--protocol", "quorin", "--progress", "json"}).errors, "");
  EXPECT_EQ(RunOn(receiver, {"find", "--protocol", "quorin", "--progress", "lines"}).errors, "");
}

TEST_F(Find, ATerminalShowsTheTryAndErasesIt) {
  const bed::SimulatedPort receiver({"quorin", "--speed", "115200"});
  bed::Program program(kProgram,
                       {"find", NameOf(receiver), "--protocol", "quorin", "--no-memory"},
                       bed::Output::kTerminal,
                       folder.unix_path());
  program.Expect("115200 bit/s, RTS on");
  const auto result = program.Finish();
  EXPECT_EQ(result.status, kDone) << result.output;
  EXPECT_THAT(result.history, testing::Contains(HasSubstr("try 1 of ")));
  EXPECT_THAT(result.output, AllOf(HasSubstr("Quorin receiver"), Not(HasSubstr("try 1"))));
}

// Nothing that is shown later would overwrite the line of the try.
TEST_F(Find, AFailedTryIsErased) {
  const bed::SimulatedPort silent({"quorin", "--mute", "*"});
  const auto result =
      bed::Program(kProgram,
                   On(silent, {"find", "--protocol", "quorin", "--json", "--progress", "bar"}),
                   bed::Output::kTerminal,
                   folder.unix_path())
          .Finish();
  EXPECT_EQ(result.status, kNoReceiver) << result.output;
  EXPECT_THAT(result.history, testing::Contains(HasSubstr("(Ctrl-C stops it)")));
  EXPECT_THAT(result.output, Not(HasSubstr("Ctrl-C")));
}

TEST_F(Find, WhatWasFoundIsTriedFirstTheNextTime) {
  const bed::SimulatedPort receiver({"quorin", "--speed", "9600"}, {{"a.jps", "a"}});
  ASSERT_EQ(RunOn(receiver, {"find"}).status, kDone);
  const auto found = Sweep(receiver, {"find"});
  EXPECT_EQ(found.status, kDone) << found.errors;
  EXPECT_THAT(found.errors, HasSubstr("try 1 of "));
  EXPECT_THAT(found.errors, HasSubstr(": 9600 bit/s, RTS on\n"));
  EXPECT_THAT(found.errors, Not(HasSubstr("try 2 of ")));
  // Other commands search in the same way.
  const auto listed = Sweep(receiver, {"ls"});
  EXPECT_THAT(listed.output, HasSubstr("a.jps"));
  EXPECT_THAT(listed.errors, AllOf(HasSubstr("try 1 of "), Not(HasSubstr("try 2 of "))));
}

TEST_F(Find, WithoutMemoryNothingIsRemembered) {
  const bed::SimulatedPort receiver({"quorin"});
  // A setting that is not among the first tries is remembered, too.
  ASSERT_EQ(RunOn(receiver, {"find", "--rts", "handshake"}).status, kDone);
  ASSERT_EQ(RunOn(receiver, {"find", "--no-memory"}).status, kDone);
  EXPECT_THAT(Sweep(receiver, {"find"}).errors, HasSubstr(": 9600 bit/s, RTS handshake\n"));
}

TEST_F(Find, SeveralPortsAreSearchedSideBySide) {
  const bed::SimulatedPort first({"quorin", "--id", "QR1"});
  const bed::SimulatedPort silent({"quorin", "--mute", "*"});
  const bed::SimulatedUsb usb({"quorin", "--id", "QU3"});
  const std::wstring device = usb.device();
  const auto result = Run({"find",
                           NameOf(silent),
                           NameOf(first),
                           std::string(device.begin(), device.end()),
                           "--link",
                           "any",
                           "--protocol",
                           "quorin",
                           "--speed",
                           "9600",
                           "--json"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  const json found = json::parse(result.output);
  ASSERT_EQ(found.at("receivers").size(), 2U) << result.output;
  EXPECT_EQ(found.at("receivers")[0].at("id"), "QR1");
  EXPECT_EQ(found.at("receivers")[0].at("link"), "serial");
  EXPECT_EQ(found.at("receivers")[1].at("id"), "QU3");
  EXPECT_EQ(found.at("receivers")[1].at("link"), "usb");
  ASSERT_EQ(found.at("failures").size(), 1U);
  EXPECT_EQ(found.at("failures")[0].at("port"), NameOf(silent));
  EXPECT_EQ(found.at("failures")[0].at("meaning"), "no receiver answered");
}

// The silent port comes first and takes long: a search of one port after the other would not reach
// the second in time.
TEST_F(Find, APortThatAnswersIsShownBeforeTheSilentOnesEnd) {
  const bed::SimulatedPort silent({"quorin", "--mute", "*"});
  const bed::SimulatedPort answering({"quorin", "--id", "QR2"});
  bed::Program program(
      kProgram,
      {"find", NameOf(silent), NameOf(answering), "--speed", "9600", "--protocol", "quorin"},
      bed::Output::kTerminal,
      folder.unix_path());
  program.Expect("id QR2");
  program.Interrupt();
  const auto result = program.Finish();
  EXPECT_EQ(result.status, kCancelled) << result.output;
  EXPECT_THAT(result.output, HasSubstr(NameOf(silent) + ": ended by Ctrl-C"));
}

TEST_F(Find, APortThatIsNamedTwiceIsAskedOnce) {
  const json found = json::parse(Run({"find", "COM98", "com98", "COM98:", "--json"}).output);
  EXPECT_EQ(found.at("failures").size(), 1U);
}

TEST_F(Find, AComPortIsSerialAmongUsbDevices) {
  const bed::SimulatedPort receiver({"quorin"});
  const json found = json::parse(
      Sweep(receiver, {"find", R"(\\?\rcvlink-none)", "--link", "usb", "--json"}).output);
  ASSERT_EQ(found.at("receivers").size(), 1U);
  EXPECT_EQ(found.at("receivers")[0].at("link"), "serial");
  ASSERT_EQ(found.at("failures").size(), 1U);
}

TEST_F(Find, WithoutASpeedTheSpeedOfThePortIsReported) {
  const bed::SimulatedPort receiver({"quorin"});
  ASSERT_EQ(RunOn(receiver, {"find"}).status, kDone);
  const auto result = Sweep(receiver, {"find", "--rts", "on", "--json"});
  ASSERT_EQ(result.status, kDone) << result.output;
  EXPECT_EQ(json::parse(result.output).at("speed"), 9600);
}

TEST_F(Find, AllSilentIsNoReceiver) {
  const bed::SimulatedPort silent({"quorin", "--mute", "*"});
  const auto result =
      Run({"find", NameOf(silent), "COM99", "--speed", "9600", "--protocol", "quorin"});
  EXPECT_EQ(result.status, kNoReceiver);
  EXPECT_THAT(result.errors, HasSubstr("COM99: COM99 does not exist"));
  EXPECT_THAT(result.errors, HasSubstr("No receiver was found"));
}

TEST_F(Find, PortsAndAllExcludeEachOther) {
  EXPECT_EQ(Run({"find"}).status, kUsage);
  EXPECT_EQ(Run({"find", "COM99", "--all"}).status, kUsage);
}

// A port among those that the computer lists.
class ListedPort {
 public:
  explicit ListedPort(const std::wstring& name) {
    RegCreateKeyExW(HKEY_LOCAL_MACHINE,
                    L"HARDWARE\\DEVICEMAP\\SERIALCOMM",
                    0,
                    nullptr,
                    REG_OPTION_VOLATILE,
                    KEY_SET_VALUE,
                    nullptr,
                    &key_,
                    nullptr);
    const auto* const bytes = reinterpret_cast<const BYTE*>(name.c_str());
    const auto size = static_cast<DWORD>((name.size() + 1) * sizeof(wchar_t));
    EXPECT_EQ(RegSetValueExW(key_, kDevice, 0, REG_SZ, bytes, size), ERROR_SUCCESS);
  }
  ~ListedPort() {
    RegDeleteValueW(key_, kDevice);
    RegCloseKey(key_);
  }
  ListedPort(const ListedPort&) = delete;
  ListedPort& operator=(const ListedPort&) = delete;

 private:
  static constexpr const wchar_t* kDevice = L"\\Device\\rcvlink-test";

  HKEY key_ = nullptr;
};

// All in one test: other tests run at the same time, and --all must not reach their ports.
TEST_F(Find, ListedPortsAreNamedAndAllAreAsked) {
  const bed::SimulatedPort receiver({"quorin", "--id", "QR4"});
  const ListedPort listed(receiver.name());
  const std::string name = NameOf(receiver);

  const auto missing = Run({"ls", "COM99"});
  EXPECT_EQ(missing.status, kNoReceiver);
  EXPECT_THAT(missing.errors, AllOf(HasSubstr("This computer has "), HasSubstr(name)));
  EXPECT_THAT(missing.errors, Not(HasSubstr("try 1")));

  EXPECT_THAT(Run({"ports"}).output, HasSubstr(name));
  EXPECT_THAT(Run({"ports", "--json"}).output, HasSubstr('"' + name + '"'));

  const auto found = Run({"find", "--all", "--speed", "9600"});
  EXPECT_EQ(found.status, kDone) << found.errors;
  EXPECT_THAT(found.output, StartsWith(name + " (serial, 9600 bit/s, RTS on): Quorin receiver"));
}

TEST_F(Find, AComPortOnUsbGivesAHint) {
  const auto usb = Run({"ls", "COM99", "--link", "usb"});
  EXPECT_THAT(usb.errors, HasSubstr("COM ports are for --link serial"));
}

}  // namespace
}  // namespace cli_run
