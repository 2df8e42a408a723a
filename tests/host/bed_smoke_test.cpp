// The test bed itself: a receiver on a port, bytes both ways, and a port that loses nothing.
#include <gtest/gtest.h>
#include <windows.h>

#include <array>
#include <string>

#include "tests/host/support/handle.h"
#include "tests/host/support/simulated_port.h"

namespace {

HANDLE OpenPort(const std::wstring& path) {
  return CreateFileW(
      path.c_str(), GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, 0, nullptr);
}

// A port opened at 9600 bit/s that waits up to two seconds for a byte.
class BedTest : public testing::Test {
 protected:
  void Open(const std::wstring& path) {
    port_.reset(OpenPort(path));
    ASSERT_NE(port_.get(), INVALID_HANDLE_VALUE);
    DCB dcb{};
    dcb.DCBlength = sizeof(dcb);
    ASSERT_TRUE(GetCommState(port_.get(), &dcb));
    dcb.BaudRate = CBR_9600;
    ASSERT_TRUE(SetCommState(port_.get(), &dcb));
    COMMTIMEOUTS timeouts{};
    timeouts.ReadTotalTimeoutConstant = 2000;
    ASSERT_TRUE(SetCommTimeouts(port_.get(), &timeouts));
  }

  void Write(const std::string& text) {
    DWORD count = 0;
    ASSERT_TRUE(
        WriteFile(port_.get(), text.data(), static_cast<DWORD>(text.size()), &count, nullptr));
    ASSERT_EQ(count, text.size());
  }

  std::string Read(size_t size) {
    std::string text(size, '\0');
    DWORD count = 0;
    ReadFile(port_.get(), text.data(), static_cast<DWORD>(size), &count, nullptr);
    text.resize(count);
    return text;
  }

  bed::UniqueHandle port_;
};

TEST_F(BedTest, ReceiverAnswersOnItsPort) {
  const bed::SimulatedPort receiver({"quorin", "--speed", "9600"});
  Open(receiver.path());

  Write("%1%\r\n");

  const std::string start = "RE003%1%";
  EXPECT_EQ(Read(start.size()), start);
  EXPECT_NE(receiver.Transcript().find("> %1%"), std::string::npos) << receiver.Transcript();
}

// A slow receiver still gets everything that was written, although it is more than a
// pseudo-terminal itself protects from a purge.
TEST_F(BedTest, PurgeAfterAWriteLosesNothing) {
  constexpr size_t kSize = 6000;
  bed::SimulatedPort receiver({"quorin", "--speed", "9600"});
  Open(receiver.path());
  receiver.Pause();

  std::string commands;
  while (commands.size() < kSize) commands += "%1%\r\n";
  Write(commands + "%last%\r\n");
  ASSERT_TRUE(PurgeComm(port_.get(), PURGE_TXABORT | PURGE_TXCLEAR));
  receiver.Resume();

  receiver.WaitForTranscript("> %last%");
}

TEST_F(BedTest, PortIsAbsentWithoutAReceiver) {
  bed::SimulatedPort receiver({"quorin"});
  EXPECT_EQ(receiver.Stop(), 0);

  port_.reset(OpenPort(receiver.path()));
  EXPECT_EQ(port_.get(), INVALID_HANDLE_VALUE);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_FILE_NOT_FOUND});

  receiver.Start({"quorin"});
  port_.reset(OpenPort(receiver.path()));
  EXPECT_NE(port_.get(), INVALID_HANDLE_VALUE);
}

TEST_F(BedTest, ReceiverCanBeKilled) {
  bed::SimulatedPort receiver({"quorin"});
  EXPECT_FALSE(receiver.Status().has_value());
  receiver.Kill();
  EXPECT_EQ(OpenPort(receiver.path()), INVALID_HANDLE_VALUE);
}

TEST(BedRefusal, ReportsWhatTheSimulatorPrinted) {
  EXPECT_THROW(bed::SimulatedPort({"no-such-family"}), bed::Error);
}

TEST(BedFolder, IsSeenFromBothSides) {
  bed::TempFolder folder;
  folder.Write("a.bin", std::string("\0\r\n\xFF", 4));
  EXPECT_EQ(folder.Read("a.bin"), std::string("\0\r\n\xFF", 4));
  EXPECT_EQ(bed::ToUnixPath(folder.path()), folder.unix_path());
}

TEST(BedPorts, AreFourAShard) {
  const bed::PortLease first;
  const bed::PortLease second;
  const bed::PortLease third;
  const bed::PortLease fourth;
  EXPECT_NE(first.name(), second.name());
  EXPECT_THROW(bed::PortLease(), bed::Error);
}

}  // namespace
