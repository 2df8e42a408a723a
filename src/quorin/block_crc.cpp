#include "quorin/block_crc.h"

#include <array>
#include <cstddef>

namespace rcvlink {
namespace {

constexpr uint16_t kPolynomial = 0x1021;
constexpr uint16_t kTopBit = 0x8000;
constexpr int kBitsOfByte = 8;

using Table = std::array<uint16_t, 256>;

constexpr Table MakeTable() {
  Table table{};
  for (size_t i = 0; i < table.size(); ++i) {
    auto entry = static_cast<uint16_t>(i << kBitsOfByte);
    for (int bit = 0; bit < kBitsOfByte; ++bit) {
      const bool top = (entry & kTopBit) != 0;
      entry = static_cast<uint16_t>(entry << 1);
      if (top) entry ^= kPolynomial;
    }
    table[i] = entry;
  }
  return table;
}

constexpr Table kTable = MakeTable();

}  // namespace

uint16_t BlockCrc(std::span<const uint8_t> bytes, uint16_t crc) {
  for (const uint8_t byte : bytes) {
    const auto index = static_cast<uint8_t>((crc >> kBitsOfByte) ^ byte);
    crc = static_cast<uint16_t>(kTable[index] ^ (crc << kBitsOfByte));
  }
  return crc;
}

}  // namespace rcvlink
