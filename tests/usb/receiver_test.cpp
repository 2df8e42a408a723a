// A receiver that is reached over USB.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "tests/host/support/simulated_usb.h"
#include "tests/support/content.h"
#include "tests/usb/usb_host.h"

namespace {

using testing::HasSubstr;
using usb_host::Connected;

constexpr size_t kBlockLength = 518;
constexpr size_t kPayloadOffset = 3;
constexpr size_t kPayloadLength = 512;
constexpr char kLastBlock = 4;
constexpr const char* kAck = "\x06";
constexpr const char* kNak = "\x15";

void Say(const Connected& host, const std::string& text) {
  ASSERT_EQ(host.writer.Write(text).error, DWORD{ERROR_SUCCESS});
}

std::string Ask(const Connected& host, const std::string& text, size_t reply_length) {
  Say(host, text);
  return host.reader.ReadAll(reply_length);
}

// The first block's head is read apart from the rest, as a host does that looks at it first.
std::string NextBlock(const Connected& host, const char* answer) {
  Say(host, answer);
  const std::string head = host.reader.ReadAll(kPayloadOffset);
  return head + host.reader.ReadAll(kBlockLength - kPayloadOffset);
}

void StartDownload(const Connected& host) {
  EXPECT_EQ(Ask(host, "%1%get,\"A0101.log\":{0,512}\r\n", 10), "RE003%1%\r\n");
}

std::string Download(const Connected& host) {
  StartDownload(host);
  std::string content;
  std::string block = NextBlock(host, kNak);
  while (block.size() == kBlockLength && block[0] != kLastBlock) {
    content += block.substr(kPayloadOffset, kPayloadLength);
    block = NextBlock(host, kAck);
  }
  if (block.size() != kBlockLength) return content;
  const size_t last_length =
      static_cast<unsigned char>(block[1]) + 256U * static_cast<unsigned char>(block[2]);
  Say(host, kAck);
  return content + block.substr(kPayloadOffset, last_length);
}

TEST(UsbReceiver, AnswersACommand) {
  const bed::SimulatedUsb usb({"quorin", "--id", "USB0042"});
  const Connected host(usb.device());

  EXPECT_EQ(Ask(host, "%1%print,/par/rcvid\r\n", 17), "RE00A%1%USB0042\r\n");

  EXPECT_THAT(usb.Transcript(),
              HasSubstr("> %1%print,/par/rcvid\\r\\n\n< RE00A%1%USB0042\\r\\n\n"));
}

TEST(UsbReceiver, NamesItsPortUsb) {
  const bed::SimulatedUsb usb({"quorin"});
  const Connected host(usb.device());
  Say(host, "%1%print,/cur/term\r\n");
  EXPECT_THAT(host.reader.Read(100).text(), HasSubstr("/dev/usb"));
}

TEST(UsbReceiver, SendsAFile) {
  const std::string content = Content(100'000);
  const bed::SimulatedUsb usb({"quorin"}, {{"A0101.log", content}});
  const Connected host(usb.device());
  EXPECT_TRUE(Download(host) == content);
}

TEST(UsbReceiver, SendsAFileInSmallTransfers) {
  const std::string content = Content(2000);
  const bed::SimulatedUsb usb({"quorin", "--transfer", "64"}, {{"A0101.log", content}});
  const Connected host(usb.device());
  EXPECT_TRUE(Download(host) == content);
}

TEST(UsbReceiver, SendsAFileInPieces) {
  const std::string content = Content(2000);
  const bed::SimulatedUsb usb({"quorin", "--pieces", "200", "--piece-gap", "1"},
                              {{"A0101.log", content}});
  const Connected host(usb.device());
  EXPECT_TRUE(Download(host) == content);
}

TEST(UsbReceiver, HasTheFaultsOfItsFamily) {
  const bed::SimulatedUsb usb({"quorin", "--bad-crc", "0", "--refuse", "remove"},
                              {{"A0101.log", Content(1000)}});
  const Connected host(usb.device());

  EXPECT_THAT(Ask(host, "%1%remove,\"A0101.log\"\r\n", 19), "ER00C%1%{refused}\r\n");
  StartDownload(host);
  const std::string damaged = NextBlock(host, kNak);
  const std::string good = NextBlock(host, kNak);

  EXPECT_NE(damaged, good);
  EXPECT_EQ(damaged.substr(0, kPayloadOffset + kPayloadLength),
            good.substr(0, kPayloadOffset + kPayloadLength));
  EXPECT_THAT(usb.Transcript(), HasSubstr("fault=crc"));
}

TEST(UsbReceiver, AnswersLate) {
  const bed::SimulatedUsb usb({"quorin", "--reply-silence", "0.05"});
  const Connected host(usb.device());
  const ULONGLONG start = GetTickCount64();
  EXPECT_EQ(Ask(host, "%1%\r\n", 10), "RE003%1%\r\n");
  EXPECT_GE(GetTickCount64() - start, ULONGLONG{45});
}

// The block is answered, and that write still succeeds.
TEST(UsbReceiver, VanishesInTheMiddleOfAFile) {
  const bed::SimulatedUsb usb({"quorin", "--vanish-after", "1"}, {{"A0101.log", Content(5000)}});
  const Connected host(usb.device());
  StartDownload(host);
  NextBlock(host, kNak);
  NextBlock(host, kAck);

  Say(host, kAck);

  EXPECT_EQ(host.reader.Read(1).error, DWORD{ERROR_DEVICE_NOT_CONNECTED});
  EXPECT_EQ(usb.WaitForEnd(), 0);
  EXPECT_THAT(usb.Transcript(), HasSubstr("- gone\n"));
}

}  // namespace
