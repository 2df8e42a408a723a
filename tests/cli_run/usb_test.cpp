// The program with a receiver on USB.
#include <nlohmann/json.hpp>

#include "tests/cli_run/cli.h"
#include "tests/host/support/simulated_usb.h"

namespace cli_run {
namespace {

using nlohmann::json;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;

class UsbCli : public Cli {
 protected:
  bed::ProgramResult RunOn(const bed::SimulatedUsb& usb,
                           std::vector<std::string> arguments,
                           const std::string& link = "usb") const {
    arguments.insert(arguments.begin() + 1, DeviceOf(usb));
    arguments.insert(arguments.end(), {"--link", link});
    return Run(arguments);
  }
  static std::string DeviceOf(const bed::SimulatedUsb& usb) {
    const std::wstring device = usb.device();
    return {device.begin(), device.end()};
  }
};

TEST_F(UsbCli, FindAndInfoShowTheLink) {
  const bed::SimulatedUsb usb({"quorin", "--id", "QU7", "--model", "QR9"});
  const auto found = RunOn(usb, {"find"});
  EXPECT_EQ(found.status, kDone) << found.errors;
  EXPECT_THAT(found.output,
              HasSubstr(DeviceOf(usb) + " (usb): Quorin receiver, model QR9, id QU7"));

  const auto result = RunOn(usb, {"info", "--json"});
  ASSERT_EQ(result.status, kDone) << result.errors;
  const json info = json::parse(result.output);
  EXPECT_EQ(info.at("link"), "usb");
  EXPECT_EQ(info.at("protocol"), "quorin");
  EXPECT_EQ(info.at("id"), "QU7");
}

TEST_F(UsbCli, ListsGetsAndRemoves) {
  const bed::SimulatedUsb usb({"quorin"}, {{"a.log", Content(70000)}, {"b.log", "b"}});
  EXPECT_THAT(RunOn(usb, {"ls"}).output, HasSubstr("2 files, 70001 bytes"));

  const auto got = RunOn(usb, {"get", "a.log"});
  EXPECT_EQ(got.status, kDone) << got.errors;
  EXPECT_EQ(folder.Read("a.log"), Content(70000));
  EXPECT_THAT(LocalFiles(), ElementsAre("a.log"));

  EXPECT_EQ(RunOn(usb, {"rm", "a.log"}).status, kDone);
  EXPECT_THAT(RunOn(usb, {"ls"}).output, HasSubstr("1 file, 1 bytes"));
}

// Blocks have numbers of 16 bits on both links.
TEST_F(UsbCli, AFileThatTheProtocolCannotNumberIsRefusedAtOnce) {
  const bed::SimulatedUsb usb({"quorin", "--lie-size", "a.log=33554433"}, {{"a.log", "aa"}});
  const auto result = RunOn(usb, {"get", "a.log"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("33554432"));
  EXPECT_THAT(usb.Transcript(), Not(HasSubstr("%get,")));
}

TEST_F(UsbCli, AnyLinkFindsItOnUsb) {
  const bed::SimulatedUsb usb({"quorin"});
  const auto quiet = RunOn(usb, {"find"}, "any");
  EXPECT_EQ(quiet.status, kDone) << quiet.errors;
  EXPECT_THAT(quiet.output, HasSubstr("(usb): Quorin receiver"));
  EXPECT_EQ(quiet.errors, "");

  const auto verbose = RunOn(usb, {"find", "--verbose"}, "any");
  EXPECT_EQ(verbose.status, kDone) << verbose.errors;
  EXPECT_THAT(verbose.errors, HasSubstr("could not find a receiver on a serial port"));
}

TEST_F(UsbCli, AnyLinkWillDoForAllItsCommands) {
  const bed::SimulatedUsb usb({"quorin", "--id", "QU7"}, {{"a.log", "aa"}, {"b.log", "b"}});
  EXPECT_THAT(RunOn(usb, {"info"}, "any").output, HasSubstr("QU7"));
  EXPECT_THAT(RunOn(usb, {"ls"}, "any").output, HasSubstr("2 files, 3 bytes"));
  EXPECT_EQ(RunOn(usb, {"get", "a.log"}, "any").status, kDone);
  EXPECT_EQ(folder.Read("a.log"), "aa");
  EXPECT_EQ(RunOn(usb, {"rm", "a.log"}, "any").status, kDone);
  EXPECT_THAT(RunOn(usb, {"ls"}, "any").output, HasSubstr("1 file, 1 bytes"));
}

TEST_F(UsbCli, AnyLinkFindsItOnASerialPort) {
  const bed::SimulatedPort port({"quorin"});
  const auto result = Run(On(port, {"find", "--link", "any", "--json"}));
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_EQ(json::parse(result.output).at("link"), "serial");
}

TEST_F(UsbCli, AMissingDeviceIsReportedAsMissing) {
  const auto result = Run({"find", R"(\\?\rcvlink-none)", "--link", "usb"});
  EXPECT_EQ(result.status, kNoReceiver);
  EXPECT_THAT(result.errors, HasSubstr(R"(\\?\rcvlink-none does not exist)"));
}

TEST_F(UsbCli, VerboseShowsBothFailures) {
  const auto brief = Run({"find", R"(\\?\rcvlink-none)", "--link", "any"});
  EXPECT_EQ(brief.status, kNoReceiver);
  EXPECT_THAT(brief.errors, HasSubstr("on a serial port or on USB"));
  EXPECT_THAT(brief.errors, HasSubstr("--verbose"));
  const auto verbose = Run({"find", R"(\\?\rcvlink-none)", "--link", "any", "--verbose"});
  EXPECT_THAT(verbose.errors, HasSubstr("find a receiver on a serial port:"));
  EXPECT_THAT(verbose.errors, HasSubstr("find a receiver on USB:"));
  EXPECT_THAT(verbose.errors, Not(HasSubstr("--verbose shows")));
}

TEST_F(UsbCli, ADeviceOfAnotherLayoutHasNoReceiver) {
  const bed::SimulatedUsb usb({"quorin", "--class-descriptor"});
  const auto result = RunOn(usb, {"find"});
  EXPECT_EQ(result.status, kNoReceiver);
  EXPECT_THAT(result.errors, HasSubstr("no receiver answered"));
}

// Its name is that of no device, so the USB link would open it.
TEST_F(UsbCli, AFileNamedAsAPortIsNoPort) {
  folder.Write("COM77", Content(3000));
  for (const char* link : {"usb", "any"}) {
    const auto result = Run({"find", "COM77", "--link", link});
    EXPECT_EQ(result.status, kUsage) << result.errors;
    EXPECT_EQ(folder.Read("COM77"), Content(3000));
  }
}

TEST_F(UsbCli, AFileOfThisComputerIsNoPort) {
  folder.Write("survey.jps", Content(3000));
  for (const char* link : {"usb", "any"}) {
    for (const std::vector<std::string>& words : std::vector<std::vector<std::string>>{
             {"find", "survey.jps"}, {"get", "survey.jps", "COM99"}}) {
      std::vector<std::string> line = words;
      line.insert(line.end(), {"--link", link});
      const auto result = Run(line);
      EXPECT_EQ(result.status, kUsage) << result.errors;
      EXPECT_THAT(result.errors, HasSubstr("file of this computer"));
      EXPECT_EQ(folder.Read("survey.jps"), Content(3000));
    }
  }
}

TEST_F(UsbCli, ASpeedIsNotForUsb) {
  const auto result = Run({"find", R"(\\?\x)", "--link", "usb", "--speed", "9600"});
  EXPECT_EQ(result.status, kUsage);
}

TEST_F(UsbCli, ADownloadThatIsUnpluggedIsAFailure) {
  const bed::SimulatedUsb usb({"quorin", "--vanish-after", "20"}, {{"a.log", Content(100000)}});
  const auto result = RunOn(usb, {"get", "a.log"});
  EXPECT_EQ(result.status, kFailed);
  EXPECT_THAT(result.errors, HasSubstr("a.log"));
  EXPECT_FALSE(Has("a.log"));
}

}  // namespace
}  // namespace cli_run
