#include "simulator/quorin/crc16.h"

#include <gtest/gtest.h>

#include "simulator/bytes.h"

namespace sim {
namespace {

// 0x31C3 and 0x29B1 are the well-known check values of this polynomial for the two start values.
TEST(Crc16Test, GivesTheKnownCheckValues) {
  const Bytes digits = ToBytes("123456789");
  EXPECT_EQ(Crc16(digits, 0x0000), 0x31C3);
  EXPECT_EQ(Crc16(digits, 0xFFFF), 0x29B1);
}

TEST(Crc16Test, ChainedPartsGiveTheValueOfTheWhole) {
  EXPECT_EQ(Crc16(ToBytes("56789"), Crc16(ToBytes("1234"), 0)), 0x31C3);
}

TEST(Crc16Test, NoBytesGiveTheStartValue) { EXPECT_EQ(Crc16({}, 0xABCD), 0xABCD); }

}  // namespace
}  // namespace sim
