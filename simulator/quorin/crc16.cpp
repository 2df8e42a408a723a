#include "simulator/quorin/crc16.h"

namespace sim {
namespace {

constexpr uint32_t kPolynomial = 0x1021;
constexpr uint32_t kTopBit = 0x8000;
constexpr int kBitsPerByte = 8;

}  // namespace

uint16_t Crc16(std::span<const uint8_t> bytes, uint16_t start) {
  uint32_t remainder = start;
  for (const uint8_t byte : bytes) {
    remainder ^= static_cast<uint32_t>(byte) << kBitsPerByte;
    for (int bit = 0; bit < kBitsPerByte; ++bit) {
      const bool carry = (remainder & kTopBit) != 0;
      remainder <<= 1;
      if (carry) {
        remainder ^= kPolynomial;
      }
    }
  }
  return static_cast<uint16_t>(remainder);
}

}  // namespace sim
