#include "platform/little_endian.h"

#include <gtest/gtest.h>

#include <array>

namespace {

TEST(ReadUint16, TakesTheLowestByteFirst) {
  constexpr std::array<uint8_t, 4> kBytes = {0x01, 0x34, 0xF2, 0x05};
  EXPECT_EQ(rcvlink::ReadUint16(kBytes, 1), 0xF234);
  EXPECT_EQ(rcvlink::ReadUint16(kBytes, 2), 0x05F2);
}

}  // namespace
