// A file as the blocks of a Quorin transfer.
#ifndef SIMULATOR_QUORIN_TRANSFER_H_
#define SIMULATOR_QUORIN_TRANSFER_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "simulator/bytes.h"
#include "simulator/files.h"
#include "simulator/quorin/faults.h"

namespace sim {

inline constexpr uint8_t kTransferAck = 0x06;
inline constexpr uint8_t kTransferNak = 0x15;
inline constexpr uint8_t kTransferEnd = '#';

// A block as it goes over the wire: type, 16-bit field, payload, CRC, end byte.
struct Block {
  uint8_t type = 0;
  // The sequence number of a data block; how many bytes of the payload count in the last block.
  uint16_t field = 0;
  Bytes wire = {};
  uint16_t crc = 0;
};

// The sending of one file, block by block. Each block's CRC goes on from that of the last block that
// was accepted, so a block that is sent again has the same bytes.
class Transfer {
 public:
  // With `empty_last`, a file that fills its last block exactly is followed by a last block of
  // length 0. `files` must outlive the transfer.
  Transfer(const FileStore& files, FileEntry file, size_t block_length, bool empty_last);

  // The number of the current block, from 0.
  uint32_t block_number() const { return number_; }
  bool at_last_block() const;

  // The current block; nothing if the file can no longer be read.
  std::optional<Block> CurrentBlock() const;

  // The host has accepted the current block, whose CRC was `crc`.
  void Accept(uint16_t crc);

  // Makes the bad block that the fault asks for out of a good one.
  Block Spoil(const Block& block, BlockFaultKind fault) const;

  // The block with which the receiver ends the transfer.
  Block EndBlock() const;

 private:
  size_t PayloadLength() const;
  Block Assemble(uint8_t type, uint16_t field, const Bytes& payload, uint16_t chain) const;

  const FileStore& files_;
  FileEntry file_;
  size_t block_length_;
  bool empty_last_;
  uint64_t offset_ = 0;
  uint32_t number_ = 0;
  uint16_t chain_ = 0;
};

// What a transcript says about a block.
std::string DescribeBlock(const Block& block, std::optional<BlockFaultKind> fault);

}  // namespace sim

#endif  // SIMULATOR_QUORIN_TRANSFER_H_
