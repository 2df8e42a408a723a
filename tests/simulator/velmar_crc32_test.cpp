#include "simulator/velmar/crc32.h"

#include <gtest/gtest.h>

#include "simulator/bytes.h"
#include "tests/simulator/velmar_session.h"

namespace sim {
namespace {

TEST(VelmarCrc32Test, GivesTheKnownCheckValue) {
  const Bytes digits = ToBytes("123456789");
  EXPECT_EQ(Crc32(digits), 0x2DFD2D88U);
  EXPECT_EQ(HostCrc32(digits), 0x2DFD2D88U);
}

TEST(VelmarCrc32Test, NothingAndLeadingZerosGiveZero) {
  EXPECT_EQ(Crc32({}), 0U);
  EXPECT_EQ(Crc32(Bytes(7)), 0U);
}

TEST(VelmarCrc32Test, EveryByteCountsAsBitByBit) {
  const Bytes bytes = TestPayload(1000);
  EXPECT_EQ(Crc32(bytes), HostCrc32(bytes));
}

}  // namespace
}  // namespace sim
