// The checksum of Quorin blocks: CRC-16/XMODEM (polynomial 0x1021, not reflected, no final
// exclusive-or). It goes on from block to block, so that each one checks the whole file so far.
#ifndef RCVLINK_QUORIN_BLOCK_CRC_H_
#define RCVLINK_QUORIN_BLOCK_CRC_H_

#include <cstdint>
#include <span>

namespace rcvlink {

// The checksum after these bytes, starting from `crc` (0 before the first block).
uint16_t BlockCrc(std::span<const uint8_t> bytes, uint16_t crc);

}  // namespace rcvlink

#endif  // RCVLINK_QUORIN_BLOCK_CRC_H_
