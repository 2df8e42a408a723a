#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <numeric>

#include "tests/simulator/session.h"

namespace sim {
namespace {

// Block 1 of 1100 test bytes: what a host that knows nothing of faults expects.
constexpr unsigned kGoodCrc = 0x8870;
constexpr unsigned kCrcForItselfAlone = 0xF97D;

QuorinOptions WithFault(BlockFaultKind kind, uint32_t times = kOnce) {
  QuorinOptions options;
  options.faults.blocks = {{kind, 1, times, 0}};
  return options;
}

// Block 1 as it is without any fault.
Bytes GoodBlock() {
  Session session;
  session.StartTransfer();
  return session.NextBlock(kAck);
}

// Counts the positions at which two blocks of one size differ.
long Differences(const Bytes& left, const Bytes& right) {
  return std::inner_product(
      left.begin(), left.end(), right.begin(), 0L, std::plus<>(), std::not_equal_to<>());
}

TEST(BlockFaultsTest, ADamagedCrcIsAllThatIsWrong) {
  Session session(WithFault(BlockFaultKind::kDamagedCrc));
  session.StartTransfer();
  Bytes block = session.NextBlock(kAck);
  EXPECT_NE(SeenBlock(block).crc, kGoodCrc);
  const Bytes good = GoodBlock();
  EXPECT_TRUE(std::equal(block.begin(), block.begin() + 515, good.begin()));
  EXPECT_EQ(block.back(), 0x03);
  EXPECT_EQ(session.NextBlock(kNak), good);
}

TEST(BlockFaultsTest, AnUnchainedCrcFitsTheBlockAlone) {
  Session session(WithFault(BlockFaultKind::kUnchainedCrc));
  session.StartTransfer();
  EXPECT_EQ(SeenBlock(session.NextBlock(kAck)).crc, kCrcForItselfAlone);
  EXPECT_EQ(session.NextBlock(kNak), GoodBlock());
}

TEST(BlockFaultsTest, AWrongSequenceNumberHasAFittingCrc) {
  Session session(WithFault(BlockFaultKind::kWrongSequence));
  session.StartTransfer();
  const SeenBlock block(session.NextBlock(kAck));
  EXPECT_EQ(block.type, 0x02U);
  EXPECT_EQ(block.field, 2U);
  EXPECT_NE(block.crc, kGoodCrc);
  EXPECT_EQ(session.NextBlock(kNak), GoodBlock());
}

TEST(BlockFaultsTest, AWrongEndByteIsAllThatIsWrong) {
  Session session(WithFault(BlockFaultKind::kWrongEnd));
  session.StartTransfer();
  const Bytes block = session.NextBlock(kAck);
  EXPECT_NE(block.back(), 0x03);
  EXPECT_EQ(Differences(block, GoodBlock()), 1);
  EXPECT_EQ(session.NextBlock(kNak), GoodBlock());
}

TEST(BlockFaultsTest, ALostByteMakesTheBlockShort) {
  Session session(WithFault(BlockFaultKind::kLostByte));
  session.StartTransfer();
  EXPECT_EQ(session.NextBlock(kAck).size(), kBlockSize - 1);
  EXPECT_EQ(session.NextBlock(kNak), GoodBlock());
}

TEST(BlockFaultsTest, AnUnknownTypeIsNoneOfTheThree) {
  Session session(WithFault(BlockFaultKind::kUnknownType));
  session.StartTransfer();
  const SeenBlock block(session.NextBlock(kAck));
  EXPECT_NE(block.type, 0x02U);
  EXPECT_NE(block.type, 0x04U);
  EXPECT_NE(block.type, 0x23U);
  EXPECT_EQ(block.field, 1U);
  EXPECT_EQ(session.NextBlock(kNak), GoodBlock());
}

TEST(BlockFaultsTest, ANegativeLengthComesInTheLastBlock) {
  Session session(WithFault(BlockFaultKind::kNegativeLength));
  session.StartTransfer();
  EXPECT_EQ(session.NextBlock(kAck), GoodBlock());
  EXPECT_EQ(SeenBlock(session.NextBlock(kAck)).field, 0xFFFFU);
  EXPECT_EQ(SeenBlock(session.NextBlock(kNak)).field, 76U);
}

TEST(BlockFaultsTest, AnEndBlockEndsTheTransfer) {
  Session session(WithFault(BlockFaultKind::kEndBlock));
  session.StartTransfer();
  const Bytes block = session.NextBlock(kAck);
  EXPECT_EQ(block.size(), kBlockSize);
  EXPECT_EQ(block.front(), '#');
  EXPECT_EQ(session.Ask(kNak), "");
  EXPECT_EQ(session.Ask("%2%\r\n"), "RE003%2%\r\n");
}

TEST(BlockFaultsTest, AnEndByteEndsTheTransfer) {
  Session session(WithFault(BlockFaultKind::kEndByte));
  session.StartTransfer();
  EXPECT_EQ(ToText(session.NextBlock(kAck)), "#");
  EXPECT_EQ(session.Ask(kNak), "");
  EXPECT_EQ(session.Ask("#%2%\r\n"), "RE003%2%\r\n");
}

TEST(BlockFaultsTest, AFaultHappensAsOftenAsAskedFor) {
  Session session(WithFault(BlockFaultKind::kDamagedCrc, 3));
  session.StartTransfer();
  EXPECT_NE(session.NextBlock(kAck), GoodBlock());
  EXPECT_NE(session.NextBlock(kNak), GoodBlock());
  EXPECT_NE(session.NextBlock(kNak), GoodBlock());
  EXPECT_EQ(session.NextBlock(kNak), GoodBlock());
}

TEST(BlockFaultsTest, AFaultMayHappenAlways) {
  Session session(WithFault(BlockFaultKind::kDamagedCrc, kAlways));
  session.StartTransfer();
  session.NextBlock(kAck);
  for (int i = 0; i < 50; ++i) {
    EXPECT_NE(session.NextBlock(kNak), GoodBlock());
  }
}

TEST(BlockFaultsTest, FaultsOfOneBlockComeOneAfterTheOther) {
  QuorinOptions options = WithFault(BlockFaultKind::kDamagedCrc);
  options.faults.blocks.push_back({BlockFaultKind::kLostByte, 1, kOnce, 0});
  Session session(options);
  session.StartTransfer();
  EXPECT_NE(SeenBlock(session.NextBlock(kAck)).crc, kGoodCrc);
  EXPECT_EQ(session.NextBlock(kNak).size(), kBlockSize - 1);
  EXPECT_EQ(session.NextBlock(kNak), GoodBlock());
}

TEST(BlockFaultsTest, NaksDuringSilenceAreIgnored) {
  QuorinOptions options;
  options.faults.blocks = {{BlockFaultKind::kSilence, 1, kOnce, 10'000}};
  Session session(options);
  session.StartTransfer();
  const uint64_t start_ms = session.port.Now();
  EXPECT_TRUE(session.NextBlock(kAck, 3000).empty());
  EXPECT_TRUE(session.NextBlock(kNak, 3000).empty());
  EXPECT_TRUE(session.NextBlock(kNak, 3000).empty());
  EXPECT_EQ(session.NextBlock(kNak, 3000), GoodBlock());
  EXPECT_EQ(session.port.Now() - start_ms, 10'000U);
  // The next block follows: no NAK has brought a second copy.
  EXPECT_EQ(SeenBlock(session.NextBlock(kAck)).type, 0x04U);
  EXPECT_EQ(session.Ask("#"), "");
}

TEST(BlockFaultsTest, TheEndIsHeardDuringSilence) {
  QuorinOptions options;
  options.faults.blocks = {{BlockFaultKind::kSilence, 1, kOnce, 10'000}};
  Session session(options);
  session.StartTransfer();
  EXPECT_TRUE(session.NextBlock(kAck, 3000).empty());
  EXPECT_EQ(session.Ask("#", 20'000), "");
  EXPECT_EQ(session.Ask("%2%\r\n"), "RE003%2%\r\n");
}

TEST(BlockFaultsTest, VanishingHappensWhenTheBlockHasBeenAnswered) {
  QuorinOptions options;
  options.faults.vanish_after_block = 1;
  Session session(options);
  session.StartTransfer();
  EXPECT_EQ(session.NextBlock(kAck), GoodBlock());
  EXPECT_FALSE(session.receiver.gone());
  EXPECT_TRUE(session.NextBlock(kAck).empty());
  EXPECT_TRUE(session.receiver.gone());
  EXPECT_EQ(session.Ask("%2%\r\n"), "");
}

}  // namespace
}  // namespace sim
