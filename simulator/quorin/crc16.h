// The CRC of Quorin blocks.
#ifndef SIMULATOR_QUORIN_CRC16_H_
#define SIMULATOR_QUORIN_CRC16_H_

#include <cstdint>
#include <span>

namespace sim {

// CRC-16 of polynomial 0x1021, most significant bit first, nothing inverted. It goes on from
// `start`.
uint16_t Crc16(std::span<const uint8_t> bytes, uint16_t start);

}  // namespace sim

#endif  // SIMULATOR_QUORIN_CRC16_H_
