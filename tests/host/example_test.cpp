// The host program of README.md, as its reader runs it.
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

using testing::HasSubstr;

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
  EXPECT_THAT(result.output, HasSubstr("download: 0x00000000\nsaved\n"));
  EXPECT_EQ(folder.Read("copy.jps"), Content(3000));
}

TEST_F(ExampleProgram, LeavesAnOlderFileAloneWhenThereIsNothingToSave) {
  const bed::SimulatedPort port({"quorin"}, {{"a.jps", Content(3000)}});
  folder.Write("copy.jps", "older");
  const auto result = Download(port, "b.jps");
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.output, HasSubstr("not saved\n"));
  EXPECT_EQ(folder.Read("copy.jps"), "older");
}

// S_OK, but not all bytes.
TEST_F(ExampleProgram, LeavesAnOlderFileAloneWhenBytesAreMissing) {
  const bed::SimulatedPort port({"quorin", "--lie-size", "a.jps=4000"}, {{"a.jps", Content(3000)}});
  folder.Write("copy.jps", "older");
  const auto result = Download(port, "a.jps");
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.output, HasSubstr("download: 0x00000000\nnot saved\n"));
  EXPECT_EQ(folder.Read("copy.jps"), "older");
}

TEST_F(ExampleProgram, SaysThatThereIsNoReceiver) {
  const auto result = bed::Program("download_example.exe", {"COM99", "a.jps", "copy.jps"}).Finish();
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(result.output, "no receiver: 0x80070002\n");
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
