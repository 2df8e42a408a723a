#include "simulator/velmar/crc32.h"

#include <array>
#include <cstddef>

namespace sim {
namespace {

constexpr uint32_t kPolynomial = 0xEDB88320;  // 0x04C11DB7 with its bits mirrored.
constexpr int kBitsPerByte = 8;

constexpr std::array<uint32_t, 256> MakeTable() {
  std::array<uint32_t, 256> table{};
  for (uint32_t i = 0; i < table.size(); ++i) {
    uint32_t remainder = i;
    for (int bit = 0; bit < kBitsPerByte; ++bit) {
      remainder = (remainder & 1) != 0 ? (remainder >> 1) ^ kPolynomial : remainder >> 1;
    }
    table[i] = remainder;
  }
  return table;
}

constexpr std::array<uint32_t, 256> kTable = MakeTable();

}  // namespace

uint32_t Crc32(std::span<const uint8_t> bytes) {
  uint32_t crc = 0;
  for (const uint8_t byte : bytes) {
    crc = (crc >> kBitsPerByte) ^ kTable[(crc ^ byte) & 0xFF];
  }
  return crc;
}

}  // namespace sim
