#include "velmar/block_crc32.h"

#include <gtest/gtest.h>

namespace {

using VelmarCommands::CalculateBlockCrc32;

TEST(BlockCrc32, OfTheCheckDigits) { EXPECT_EQ(CalculateBlockCrc32("123456789", 9), 0x2DFD2D88u); }

TEST(BlockCrc32, OfNothing) { EXPECT_EQ(CalculateBlockCrc32("", 0), 0u); }

}  // namespace
