#include "quorin/block_crc.h"

#include <array>
#include <cstddef>

namespace rcvlink {
namespace {

constexpr uint16_t kPolynomial = 0x1021;
constexpr uint16_t kTopBit = 0x8000;
constexpr int kBitsOfByte = 8;

// Eight bytes are taken in one step. kTables[n][b] is what the byte b adds to the checksum when n more
// bytes of the step follow it.
constexpr size_t kStep = 8;
using Tables = std::array<std::array<uint16_t, 256>, kStep>;

constexpr uint16_t AfterZeroByte(uint16_t crc) {
  for (int bit = 0; bit < kBitsOfByte; ++bit) {
    const bool top = (crc & kTopBit) != 0;
    crc = static_cast<uint16_t>(crc << 1);
    if (top) crc ^= kPolynomial;
  }
  return crc;
}

constexpr Tables MakeTables() {
  Tables tables{};
  for (size_t byte = 0; byte < tables[0].size(); ++byte) {
    auto crc = static_cast<uint16_t>(byte << kBitsOfByte);
    for (auto& table : tables) table[byte] = crc = AfterZeroByte(crc);
  }
  return tables;
}

constexpr Tables kTables = MakeTables();

}  // namespace

uint16_t BlockCrc(std::span<const uint8_t> bytes, uint16_t crc) {
  while (bytes.size() >= kStep) {
    // The checksum so far has two bytes. They are added to the first two of the step.
    const auto first = static_cast<uint8_t>(bytes[0] ^ (crc >> kBitsOfByte));
    const auto second = static_cast<uint8_t>(bytes[1] ^ crc);
    crc = kTables[kStep - 1][first] ^ kTables[kStep - 2][second];
    for (size_t i = 2; i < kStep; ++i) crc ^= kTables[kStep - 1 - i][bytes[i]];
    bytes = bytes.subspan(kStep);
  }
  for (const uint8_t byte : bytes) {
    const auto index = static_cast<uint8_t>((crc >> kBitsOfByte) ^ byte);
    crc = static_cast<uint16_t>(kTables[0][index] ^ (crc << kBitsOfByte));
  }
  return crc;
}

}  // namespace rcvlink
