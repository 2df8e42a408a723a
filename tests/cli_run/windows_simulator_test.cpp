// The program with a receiver that is a Windows program too, on a named pipe and on a pair of ports.
#include <windows.h>

#include <atomic>
#include <nlohmann/json.hpp>
#include <optional>

#include "tests/cli_run/cli.h"
#include "tests/host/support/handle.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/transcript_file.h"
#include "tests/support/memory_stream.h"

namespace cli_run {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;

constexpr char kSimulator[] = "rcvlink-sim.exe";
constexpr char kAskId[] = "%1%print,/par/rcvid\r\n";
constexpr char kId[] = "RE006%1%QU7\r\n";

std::string ToUtf8(const std::filesystem::path& path) {
  const std::u8string text = path.u8string();
  return std::string(text.begin(), text.end());
}

class WindowsSimulator : public Cli {
 protected:
  // Starts the simulator; `place` is what it says when the port can be opened.
  void Start(std::vector<std::string> arguments, const std::string& place, const Files& content) {
    for (const auto& [name, bytes] : content) files.Write(name, bytes);
    transcript.Clear();
    arguments.insert(arguments.end(),
                     {"--folder", ToUtf8(files.path()), "--transcript", ToUtf8(transcript.path())});
    simulator.emplace(kSimulator, arguments);
    simulator->Expect(place);
  }

  bed::TempFolder files;
  bed::TranscriptFile transcript;
  std::optional<bed::Program> simulator;
};

class PipeSimulator : public WindowsSimulator {
 protected:
  void Start(std::vector<std::string> arguments, const Files& content = {}) {
    arguments.insert(arguments.end(), {"--pipe", name});
    WindowsSimulator::Start(std::move(arguments), path, content);
  }
  bed::ProgramResult RunOn(std::vector<std::string> arguments) const {
    arguments.insert(arguments.begin() + 1, path);
    arguments.insert(arguments.end(), {"--link", "usb"});
    return Run(arguments);
  }
  // A handle of a host; null when the pipe cannot be opened.
  bed::UniqueHandle Open(DWORD access) const {
    bed::UniqueHandle handle(
        CreateFileA(path.c_str(), access, 0, nullptr, OPEN_EXISTING, 0, nullptr));
    return handle.get() == INVALID_HANDLE_VALUE ? nullptr : std::move(handle);
  }
  static std::string Ask(HANDLE writer, HANDLE reader, std::string_view text, size_t size) {
    DWORD count = 0;
    WriteFile(writer, text.data(), static_cast<DWORD>(text.size()), &count, nullptr);
    std::string reply(size, '\0');
    size_t length = 0;
    while (length < size &&
           ReadFile(
               reader, reply.data() + length, static_cast<DWORD>(size - length), &count, nullptr)) {
      length += count;
    }
    reply.resize(length);
    return reply;
  }

  static std::string NewName() {
    static std::atomic<int> count = 0;
    return "rcvlink-test-" + std::to_string(GetCurrentProcessId()) + "-" + std::to_string(++count);
  }

  const std::string name = NewName();
  const std::string path = R"(\\.\pipe\)" + name;
};

TEST_F(PipeSimulator, TheLibraryFindsListsAndGetsWithoutADriver) {
  Start({"quorin", "--id", "QU7"}, {{"a.log", Content(70000)}, {"b.log", "b"}});
  const auto found = RunOn({"find"});
  EXPECT_EQ(found.status, kDone) << found.errors;
  EXPECT_THAT(found.output, HasSubstr("id QU7"));
  EXPECT_THAT(RunOn({"ls"}).output, HasSubstr("2 files, 70001 bytes"));
  const auto got = RunOn({"get", "a.log"});
  EXPECT_EQ(got.status, kDone) << got.errors;
  EXPECT_EQ(folder.Read("a.log"), Content(70000));
  EXPECT_THAT(LocalFiles(), ElementsAre("a.log"));
}

// The pipe's buffer is 64 KiB; the library's handle for writing is never read.
TEST_F(PipeSimulator, MoreThanABufferPasses) {
  Start({"quorin"}, {{"a.log", Content(1'500'000)}});
  const auto got = RunOn({"get", "a.log"});
  EXPECT_EQ(got.status, kDone) << got.errors;
  EXPECT_TRUE(folder.Read("a.log") == Content(1'500'000));
}

TEST_F(PipeSimulator, AHostInTheSameProcessComesTwice) {
  Start({"quorin", "--id", "QU7"}, {{"a.log", Content(3000)}});
  for (int i = 0; i < 2; ++i) {
    host::OpenReceiver receiver;
    std::wstring device(path.begin(), path.end());
    ASSERT_EQ(
        devapi::SearchReceiver(device.data(), eInstanceUSB, eProtocolAny, nullptr, receiver.out()),
        S_OK);
    EXPECT_EQ(receiver.Identify().id, L"QU7");
    MemoryStream stream;
    EXPECT_EQ(receiver.Download(L"a.log", stream), S_OK);
    EXPECT_TRUE(stream.bytes == Content(3000));
  }
}

TEST_F(PipeSimulator, OneHandleForBothWaysWillDo) {
  Start({"quorin", "--id", "QU7"});
  const auto handle = Open(GENERIC_READ | GENERIC_WRITE);
  ASSERT_TRUE(handle);
  EXPECT_EQ(Ask(handle.get(), handle.get(), kAskId, sizeof(kId) - 1), kId);
}

// A host that opens, asks a little and closes, again and again.
TEST_F(PipeSimulator, AHostThatComesAgainAtOnceIsServed) {
  Start({"quorin", "--id", "QU7"});
  for (int i = 0; i < 50; ++i) {
    const auto writer = Open(GENERIC_WRITE);
    const auto reader = Open(GENERIC_READ);
    ASSERT_TRUE(writer && reader) << i << " " << GetLastError();
    for (int question = 0; question < 3; ++question) {
      ASSERT_EQ(Ask(writer.get(), reader.get(), kAskId, sizeof(kId) - 1), kId) << i;
    }
  }
}

// A Velmar receiver sends a file without being asked for more.
TEST_F(PipeSimulator, AStreamWaitsForASlowHost) {
  constexpr size_t kSize = 3'000'000;
  Start({"velmar", "--chunk", "60000", "--mute", "x"}, {{"a.log", Content(kSize)}});
  const auto writer = Open(GENERIC_WRITE);
  const auto reader = Open(GENERIC_READ);
  ASSERT_TRUE(writer && reader);
  constexpr std::string_view kOk = "\r\n<OK\r\n[COM1]";
  EXPECT_EQ(Ask(writer.get(), reader.get(), "currentfile a.log all\r", kOk.size()), kOk);
  EXPECT_EQ(Ask(writer.get(), reader.get(), "log filetransferb\r", kOk.size()), kOk);
  // It hears each of these, and has time to send a chunk, of which there are 50.
  for (int i = 0; i < 60; ++i) {
    const std::string line = "x " + std::to_string(i);
    Ask(writer.get(), reader.get(), line + "\r", 0);
    transcript.WaitFor("> " + line + "\\r", std::chrono::seconds(20));
  }
  EXPECT_THAT(transcript.Text(), Not(HasSubstr("seq=0 ")));
  constexpr size_t kFrame = 28 + 8 + 4;
  EXPECT_EQ(Ask(writer.get(), reader.get(), "", kSize + kSize / 60000 * kFrame).size(),
            kSize + kSize / 60000 * kFrame);
  transcript.WaitFor("seq=0 ", std::chrono::seconds(20));
}

TEST_F(PipeSimulator, ANameBelongsToOneSimulator) {
  Start({"quorin"});
  const auto second =
      bed::Program(kSimulator, {"quorin", "--folder", ToUtf8(files.path()), "--pipe", name})
          .Finish();
  EXPECT_EQ(second.status, 2);
  EXPECT_THAT(second.errors, HasSubstr("rcvlink-sim: cannot make the pipe"));
}

TEST_F(PipeSimulator, AnInterruptEndsIt) {
  Start({"quorin"});
  simulator->Interrupt();
  EXPECT_EQ(simulator->Finish().status, 0);
  EXPECT_FALSE(Open(GENERIC_READ));
}

// As when the cable of a USB device is pulled: the handles fail, and the path is gone.
TEST_F(PipeSimulator, AnUnpluggedReceiverHangsUpAndComesBack) {
  Start({"quorin", "--id", "QU7", "--unplug", "byte=13:0.2"});
  const auto handle = Open(GENERIC_READ | GENERIC_WRITE);
  ASSERT_TRUE(handle);
  EXPECT_EQ(Ask(handle.get(), handle.get(), kAskId, sizeof(kId) - 1), kId);
  EXPECT_EQ(Ask(handle.get(), handle.get(), kAskId, 1), "");
  EXPECT_FALSE(Open(GENERIC_READ));
  transcript.WaitFor("- plugged in", std::chrono::seconds(20));
  bed::UniqueHandle again;
  while (!(again = Open(GENERIC_READ | GENERIC_WRITE))) SwitchToThread();
  EXPECT_EQ(Ask(again.get(), again.get(), kAskId, sizeof(kId) - 1), kId);
}

TEST_F(PipeSimulator, AScriptIsReadAsOnLinux) {
  files.Write("script.json", R"({"id": "SCRIPTED", "pieces": 7})");
  Start({"quorin", "--script", ToUtf8(files / "script.json")});
  EXPECT_THAT(RunOn({"find"}).output, HasSubstr("id SCRIPTED"));
}

class NoPort : public WindowsSimulator {
 protected:
  bed::ProgramResult RunWith(std::vector<std::string> arguments) const {
    arguments.insert(arguments.begin(), {"quorin", "--folder", ToUtf8(files.path())});
    return bed::Program(kSimulator, arguments).Finish();
  }
};

TEST_F(NoPort, APlaceIsNeeded) {
  EXPECT_GT(RunWith({}).status, 100);
  EXPECT_GT(RunWith({"--pipe", "x", "--port", "COM1"}).status, 100);
  EXPECT_GT(RunWith({"--link", "x"}).status, 100);
  EXPECT_GT(RunWith({"--tcp", "1"}).status, 100);
}

TEST_F(NoPort, APortThatDoesNotExistIsReported) {
  const auto result = RunWith({"--port", "COM250"});
  EXPECT_EQ(result.status, 2);
  EXPECT_THAT(result.errors, HasSubstr("rcvlink-sim: cannot open the port"));
}

class ComSimulator : public WindowsSimulator {
 protected:
  void Start(std::vector<std::string> arguments, const Files& content = {}) {
    arguments.insert(arguments.end(), {"--port", sim_port.name()});
    WindowsSimulator::Start(std::move(arguments), sim_port.name(), content);
  }
  bed::ProgramResult RunOn(std::vector<std::string> arguments) const {
    arguments.insert(arguments.begin() + 1, host_port.name());
    return Run(arguments);
  }

  void SetUp() override {
    connection.Request({{"do", "join"}, {"ports", {sim_port.name(), host_port.name()}}});
  }
  // Before its port goes.
  void TearDown() override {
    if (!simulator) return;
    simulator->Interrupt();
    simulator->Finish();
  }

  bed::PortLease sim_port;
  bed::PortLease host_port;
  bed::Connection connection;
};

TEST_F(ComSimulator, AQuorinReceiverIsFoundListedAndRead) {
  Start({"quorin", "--id", "QU7"}, {{"a.log", Content(70000)}});
  const auto found = RunOn({"find", "--speed", "9600"});
  EXPECT_EQ(found.status, kDone) << found.errors;
  EXPECT_THAT(found.output, HasSubstr("id QU7"));
  EXPECT_THAT(RunOn({"ls", "--speed", "9600"}).output, HasSubstr("1 file, 70000 bytes"));
  const auto got = RunOn({"get", "a.log", "--speed", "9600"});
  EXPECT_EQ(got.status, kDone) << got.errors;
  EXPECT_TRUE(folder.Read("a.log") == Content(70000));
  // It has raised the speed, and set the old one again.
  EXPECT_THAT(transcript.Text(), HasSubstr("= speed 115200\n"));
  EXPECT_THAT(transcript.Text(), HasSubstr("= speed 9600\n"));
}

TEST_F(ComSimulator, AVelmarReceiverIsRead) {
  Start({"velmar"}, {{"a.log", Content(70000)}});
  const auto got = RunOn({"get", "a.log", "--speed", "9600", "--protocol", "velmar"});
  EXPECT_EQ(got.status, kDone) << got.errors;
  EXPECT_TRUE(folder.Read("a.log") == Content(70000));
}

TEST_F(ComSimulator, AnInterruptEndsIt) {
  Start({"quorin"});
  simulator->Interrupt();
  EXPECT_EQ(simulator->Finish().status, 0);
  simulator.reset();
}

}  // namespace
}  // namespace cli_run
