// Numbers whose lowest byte comes first, as receivers and USB devices send them.
#ifndef RCVLINK_PLATFORM_LITTLE_ENDIAN_H_
#define RCVLINK_PLATFORM_LITTLE_ENDIAN_H_

#include <cstddef>
#include <cstdint>
#include <span>

namespace rcvlink {

// The 16 bits at an offset. The caller knows that two bytes are there.
constexpr uint16_t ReadUint16(std::span<const uint8_t> bytes, size_t offset) {
  constexpr int kBitsOfByte = 8;
  return static_cast<uint16_t>(bytes[offset] | (bytes[offset + 1] << kBitsOfByte));
}

}  // namespace rcvlink

#endif  // RCVLINK_PLATFORM_LITTLE_ENDIAN_H_
