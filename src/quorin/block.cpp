#include "quorin/block.h"

#include "quorin/block_crc.h"

namespace rcvlink {
namespace {

constexpr uint8_t kEndOfBlock = 0x03;

}  // namespace

std::optional<size_t> Block::PayloadLength() const {
  if (Type() != BlockType::kLast) return kBlockPayload;
  const auto length = static_cast<int16_t>(Word(1));
  if (length < 0 || static_cast<size_t>(length) > kBlockPayload) return std::nullopt;
  return static_cast<size_t>(length);
}

bool Block::HasEndByte() const { return bytes_[kBlockLength - 1] == kEndOfBlock; }

bool Block::IsChainedTo(uint16_t previous_crc) const {
  const std::span<const uint8_t> checked(bytes_.data(), kBlockHeader + kBlockPayload);
  return BlockCrc(checked, previous_crc) == Crc();
}

}  // namespace rcvlink
