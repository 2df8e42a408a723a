#include "quorin/block_crc.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <span>
#include <string_view>
#include <vector>

using rcvlink::BlockCrc;

namespace {

std::span<const uint8_t> Bytes(std::string_view text) {
  return {reinterpret_cast<const uint8_t*>(text.data()), text.size()};
}

// The check value of CRC-16/XMODEM.
TEST(BlockCrc, HasTheCheckValueOfXmodem) { EXPECT_EQ(BlockCrc(Bytes("123456789"), 0), 0x31C3); }

TEST(BlockCrc, OfNothingIsTheStart) { EXPECT_EQ(BlockCrc({}, 0xBEEF), 0xBEEF); }

// The definition of the checksum, bit by bit.
uint16_t BitByBit(std::span<const uint8_t> bytes) {
  unsigned crc = 0;
  for (const uint8_t byte : bytes) {
    crc ^= byte * 0x100U;
    for (int bit = 0; bit < 8; ++bit) crc = (crc * 2) ^ ((crc & 0x8000) != 0 ? 0x11021U : 0);
  }
  return static_cast<uint16_t>(crc);
}

// Eight bytes are one step, so what matters is how many are left at the end.
TEST(BlockCrc, IsThatOfItsDefinitionAtEveryLength) {
  std::vector<uint8_t> bytes;
  for (unsigned i = 0; i < 518; ++i) {
    EXPECT_EQ(BlockCrc(bytes, 0), BitByBit(bytes)) << i << " bytes";
    bytes.push_back(static_cast<uint8_t>(i * i + 11 * i + 7));
  }
}

TEST(BlockCrc, CarriesOn) {
  EXPECT_EQ(BlockCrc(Bytes("6789"), BlockCrc(Bytes("12345"), 0)), 0x31C3);
}

}  // namespace
