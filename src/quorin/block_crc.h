// The checksum of Quorin blocks: CRC-16/XMODEM's polynomial (0x1021, not reflected, no final
// exclusive-or), carried on from block to block, so that it checks the whole stream so far.
#ifndef RCVLINK_QUORIN_BLOCK_CRC_H_
#define RCVLINK_QUORIN_BLOCK_CRC_H_

#include <cstdint>
#include <span>

// The register after these bytes, starting from `crc` (0 ahead of the first block).
uint16_t BlockCrc(std::span<const uint8_t> bytes, uint16_t crc);

#endif  // RCVLINK_QUORIN_BLOCK_CRC_H_
