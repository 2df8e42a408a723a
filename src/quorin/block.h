// One block of a Quorin download as it is on the wire:
//
//   offset  size
//   0       1     type: 0x02 data, 0x04 last, 0x23 the receiver ends the transfer
//   1       2     data: sequence number; last: payload length (signed). Little-endian.
//   3       512   payload; a last block's is padded to its full length
//   515     2     checksum of the 515 bytes before, carried on from the previous block
//   517     1     0x03
//
// The host answers each block with one control byte.
#ifndef RCVLINK_QUORIN_BLOCK_H_
#define RCVLINK_QUORIN_BLOCK_H_

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

#include "platform/little_endian.h"

namespace rcvlink {

constexpr uint8_t kAck = 0x06;            // accepted, send the next
constexpr uint8_t kNak = 0x15;            // start; or send the current block again
constexpr uint8_t kEndOfTransfer = 0x23;  // '#'

constexpr size_t kBlockPayload = 512;
constexpr size_t kBlockHeader = 3;
constexpr size_t kBlockTrailer = 3;
constexpr size_t kBlockLength = kBlockHeader + kBlockPayload + kBlockTrailer;

enum class BlockType : uint8_t { kData = 0x02, kLast = 0x04, kEnd = kEndOfTransfer };

class Block {
 public:
  uint8_t* data() { return bytes_.data(); }

  BlockType Type() const { return static_cast<BlockType>(bytes_[0]); }
  uint16_t Sequence() const { return Word(1); }
  // How many bytes of the payload belong to the file. None when a last block gives a negative
  // length, or more than a block holds.
  std::optional<size_t> PayloadLength() const;
  std::span<const uint8_t> Payload() const { return {bytes_.data() + kBlockHeader, kBlockPayload}; }

  uint16_t Crc() const { return Word(kBlockHeader + kBlockPayload); }
  bool HasEndByte() const;
  // Whether the checksum is right when it goes on from that of the block accepted before.
  bool IsChainedTo(uint16_t previous_crc) const;

 private:
  uint16_t Word(size_t offset) const { return rcvlink::ReadUint16(bytes_, offset); }

  std::array<uint8_t, kBlockLength> bytes_{};
};

}  // namespace rcvlink

#endif  // RCVLINK_QUORIN_BLOCK_H_
