// The commands that only read: find, info, ls, check, ports; and the messages when nobody answers.
#include <filesystem>
#include <fstream>
#include <iterator>
#include <nlohmann/json.hpp>

#include "tests/cli_run/cli.h"

namespace cli_run {
namespace {

using nlohmann::json;
using testing::HasSubstr;

TEST_F(Cli, FindNamesTheReceiver) {
  const bed::SimulatedPort receiver({"quorin", "--id", "QR7", "--model", "HVB5x"});
  const auto result = RunOn(receiver, {"find"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(result.output, HasSubstr("Quorin"));
  EXPECT_THAT(result.output, HasSubstr("HVB5x"));
  EXPECT_THAT(result.output, HasSubstr("QR7"));
}

TEST_F(Cli, FindSweepsWithoutASpeed) {
  const bed::SimulatedPort receiver({"quorin", "--speed", "9600", "--id", "QR8"});
  const std::wstring port = receiver.name();
  const auto result = Run({"find", std::string(port.begin(), port.end())});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(result.output, HasSubstr("QR8"));
}

TEST_F(Cli, InfoAsJsonHoldsTheRecord) {
  const bed::SimulatedPort receiver({"quorin", "--id", "QR7", "--model", "HVA3-G3T"});
  const auto result = RunOn(receiver, {"info", "--json"});
  ASSERT_EQ(result.status, kDone) << result.errors;
  const json info = json::parse(result.output);
  EXPECT_EQ(info.at("id"), "QR7");
  EXPECT_EQ(info.at("model"), "HVA3-G3T");
  EXPECT_EQ(info.at("protocol"), "quorin");
  EXPECT_EQ(info.at("variant"), 2);
}

TEST_F(Cli, ListShowsNamesSizesAndTotal) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(700)}, {"b.jps", Content(30)}});
  const auto result = RunOn(receiver, {"ls"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_THAT(result.output, HasSubstr("a.jps"));
  EXPECT_THAT(result.output, HasSubstr("700"));
  EXPECT_THAT(result.output, HasSubstr("2 files, 730 bytes"));
}

TEST_F(Cli, ListAsJsonHasFilesAndTotal) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(700)}});
  const auto result = RunOn(receiver, {"ls", "--json"});
  ASSERT_EQ(result.status, kDone) << result.errors;
  const json list = json::parse(result.output);
  EXPECT_EQ(list.at("bytes"), 700);
  EXPECT_EQ(list.at("complete"), true);
  const json& files = list.at("files");
  ASSERT_EQ(files.size(), 1u);
  EXPECT_EQ(files[0].at("name"), "a.jps");
  EXPECT_EQ(files[0].at("size"), 700);

  const bed::SimulatedPort empty({"quorin"});
  EXPECT_EQ(json::parse(RunOn(empty, {"ls", "--json"}).output).at("files"), json::array());
}

TEST_F(Cli, CheckReportsThatTheReceiverAnswers) {
  const bed::SimulatedPort receiver({"quorin"});
  EXPECT_EQ(RunOn(receiver, {"check"}).status, kDone);
}

TEST_F(Cli, SilenceIsNoReceiver) {
  const bed::SimulatedPort receiver({"quorin", "--mute", "ping"});
  const auto result = RunOn(receiver, {"find"});
  EXPECT_EQ(result.status, kNoReceiver);
  EXPECT_EQ(result.output, "");
  EXPECT_THAT(result.errors, HasSubstr("no receiver answered"));
  EXPECT_THAT(result.errors, HasSubstr("is this its speed?"));  // and USB was not searched
  EXPECT_THAT(result.errors, testing::Not(HasSubstr("0x0000")));
}

TEST_F(Cli, AMissingPortIsNoReceiver) {
  const auto result = Run({"find", "COM99"});
  EXPECT_EQ(result.status, kNoReceiver);
  EXPECT_THAT(result.errors, HasSubstr("COM99"));
  EXPECT_THAT(result.errors, HasSubstr("0x80070002"));
  EXPECT_THAT(result.errors, HasSubstr("does not exist"));
}

TEST_F(Cli, ErrorsAsJsonHaveAllFields) {
  const auto result = Run({"ls", "COM99", "--json"});
  EXPECT_EQ(result.status, kNoReceiver);
  const json error = json::parse(result.output).at("error");
  EXPECT_EQ(error.at("port"), "COM99");
  EXPECT_EQ(error.at("code"), "0x80070002");
  EXPECT_EQ(error.at("exit"), kNoReceiver);
  EXPECT_FALSE(error.at("tried").get<std::string>().empty());
  EXPECT_FALSE(error.at("meaning").get<std::string>().empty());
}

TEST_F(Cli, UsbIsRefusedWithAMessage) {
  const auto result = Run({"find", "COM99", "--link", "usb"});
  EXPECT_NE(result.status, kDone);
  EXPECT_THAT(result.errors, HasSubstr("USB"));
}

TEST_F(Cli, PortsAreAlsoJson) {
  const auto result = Run({"ports", "--json"});
  EXPECT_EQ(result.status, kDone);
  EXPECT_TRUE(json::parse(result.output).at("ports").is_array());
}

TEST_F(Cli, WrongCommandLinesAreUsageErrors) {
  for (const std::vector<std::string>& line :
       std::vector<std::vector<std::string>>{{"ls"},
                                             {"dance", "COM99"},
                                             {"ls", "COM99", "--speed", "fast"},
                                             {"get", "COM99"},
                                             {"set", "COM99", "parity", "sometimes"},
                                             {"rm", "COM99", "a\"b"},
                                             {"rm", "COM99", "a\tb"},
                                             {"find", "COM99", "--link", "air"}}) {
    const auto result = Run(line);
    EXPECT_EQ(result.status, kUsage) << line[0] << ": " << result.errors;
    EXPECT_EQ(result.output, "");
    EXPECT_NE(result.errors, "");
  }
}

TEST_F(Cli, HelpShowsTheExitCodes) {
  const auto result = Run({"--help"});
  EXPECT_EQ(result.status, kDone);
  for (const char* text : {"ports", "find", "info", "ls", "get", "rm", "mv", "set", "check"}) {
    EXPECT_THAT(result.output, HasSubstr(text));
  }
  EXPECT_THAT(result.output, HasSubstr("Exit codes"));
}

TEST_F(Cli, TheOtherFamilyIsNamedWhenItAnswers) {
  const bed::SimulatedPort velmar({"velmar"});
  const auto result = RunOn(velmar, {"find", "--protocol", "quorin"});
  EXPECT_EQ(result.status, kNoReceiver);
  EXPECT_THAT(result.errors, HasSubstr("a Velmar receiver answered instead"));
  EXPECT_THAT(result.errors, HasSubstr("--protocol velmar"));
}

TEST_F(Cli, APortIsUnderstoodHoweverItIsWritten) {
  const bed::SimulatedPort receiver({"quorin"});
  for (const std::string& port : {Port(receiver) + ":", "\\\\.\\" + Port(receiver)}) {
    const auto result = Run({"find", port, "--speed", "9600", "--json"});
    EXPECT_EQ(result.status, kDone) << result.errors;
    EXPECT_EQ(json::parse(result.output).at("port"), Port(receiver));
  }
}

// As `more` and `head` do when they end early.
TEST_F(Cli, AReaderThatHasGoneIsNoFailure) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", "a"}});
  for (const std::vector<std::string>& line : std::vector<std::vector<std::string>>{
           {"--help"}, On(receiver, {"ls"}), On(receiver, {"ls", "--json"})}) {
    const auto result =
        bed::Program(kProgram, line, bed::Output::kClosed, folder.unix_path()).Finish();
    EXPECT_EQ(result.status, kDone) << testing::PrintToString(line);
    EXPECT_EQ(result.errors, "") << testing::PrintToString(line);
  }
}

// Its bytes are lost, so the exit code must say so.
TEST_F(Cli, ADownloadWhoseReaderHasGoneIsAFailure) {
  const bed::SimulatedPort receiver({"quorin"}, {{"a.jps", Content(3000)}});
  const auto result = bed::Program(kProgram,
                                   On(receiver, {"get", "a.jps", "-o", "-"}),
                                   bed::Output::kClosed,
                                   folder.unix_path())
                          .Finish();
  EXPECT_EQ(result.status, kLocalFile);
  EXPECT_THAT(result.errors, HasSubstr("could not write to the standard output"));
}

TEST_F(Cli, ACodeIsExplained) {
  const auto result = Run({"explain", "0x8007048F"});
  EXPECT_EQ(result.status, kDone);
  EXPECT_THAT(result.output, HasSubstr("0x8007048F"));
  EXPECT_THAT(result.output, HasSubstr("check the cable"));
  EXPECT_THAT(Run({"explain"}).output, HasSubstr("0x800705B4  no answer in time"));
  EXPECT_THAT(Run({"explain", "0x800700C1"}).output, HasSubstr("no entry"));
}

class ReportCli : public Cli {
 protected:
  ~ReportCli() override { std::filesystem::remove(path); }

  // Unique, because the folder's own name is.
  const std::string name =
      "cli-run-" + std::filesystem::path(folder.unix_path()).filename().string();
  const std::filesystem::path path = std::filesystem::temp_directory_path() / name;

  std::string Report() const {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  }
};

TEST_F(ReportCli, BeginsWithVersionsAndCommandLine) {
  const bed::SimulatedPort receiver({"quorin"});
  const auto result = RunOn(receiver, {"find", "--report", name, "--json"});
  EXPECT_EQ(result.status, kDone) << result.errors;
  EXPECT_TRUE(json::parse(result.output).at("report").get<std::string>().ends_with(name));
  const std::string report = Report();
  const std::string first_lines = report.substr(0, report.find("CreateReceiverOnSerial"));
  EXPECT_THAT(first_lines, HasSubstr("rcvlink-cli 1."));
  EXPECT_THAT(first_lines, HasSubstr(", rcvlink.dll 1."));
  EXPECT_THAT(first_lines, HasSubstr("command line: "));
  EXPECT_THAT(first_lines, HasSubstr("--report " + name));
  EXPECT_GT(report.size(), first_lines.size());
}

TEST_F(ReportCli, IsNeverReplacedUnlessForced) {
  std::ofstream(path) << "an earlier report";
  const auto refused = Run({"find", "COM99", "--report", name});
  EXPECT_EQ(refused.status, kLocalFile);
  EXPECT_THAT(refused.errors, HasSubstr("already exists"));
  EXPECT_EQ(Report(), "an earlier report");
  EXPECT_EQ(Run({"find", "COM99", "--report", name, "--force"}).status, kNoReceiver);
  EXPECT_THAT(Report(), HasSubstr("command line: "));
}

TEST_F(ReportCli, IsNamedAlsoWhenTheCommandFails) {
  const auto result = Run({"find", "COM99", "--report", name, "--json"});
  EXPECT_EQ(result.status, kNoReceiver);
  EXPECT_TRUE(json::parse(result.output).at("report").get<std::string>().ends_with(name));
}

}  // namespace
}  // namespace cli_run
