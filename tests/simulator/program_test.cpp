#include <gtest/gtest.h>

#include "tests/simulator/program.h"
#include "tests/simulator/session.h"

namespace sim {
namespace {

constexpr int kFailure = 2;
constexpr size_t kIdReply = 17;
constexpr const char* kAskId = "%1%print,/par/rcvid\r\n";
constexpr const char* kId = "RE00A%1%QR00421\r\n";

class ProgramTest : public testing::Test {
 protected:
  ProgramTest() {
    std::filesystem::create_directory(folder / "files");
    folder.Write("files/A0101.log", ToText(TestPayload(kFileSize)));
  }

  // What the program says, and how it ends.
  std::pair<int, std::string> Run(const std::vector<std::string>& arguments) const {
    Program program(arguments);
    std::string output = program.ReadLine();
    // It should have refused.
    if (output.starts_with("/dev/")) program.Terminate();
    output += '\n' + program.ReadAll();
    return {program.Wait(), std::move(output)};
  }

  std::vector<std::string> OnTcp(std::vector<std::string> arguments) const {
    arguments.insert(arguments.begin(), {"quorin", "--folder", folder / "files", "--tcp", "0"});
    return arguments;
  }

  std::string Download(TcpHost& host) const {
    host.Write("%1%get,\"A0101.log\":{0,512}\r\n");
    EXPECT_EQ(host.Read(10), "RE003%1%\r\n");
    std::string content;
    host.Write(kNak);
    while (content.size() < kFileSize) {
      const std::string block = host.Read(kBlockSize);
      if (block.size() != kBlockSize) break;
      content += block.substr(3, std::min(kBlockSize - 6, kFileSize - content.size()));
      host.Write(kAck);
    }
    return content;
  }

  static constexpr size_t kFileSize = 70'000;
  TemporaryFolder folder;
};

TEST_F(ProgramTest, SaysItsVersion) {
  const auto [status, output] = Run({"--version"});
  EXPECT_EQ(status, 0);
  EXPECT_EQ(output, "rcvlink-sim " RCVLINK_VERSION "\n");
}

TEST_F(ProgramTest, ATranscriptReplacesNoFile) {
  folder.Write("kept.txt", "precious");
  const auto [status, output] =
      Run({"quorin", "--folder", folder / "files", "--transcript", folder / "kept.txt"});
  EXPECT_EQ(status, kFailure);
  EXPECT_EQ(output, "rcvlink-sim: the transcript " + (folder / "kept.txt") + " exists already\n");
  EXPECT_EQ(folder.Read("kept.txt"), "precious");
}

TEST_F(ProgramTest, ALinkReplacesNoFile) {
  folder.Write("kept.txt", "precious");
  const auto [status, output] =
      Run({"quorin", "--folder", folder / "files", "--link", folder / "kept.txt"});
  EXPECT_EQ(status, kFailure);
  EXPECT_EQ(output, "rcvlink-sim: " + (folder / "kept.txt") + " exists already and is no link\n");
  EXPECT_EQ(folder.Read("kept.txt"), "precious");
}

TEST_F(ProgramTest, ALinkReplacesALink) {
  const std::string link = folder / "port";
  std::filesystem::create_symlink("/nowhere", link);
  Program program({"quorin", "--folder", folder / "files", "--link", link});
  const std::string port = program.ReadLine();
  EXPECT_EQ(std::filesystem::read_symlink(link), port);
  program.Terminate();
  EXPECT_EQ(program.Wait(), 0);
  EXPECT_FALSE(std::filesystem::is_symlink(link));
}

TEST_F(ProgramTest, AMistakeInAScriptNamesFileAndKey) {
  folder.Write("script.json", R"({"bad-crc": 1, "nois": 0.1})");
  const auto [status, output] =
      Run({"quorin", "--folder", folder / "files", "--script", folder / "script.json"});
  EXPECT_EQ(status, kFailure);
  EXPECT_EQ(output,
            "rcvlink-sim: script " + (folder / "script.json") +
                ": nois: there is no such switch for a script\n");
}

TEST_F(ProgramTest, AScriptMayHaveEverySwitch) {
  folder.Write("script.json",
               R"({"folder": ")" + (folder / "files") + R"(", "tcp": 0, "id": "SCRIPTED"})");
  Program program({"quorin", "--script", folder / "script.json"});
  TcpHost host(program.ReadLine());
  host.Write(kAskId);
  EXPECT_EQ(host.Read(kIdReply + 1), "RE00B%1%SCRIPTED\r\n");
}

TEST_F(ProgramTest, ATcpPortServesOneHostAfterAnother) {
  Program program(OnTcp({}));
  const std::string address = program.ReadLine();
  EXPECT_EQ(address.substr(0, 10), "127.0.0.1:");
  for (int i = 0; i < 2; ++i) {
    TcpHost host(address);
    host.Write(kAskId);
    EXPECT_EQ(host.Read(kIdReply), kId);
    EXPECT_TRUE(Download(host) == ToText(TestPayload(kFileSize)));
  }
}

TEST_F(ProgramTest, ASecondTcpHostWaitsForTheFirst) {
  Program program(OnTcp({"--transcript", folder / "transcript.txt"}));
  const std::string address = program.ReadLine();
  auto first = std::make_unique<TcpHost>(address);
  first->Write(kAskId);
  EXPECT_EQ(first->Read(kIdReply), kId);
  TcpHost second(address);
  second.Write("%2%\r\n");
  first->Write("%3%\r\n");
  EXPECT_EQ(first->Read(10), "RE003%3%\r\n");
  EXPECT_EQ(folder.Read("transcript.txt").find("%2%"), std::string::npos);
  first.reset();
  EXPECT_EQ(second.Read(10), "RE003%2%\r\n");
}

TEST_F(ProgramTest, AWrongAddressIsRefused) {
  for (const char* address : {"x", "localhost:1", ":1", "127.0.0.1:", "127.0.0.1:65536"}) {
    const auto [status, output] = Run({"quorin", "--folder", folder / "files", "--tcp", address});
    EXPECT_EQ(status, kFailure);
    EXPECT_EQ(output,
              "rcvlink-sim: '" + std::string(address) +
                  "' is no [HOST:]PORT, with a host such as 127.0.0.1\n");
  }
}

// An unplugged receiver hangs up, and is found again at the same address.
TEST_F(ProgramTest, AnUnpluggedTcpPortComesBack) {
  Program program(OnTcp({"--unplug", "block=3:0.05"}));
  const std::string address = program.ReadLine();
  {
    TcpHost host(address);
    EXPECT_EQ(Download(host).size(), 3 * (kBlockSize - 6));
    EXPECT_EQ(host.Read(1), "");
  }
  std::string reply;
  while (reply.empty()) {
    TcpHost host(address);
    if (host.connected()) {
      host.Write(kAskId);
      reply = host.Read(kIdReply);
    }
  }
  EXPECT_EQ(reply, kId);
}

// The damage is told in the transcript; the same seed gives the same transcript.
TEST_F(ProgramTest, ANoisyRunCanBeRepeated) {
  const auto run = [&](const std::string& seed, const std::string& transcript) {
    Program program(OnTcp({"--noise",
                           "0.001",
                           "--noise-kinds",
                           "flip,double",
                           "--seed",
                           seed,
                           "--transcript",
                           folder / transcript}));
    TcpHost host(program.ReadLine());
    host.Write("%1%get,\"A0101.log\":{0,512}\r\n");
    host.Read(10);
    for (int i = 0; i < 20; ++i) {
      host.Write(i == 0 ? kNak : kAck);
      host.Read(kBlockSize);
    }
    return folder.Read(transcript);
  };
  const std::string first = run("5", "1.txt");
  EXPECT_NE(first.find("- noise "), std::string::npos);
  EXPECT_EQ(run("5", "2.txt"), first);
  EXPECT_NE(run("6", "3.txt"), first);
}

}  // namespace
}  // namespace sim
