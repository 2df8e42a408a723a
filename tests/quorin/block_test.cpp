#include "quorin/block.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include "tests/support/block_stream.h"
#include "tests/support/content.h"

using rcvlink::Block;
using rcvlink::BlockType;
using rcvlink::kBlockLength;

namespace {

Block BlockOf(const std::string& bytes) {
  Block block;
  std::ranges::copy(bytes, block.data());
  return block;
}

Block LastBlock(uint16_t length) { return BlockOf(BlockStream::Make(0x04, length, "", 0)); }

TEST(QuorinBlock, IsOf518Bytes) { EXPECT_EQ(kBlockLength, 518U); }

TEST(QuorinBlock, HasItsFieldsInTheirPlaces) {
  const std::string payload = Content(512);
  const std::string bytes = BlockStream::Make(0x02, 0x1234, payload, 0xABCD);
  const Block block = BlockOf(bytes);
  EXPECT_EQ(block.Type(), BlockType::kData);
  EXPECT_EQ(block.Sequence(), 0x1234);
  EXPECT_EQ(std::string(block.Payload().begin(), block.Payload().end()), payload);
  EXPECT_EQ(block.Crc(),
            static_cast<uint8_t>(bytes[515]) | (static_cast<uint8_t>(bytes[516]) << 8));
  EXPECT_TRUE(block.HasEndByte());
}

TEST(QuorinBlock, KnowsItsThreeTypes) {
  EXPECT_EQ(BlockOf(BlockStream::Make(0x02, 0, "", 0)).Type(), BlockType::kData);
  EXPECT_EQ(BlockOf(BlockStream::Make(0x04, 0, "", 0)).Type(), BlockType::kLast);
  EXPECT_EQ(BlockOf(BlockStream::Make(0x23, 0, "", 0)).Type(), BlockType::kEnd);
}

TEST(QuorinBlock, NumbersUpTo65535) {
  EXPECT_EQ(BlockOf(BlockStream::Make(0x02, 0xFFFF, "", 0)).Sequence(), 0xFFFF);
}

TEST(QuorinBlock, OfDataCountsWhole) {
  EXPECT_EQ(BlockOf(BlockStream::Make(0x02, 5, "", 0)).PayloadLength(), 512U);
  EXPECT_EQ(BlockOf(BlockStream::Make(0x02, 0xFFFF, "", 0)).PayloadLength(), 512U);
}

TEST(QuorinBlock, ThatIsTheLastHasItsLength) {
  EXPECT_EQ(LastBlock(0).PayloadLength(), 0U);
  EXPECT_EQ(LastBlock(1).PayloadLength(), 1U);
  EXPECT_EQ(LastBlock(0x0102).PayloadLength(), 258U);
  EXPECT_EQ(LastBlock(512).PayloadLength(), 512U);
}

TEST(QuorinBlock, ThatIsTheLastHasNoNegativeOrTooLargeLength) {
  EXPECT_FALSE(LastBlock(513).PayloadLength());
  EXPECT_FALSE(LastBlock(0x7FFF).PayloadLength());
  EXPECT_FALSE(LastBlock(0x8000).PayloadLength());
  EXPECT_FALSE(LastBlock(0xFFFF).PayloadLength());
}

TEST(QuorinBlock, HasAnEndByteOfThree) {
  std::string bytes = BlockStream::Make(0x02, 0, "", 0);
  bytes.back() = '\x02';
  EXPECT_FALSE(BlockOf(bytes).HasEndByte());
}

TEST(QuorinBlock, IsChainedToTheChecksumBefore) {
  const Block block = BlockOf(BlockStream::Make(0x02, 1, Content(512), 0xABCD));
  EXPECT_TRUE(block.IsChainedTo(0xABCD));
  EXPECT_FALSE(block.IsChainedTo(0));
  EXPECT_FALSE(block.IsChainedTo(0xABCC));
}

// Every byte of the header and the payload counts, and both of the checksum; the end byte does not.
TEST(QuorinBlock, FailsItsChecksumAfterAnyDamage) {
  const std::string good = BlockStream::Make(0x02, 1, Content(512), 0xABCD);
  for (size_t i = 0; i < good.size() - 1; ++i) {
    std::string damaged = good;
    damaged[i] = static_cast<char>(damaged[i] ^ 0x10);
    EXPECT_FALSE(BlockOf(damaged).IsChainedTo(0xABCD)) << "byte " << i;
  }
  std::string other_end = good;
  other_end.back() = '?';
  EXPECT_TRUE(BlockOf(other_end).IsChainedTo(0xABCD));
}

}  // namespace
