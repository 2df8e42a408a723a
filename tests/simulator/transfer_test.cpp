#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include "tests/simulator/session.h"

namespace sim {
namespace {

constexpr unsigned kData = 0x02;
constexpr unsigned kLast = 0x04;

// The CRCs of a file of 1100 test bytes, computed without the simulator's code.
constexpr unsigned kCrcOfBlock[] = {0xB8C4, 0x8870, 0x6AE6};

TEST(TransferTest, AFileOfThreeBlocksHasTheKnownChainOfCrcs) {
  Session session;
  const Bytes payload = TestPayload(1100);
  Bytes block = session.StartTransfer();
  for (unsigned number = 0; number < 3; ++number) {
    const SeenBlock seen(block);
    const bool last = number == 2;
    EXPECT_EQ(seen.type, last ? kLast : kData);
    EXPECT_EQ(seen.field, last ? 1100U - 1024U : number);
    EXPECT_EQ(seen.crc, kCrcOfBlock[number]);
    EXPECT_EQ(seen.end, 0x03U);
    const auto offset = payload.begin() + 512 * static_cast<std::ptrdiff_t>(number);
    EXPECT_TRUE(std::equal(offset, last ? payload.end() : offset + 512, block.begin() + 3));
    if (last) {
      EXPECT_EQ(std::count(block.begin() + 3 + 76, block.begin() + 515, 0), 512 - 76);
    } else {
      block = session.NextBlock(kAck);
    }
  }
  EXPECT_TRUE(session.receiver.in_transfer());
  EXPECT_EQ(session.Ask("#"), "");
  EXPECT_FALSE(session.receiver.in_transfer());
  EXPECT_EQ(session.Ask("%2%\r\n"), "RE003%2%\r\n");
}

TEST(TransferTest, NothingIsSentBeforeTheHostAsks) {
  Session session;
  EXPECT_EQ(session.Ask("%1%get,\"A0101.log\":{500,512}\r\n"), "RE003%1%\r\n");
  EXPECT_EQ(session.Ask(kAck), "");
  EXPECT_EQ(session.Ask(kNak).size(), kBlockSize);
}

TEST(TransferTest, ANakBringsTheSameBlockAgain) {
  Session session;
  const Bytes first = session.StartTransfer();
  EXPECT_EQ(session.NextBlock(kNak), first);
  const Bytes second = session.NextBlock(kAck);
  EXPECT_EQ(SeenBlock(second).crc, kCrcOfBlock[1]);
  EXPECT_EQ(session.NextBlock(kNak), second);
  EXPECT_EQ(session.NextBlock(kNak), second);
  const Bytes third = session.NextBlock(kAck);
  EXPECT_EQ(SeenBlock(third).crc, kCrcOfBlock[2]);
  EXPECT_EQ(session.NextBlock(kNak), third);
}

TEST(TransferTest, AnAckOfTheLastBlockEndsTheTransferToo) {
  Session session({}, OneFile(1));
  const SeenBlock block(session.StartTransfer());
  EXPECT_EQ(block.type, kLast);
  EXPECT_EQ(block.field, 1U);
  EXPECT_EQ(session.Ask(kAck), "");
  EXPECT_EQ(session.Ask("%2%\r\n"), "RE003%2%\r\n");
}

TEST(TransferTest, AFullLastBlockIsTheLast) {
  Session session({}, OneFile(1024));
  EXPECT_EQ(SeenBlock(session.StartTransfer()).type, kData);
  const SeenBlock last(session.NextBlock(kAck));
  EXPECT_EQ(last.type, kLast);
  EXPECT_EQ(last.field, 512U);
}

TEST(TransferTest, AFullLastBlockMayBeFollowedByAnEmptyOne) {
  QuorinOptions options;
  options.empty_last_block = true;
  Session session(options, OneFile(1024));
  EXPECT_EQ(SeenBlock(session.StartTransfer()).type, kData);
  EXPECT_EQ(SeenBlock(session.NextBlock(kAck)).type, kData);
  const Bytes last = session.NextBlock(kAck);
  EXPECT_EQ(SeenBlock(last).type, kLast);
  EXPECT_EQ(SeenBlock(last).field, 0U);
  EXPECT_EQ(std::count(last.begin() + 3, last.begin() + 515, 0), 512);
}

TEST(TransferTest, TheEmptyLastBlockOnlyFollowsAFullOne) {
  QuorinOptions options;
  options.empty_last_block = true;
  Session session(options, OneFile(1023));
  session.StartTransfer();
  const SeenBlock last(session.NextBlock(kAck));
  EXPECT_EQ(last.type, kLast);
  EXPECT_EQ(last.field, 511U);
}

TEST(TransferTest, AnEmptyFileIsOneEmptyLastBlock) {
  Session session({}, OneFile(0));
  const SeenBlock block(session.StartTransfer());
  EXPECT_EQ(block.type, kLast);
  EXPECT_EQ(block.field, 0U);
}

TEST(TransferTest, TheHostChoosesTheBlockLength) {
  Session session;
  session.Ask("%1%get,\"A0101.log\":{500,100}\r\n");
  EXPECT_EQ(session.Ask(kNak).size(), 106U);
}

TEST(TransferTest, ATransferCanBeDoneTwice) {
  Session session;
  const Bytes first = session.StartTransfer();
  session.NextBlock(kAck);
  session.Ask("#");
  EXPECT_EQ(session.StartTransfer(), first);
}

TEST(TransferTest, ANewHostGetsThroughWithItsOpeningLines) {
  Session session;
  session.StartTransfer();
  EXPECT_EQ(session.Ask("\n#OFF#\r\ndm\r\n%1%\r\n"), "RE003%1%\r\n");
  EXPECT_FALSE(session.receiver.in_transfer());
}

TEST(TransferTest, TheHashThatEndsATransferMayOpenTheEchoCommand) {
  QuorinOptions options;
  options.echo = true;
  Session session(options);
  session.StartTransfer();
  EXPECT_EQ(session.Ask("#OFF#\r\n"), "OFF#\r\n");
  EXPECT_FALSE(session.receiver.echoes());
}

class AbandonTest : public testing::TestWithParam<std::string> {};

TEST_P(AbandonTest, ACommandEndsTheTransferAndIsCarriedOut) {
  Session session;
  session.StartTransfer();
  session.Say(GetParam());
  EXPECT_EQ(session.Ask("%7%print,/par/rcvid\r\n"), "RE00A%7%QR00421\r\n");
  EXPECT_FALSE(session.receiver.in_transfer());
}

INSTANTIATE_TEST_SUITE_P(Ways, AbandonTest, testing::Values("", "dm\r\n", "#", "#\n"));

TEST(TransferTest, NoiseIsNoAnswer) {
  Session session;
  const Bytes first = session.StartTransfer();
  EXPECT_EQ(session.Ask("\x01\xFE"), "");
  EXPECT_TRUE(session.receiver.in_transfer());
  EXPECT_EQ(session.NextBlock(kNak), first);
}

TEST(TransferTest, AnEmptyLineDoesNotDisturb) {
  Session session;
  const Bytes first = session.StartTransfer();
  EXPECT_EQ(session.Ask("\r\n"), "");
  EXPECT_EQ(session.NextBlock(kNak), first);
}

}  // namespace
}  // namespace sim
