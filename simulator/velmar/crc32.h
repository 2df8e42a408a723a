// The CRC of Velmar logs.
#ifndef SIMULATOR_VELMAR_CRC32_H_
#define SIMULATOR_VELMAR_CRC32_H_

#include <cstdint>
#include <span>

namespace sim {

// The CRC-32 of a log: reflected, from 0, nothing inverted at the end.
uint32_t Crc32(std::span<const uint8_t> bytes);

}  // namespace sim

#endif  // SIMULATOR_VELMAR_CRC32_H_
