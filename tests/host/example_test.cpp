// The host program of README.md and the other examples, as their readers run them.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <filesystem>
#include <string>
#include <vector>

#include "tests/host/support/program.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/simulated_port.h"
#include "tests/host/support/temp_folder.h"
#include "tests/support/content.h"

using testing::EndsWith;
using testing::HasSubstr;
using testing::IsEmpty;

namespace {

class ExampleProgram : public testing::Test {
 protected:
  bed::ProgramResult Download(const bed::SimulatedPort& port, const std::string& name) const {
    return bed::Program("download_example.exe",
                        {host::Narrow(port.name()), name, "copy.jps"},
                        bed::Output::kPipe,
                        folder.unix_path())
        .Finish();
  }

  const bed::TempFolder folder;
};

TEST_F(ExampleProgram, SavesAFile) {
  const bed::SimulatedPort port({"quorin"}, {{"a.jps", Content(3000)}, {"b.jps", "b"}});
  const auto result = Download(port, "a.jps");
  EXPECT_EQ(result.status, 0);
  EXPECT_THAT(result.output, EndsWith("100 %\nsaved\n"));
  EXPECT_EQ(folder.Read("copy.jps"), Content(3000));
}

TEST_F(ExampleProgram, LeavesAnOlderFileAloneWhenThereIsNothingToSave) {
  const bed::SimulatedPort port({"quorin"}, {{"a.jps", Content(3000)}});
  folder.Write("copy.jps", "older");
  const auto result = Download(port, "b.jps");
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.output,
              HasSubstr("not saved: find b.jps on the receiver: it does not exist\n"));
  EXPECT_EQ(folder.Read("copy.jps"), "older");
}

// S_OK, but not all bytes.
TEST_F(ExampleProgram, LeavesAnOlderFileAloneWhenBytesAreMissing) {
  const bed::SimulatedPort port({"quorin", "--lie-size", "a.jps=4000"}, {{"a.jps", Content(3000)}});
  folder.Write("copy.jps", "older");
  const auto result = Download(port, "a.jps");
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.output, HasSubstr("not saved: download a.jps: 3000 of 4000 bytes: "));
  EXPECT_EQ(folder.Read("copy.jps"), "older");
}

TEST_F(ExampleProgram, SaysThatThereIsNoReceiver) {
  const auto result = bed::Program("download_example.exe", {"COM99", "a.jps", "copy.jps"}).Finish();
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(result.output, "\nnot saved: find a receiver on COM99: it does not exist\n");
}

TEST_F(ExampleProgram, SaysHowItIsUsed) {
  for (const char* name : {"download", "cancel", "several", "mirror"}) {
    const auto result = bed::Program(std::string(name) + "_example.exe", {}).Finish();
    EXPECT_EQ(result.status, 2);
    EXPECT_THAT(result.output, testing::StartsWith(std::string("usage: ") + name + " PORT"));
  }
}

std::vector<std::string> NamesIn(const bed::TempFolder& folder) {
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(folder.path())) {
    names.push_back(entry.path().filename().string());
  }
  return names;
}

class CancelExample : public testing::Test {
 protected:
  const bed::TempFolder folder;
};

TEST_F(CancelExample, CtrlCEndsTheDownloadAndLeavesNothing) {
  const bed::SimulatedPort port({"quorin", "--pace"}, {{"a.jps", Content(200000)}});
  bed::Program program("cancel_example.exe",
                       {host::Narrow(port.name()), "a.jps", "copy.jps"},
                       bed::Output::kTerminal,
                       folder.unix_path());
  port.WaitForTranscript("seq=5");
  program.Interrupt();
  const auto result = program.Finish();
  EXPECT_EQ(result.status, 3) << result.output;
  EXPECT_THAT(result.output, HasSubstr("not saved: download a.jps: cancelled"));
  EXPECT_THAT(NamesIn(folder), IsEmpty());
  port.WaitForTranscript("= speed 9600");
}

TEST_F(CancelExample, SavesWhenNobodyCancels) {
  const bed::SimulatedPort port({"quorin"}, {{"a.jps", Content(3000)}});
  const auto result = bed::Program("cancel_example.exe",
                                   {host::Narrow(port.name()), "a.jps", "copy.jps"},
                                   bed::Output::kPipe,
                                   folder.unix_path())
                          .Finish();
  EXPECT_EQ(result.status, 0);
  EXPECT_THAT(result.output, EndsWith("100 %\nsaved\n"));
  EXPECT_EQ(folder.Read("copy.jps"), Content(3000));
}

TEST(SeveralExample, DescribesFourAtOnce) {
  std::vector<std::unique_ptr<bed::SimulatedPort>> receivers;
  std::vector<std::string> ports;
  std::string expected;
  for (const char* id : {"QU1", "QU2", "QU3", "QU4"}) {
    receivers.push_back(std::make_unique<bed::SimulatedPort>(
        std::vector<std::string>{"quorin", "--id", id, "--model", "QR9"},
        std::map<std::string, std::string>{{"a.jps", "a"}}));
    ports.push_back(host::Narrow(receivers.back()->name()));
    expected += ports.back() + ": QR9 " + id + ", 1 files, 1 bytes\n";
  }
  const auto result = bed::Program("several_example.exe", ports).Finish();
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.output, expected);
}

TEST(SeveralExample, DescribesEachReceiver) {
  const bed::SimulatedPort first({"quorin", "--id", "QU7", "--model", "QR9"},
                                 {{"a.jps", Content(3000)}, {"b.jps", "b"}});
  const bed::SimulatedPort second({"quorin", "--id", "QU8", "--model", "QR9"});
  const std::string ports[] = {host::Narrow(first.name()), host::Narrow(second.name())};
  const auto both = bed::Program("several_example.exe", {ports[0], ports[1]}).Finish();
  EXPECT_EQ(both.status, 0);
  EXPECT_EQ(
      both.output,
      ports[0] + ": QR9 QU7, 2 files, 3001 bytes\n" + ports[1] + ": QR9 QU8, 0 files, 0 bytes\n");
  const auto one = bed::Program("several_example.exe", {"COM99", ports[1]}).Finish();
  EXPECT_EQ(one.status, 1);
  EXPECT_EQ(one.output,
            "COM99: find a receiver on COM99: it does not exist\n" + ports[1] +
                ": QR9 QU8, 0 files, 0 bytes\n");
}

class MirrorExample : public testing::Test {
 protected:
  bed::ProgramResult Mirror(const bed::SimulatedPort& port) const {
    return bed::Program("mirror_example.exe",
                        {host::Narrow(port.name()), "survey"},
                        bed::Output::kPipe,
                        folder.unix_path())
        .Finish();
  }

  const bed::TempFolder folder;
};

TEST_F(MirrorExample, DownloadsWhatIsMissingOrOfAnotherSize) {
  const bed::SimulatedPort port({"quorin"},
                                {{"a.jps", Content(1000)}, {"b.jps", "bb"}, {"c.jps", "cc"}});
  std::filesystem::create_directory(folder / "survey");
  folder.Write("survey/b.jps", "BB");
  folder.Write("survey/c.jps", "c");
  const auto result = Mirror(port);
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.output, "a.jps: downloaded\nc.jps: downloaded\n");
  EXPECT_EQ(folder.Read("survey/a.jps"), Content(1000));
  EXPECT_EQ(folder.Read("survey/b.jps"), "BB") << "it was downloaded again";
  EXPECT_EQ(folder.Read("survey/c.jps"), "cc");
}

TEST_F(MirrorExample, SetsTheTimes) {
  const bed::TempFolder served;
  served.Write("a.jps", "a2345678");
  const SYSTEMTIME time{2024, 2, 4, 29, 23, 59, 58, 0};
  FILETIME modified{};
  ASSERT_TRUE(SystemTimeToFileTime(&time, &modified));
  {
    const bed::UniqueHandle file(CreateFileW((served / "a.jps").c_str(),
                                             FILE_WRITE_ATTRIBUTES,
                                             FILE_SHARE_READ,
                                             nullptr,
                                             OPEN_EXISTING,
                                             0,
                                             nullptr));
    ASSERT_TRUE(SetFileTime(file.get(), nullptr, nullptr, &modified));
  }
  const bed::SimulatedPort port({"velmar", "--folder", served.unix_path()});
  EXPECT_EQ(Mirror(port).status, 0);
  WIN32_FILE_ATTRIBUTE_DATA data{};
  ASSERT_TRUE(
      GetFileAttributesExW((folder / "survey/a.jps").c_str(), GetFileExInfoStandard, &data));
  EXPECT_EQ(CompareFileTime(&data.ftLastWriteTime, &modified), 0);
}

TEST_F(MirrorExample, GoesOnAfterAFileThatFails) {
  const bed::SimulatedPort port({"quorin", "--refuse", "get,\"a.jps"},
                                {{"a.jps", "aa"}, {"b.jps", "bb"}, {"d:e.jps", "stream"}});
  const auto result = Mirror(port);
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.output, HasSubstr("a.jps: download a.jps: no connection, "));
  EXPECT_THAT(result.output, HasSubstr("b.jps: downloaded\n"));
  EXPECT_THAT(result.output, HasSubstr("d:e.jps: Windows has no such file name\n"));
  EXPECT_EQ(folder.Read("survey/b.jps"), "bb");
}

TEST(PlainCExample, ListsTheFiles) {
  const bed::SimulatedPort port({"quorin"}, {{"a.jps", Content(3000)}, {"b.jps", "b"}});
  const std::vector<wchar_t> path = [] {
    std::vector<wchar_t> name(MAX_PATH);
    GetModuleFileNameW(GetModuleHandleW(L"rcvlink.dll"), name.data(), MAX_PATH);
    return name;
  }();
  const auto result =
      bed::Program("list_example.exe", {host::Narrow(path.data()), host::Narrow(port.name())})
          .Finish();
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.output, "      3000 a.jps\n         1 b.jps\n");
}

TEST(PlainCExample, RefusesAnotherDll) {
  const auto result = bed::Program("list_example.exe", {"kernel32.dll", "COM99"}).Finish();
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(result.output, "that is no rcvlink.dll\n");
}

}  // namespace
