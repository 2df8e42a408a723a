// The checksum of Velmar logs and commands: the block CRC-32 of NovAtel's OEM language (polynomial
// 0xEDB88320, which is that of CRC-32 reflected; start 0; no final exclusive-or).
#ifndef RCVLINK_VELMAR_BLOCK_CRC32_H_
#define RCVLINK_VELMAR_BLOCK_CRC32_H_

#include <cstddef>
#include <cstdint>

namespace VelmarCommands {

uint32_t CalculateBlockCrc32(const void* bytes, size_t length);

}  // namespace VelmarCommands

#endif  // RCVLINK_VELMAR_BLOCK_CRC32_H_
