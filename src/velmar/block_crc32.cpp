#include "velmar/block_crc32.h"

#include <span>

namespace VelmarCommands {

uint32_t CalculateBlockCrc32(const void* bytes, size_t length) {
  constexpr uint32_t kPolynomial = 0xEDB88320;
  constexpr uint32_t kByteMask = 0xFF;
  constexpr int kBitsOfByte = 8;
  uint32_t crc = 0;
  for (const uint8_t byte : std::span(static_cast<const uint8_t*>(bytes), length)) {
    uint32_t remainder = (crc ^ byte) & kByteMask;
    for (int bit = 0; bit < kBitsOfByte; ++bit) {
      const bool low = (remainder & 1) != 0;
      remainder >>= 1;
      if (low) remainder ^= kPolynomial;
    }
    crc = (crc >> kBitsOfByte) ^ remainder;
  }
  return crc;
}

}  // namespace VelmarCommands
