#include "quorin/block_crc.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <string_view>

using rcvlink::BlockCrc;

namespace {

std::span<const uint8_t> Bytes(std::string_view text) {
  return {reinterpret_cast<const uint8_t*>(text.data()), text.size()};
}

// The check value of CRC-16/XMODEM.
TEST(BlockCrc, HasTheCheckValueOfXmodem) { EXPECT_EQ(BlockCrc(Bytes("123456789"), 0), 0x31C3); }

TEST(BlockCrc, OfNothingIsTheStart) { EXPECT_EQ(BlockCrc({}, 0xBEEF), 0xBEEF); }

TEST(BlockCrc, CarriesOn) {
  EXPECT_EQ(BlockCrc(Bytes("6789"), BlockCrc(Bytes("12345"), 0)), 0x31C3);
}

}  // namespace
