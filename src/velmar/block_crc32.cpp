#include "velmar/block_crc32.h"

#include <array>
#include <span>

namespace VelmarCommands {
namespace {

constexpr uint32_t kPolynomial = 0xEDB88320;
constexpr int kBitsOfByte = 8;

using Table = std::array<uint32_t, 256>;

constexpr Table MakeTable() {
  Table table{};
  for (uint32_t byte = 0; byte < table.size(); ++byte) {
    uint32_t crc = byte;
    for (int bit = 0; bit < kBitsOfByte; ++bit) {
      const bool low = (crc & 1) != 0;
      crc >>= 1;
      if (low) crc ^= kPolynomial;
    }
    table[byte] = crc;
  }
  return table;
}

constexpr Table kTable = MakeTable();

}  // namespace

uint32_t CalculateBlockCrc32(const void* bytes, size_t length) {
  uint32_t crc = 0;
  for (const uint8_t byte : std::span(static_cast<const uint8_t*>(bytes), length)) {
    crc = (crc >> kBitsOfByte) ^ kTable[static_cast<uint8_t>(crc ^ byte)];
  }
  return crc;
}

}  // namespace VelmarCommands
