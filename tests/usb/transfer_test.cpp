// Bytes to and from a simulated USB device.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <vector>

#include "tests/host/support/simulated_usb.h"
#include "tests/usb/usb_host.h"

namespace {

using testing::HasSubstr;
using usb_host::Connected;
using usb_host::kNotBound;
using usb_host::Pending;
using usb_host::Result;

constexpr DWORD kDone = ERROR_SUCCESS;
constexpr DWORD kAborted = ERROR_OPERATION_ABORTED;
constexpr const char* kPing = "%1%\r\n";
constexpr const char* kReply = "RE003%1%\r\n";
constexpr size_t kReplyLength = 10;
constexpr size_t kRoom = 1000;

class UsbTransfer : public testing::Test {
 protected:
  void Plug(std::vector<std::string> switches = {}) {
    switches.insert(switches.begin(), "quorin");
    usb_.emplace(switches);
    host_.emplace(usb_->device());
  }
  DWORD Ping() const { return host_->writer.Write(kPing).error; }
  Result Read(size_t room = kRoom) const { return host_->reader.Read(room); }
  std::vector<size_t> Lengths(size_t total, size_t room = kRoom) const {
    std::vector<size_t> lengths;
    for (size_t left = total; left > 0; left -= lengths.back()) {
      const Result result = Read(room);
      if (result.bytes.empty() || result.bytes.size() > left) {
        ADD_FAILURE() << result.error << " " << result.bytes.size();
        break;
      }
      lengths.push_back(result.bytes.size());
    }
    return lengths;
  }

  std::optional<bed::SimulatedUsb> usb_;
  std::optional<Connected> host_;
};

TEST_F(UsbTransfer, ReturnsHowManyBytesWereWritten) {
  Plug();
  const Result result = host_->writer.Write(kPing);
  EXPECT_EQ(result.error, kDone);
  EXPECT_EQ(result.bytes.size(), 5U);
}

// When a write has ended, its effect is complete.
TEST_F(UsbTransfer, IsInTheTranscriptAtOnce) {
  Plug();
  Ping();
  EXPECT_THAT(usb_->Transcript(), HasSubstr("> %1%\\r\\n\n"));
}

TEST_F(UsbTransfer, GivesAReadTheAvailableBytes) {
  Plug();
  Ping();
  EXPECT_EQ(Read().text(), kReply);
}

TEST_F(UsbTransfer, KeepsTheRestForTheNextRead) {
  Plug();
  Ping();
  EXPECT_EQ(Read(3).text(), "RE0");
  EXPECT_EQ(Read(1).text(), "0");
  EXPECT_EQ(Read(6).text(), "3%1%\r\n");
}

TEST_F(UsbTransfer, DoesNotJoinMessages) {
  Plug();
  Ping();
  Ping();
  EXPECT_EQ(Lengths(2 * kReplyLength), (std::vector<size_t>{10, 10}));
}

TEST_F(UsbTransfer, IsCutToTheGivenSize) {
  Plug({"--transfer", "4"});
  Ping();
  EXPECT_EQ(Lengths(kReplyLength), (std::vector<size_t>{4, 4, 2}));
}

TEST_F(UsbTransfer, IsCutAndReadInSmallerParts) {
  Plug({"--transfer", "4"});
  Ping();
  EXPECT_EQ(Lengths(kReplyLength, 3), (std::vector<size_t>{3, 1, 3, 1, 2}));
}

TEST_F(UsbTransfer, HoldsAtMost512BytesByDefault) {
  Plug({"--garbage", "600"});
  Ping();
  EXPECT_EQ(Lengths(600 + kReplyLength), (std::vector<size_t>{512, 88, 10}));
}

TEST_F(UsbTransfer, EndsAReadThatWaited) {
  Plug();
  Pending read = host_->reader.StartRead(kRoom);
  EXPECT_FALSE(read.Ended());
  Ping();
  EXPECT_EQ(read.Finish().text(), kReply);
}

TEST_F(UsbTransfer, ServesReadsInTheirOrder) {
  Plug();
  Pending first = host_->reader.StartRead(4);
  Pending second = host_->reader.StartRead(4);
  Pending third = host_->reader.StartRead(4);
  Ping();
  EXPECT_EQ(first.Finish().text(), "RE00");
  EXPECT_EQ(second.Finish().text(), "3%1%");
  EXPECT_EQ(third.Finish().text(), "\r\n");
}

TEST_F(UsbTransfer, EndsAReadThatIsCancelled) {
  Plug();
  Pending read = host_->reader.StartRead(kRoom);
  ASSERT_TRUE(CancelIo(host_->reader.get()));
  EXPECT_EQ(read.Finish().error, kAborted);
  Ping();
  EXPECT_EQ(Read().text(), kReply);
}

// Reads are cancelled while their bytes arrive. Whichever comes first, a host that waits for the
// cancelled read gets every byte once.
TEST_F(UsbTransfer, LosesNothingToACancelledRead) {
  constexpr int kRounds = 200;
  Plug();
  for (int round = 0; round < kRounds; ++round) {
    Pending read = host_->reader.StartRead(kRoom);
    Pending write = host_->writer.StartWrite(kPing);
    ASSERT_TRUE(CancelIo(host_->reader.get()));
    const Result result = read.Finish();
    ASSERT_EQ(write.Finish().error, kDone);
    std::string reply = result.text();
    if (result.error == kAborted) reply += Read().text();
    ASSERT_EQ(reply, kReply) << round;
  }
}

TEST_F(UsbTransfer, EndsWhenTheHandleIsUnbound) {
  Plug();
  Pending read = host_->reader.StartRead(kRoom);
  EXPECT_EQ(host_->reader.Unbind(), kDone);
  EXPECT_EQ(read.Finish().error, kAborted);
}

TEST_F(UsbTransfer, KeepsBytesThatWereNotRead) {
  Plug();
  Ping();
  EXPECT_EQ(host_->reader.Unbind(), kDone);
  EXPECT_EQ(Read().error, kNotBound);
  EXPECT_EQ(host_->reader.Bind(0x81), kDone);
  EXPECT_EQ(Read().text(), kReply);
}

TEST_F(UsbTransfer, AcceptsACommandInTwoWrites) {
  Plug();
  EXPECT_EQ(host_->writer.Write("%1%").error, kDone);
  EXPECT_EQ(host_->writer.Write("\r\n").error, kDone);
  EXPECT_EQ(Read().text(), kReply);
}

TEST_F(UsbTransfer, TakesSeveralWritesAtOnce) {
  Plug();
  Pending first = host_->writer.StartWrite("%1");
  Pending second = host_->writer.StartWrite("%\r");
  Pending third = host_->writer.StartWrite("\n");
  EXPECT_EQ(first.Finish().error, kDone);
  EXPECT_EQ(second.Finish().error, kDone);
  EXPECT_EQ(third.Finish().error, kDone);
  EXPECT_EQ(Read().text(), kReply);
}

TEST_F(UsbTransfer, TakesLongWrites) {
  constexpr size_t kLongest = 65536;
  Plug();
  std::string text(kLongest, 'x');
  text.replace(text.size() - 7, 7, "\r\n%1%\r\n");
  EXPECT_EQ(host_->writer.Write(text).bytes.size(), text.size());
  EXPECT_EQ(host_->writer.Write(text + "y").error, DWORD{ERROR_INVALID_USER_BUFFER});
  usb_->WaitForTranscript("> %1%\\r\\n\n");
}

TEST_F(UsbTransfer, FailsToWrite) {
  Plug({"--write-error",
        "0xE0000001",
        "--write-error",
        "0xE0000002:1",
        "--write-error",
        "0xE0000003:2@2",
        "--write-error",
        "0xE0001009:3@always"});
  EXPECT_EQ(Ping(), DWORD{0xE0000001});
  EXPECT_EQ(Ping(), kDone);
  EXPECT_EQ(Ping(), DWORD{0xE0000002});
  EXPECT_EQ(Ping(), kDone);
  EXPECT_EQ(Ping(), DWORD{0xE0000003});
  EXPECT_EQ(Ping(), DWORD{0xE0000003});
  EXPECT_EQ(Ping(), kDone);
  EXPECT_EQ(Ping(), kNotBound);
  EXPECT_EQ(Ping(), kNotBound);
  EXPECT_EQ(Lengths(3 * kReplyLength), (std::vector<size_t>{10, 10, 10}));
  EXPECT_THAT(usb_->Transcript(),
              HasSubstr("= bind 0x81\n- write error 0xE0000001\n> %1%\\r\\n\n"));
}

}  // namespace
