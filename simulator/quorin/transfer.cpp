#include "simulator/quorin/transfer.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <span>
#include <utility>

#include "simulator/quorin/crc16.h"

namespace sim {
namespace {

constexpr uint8_t kDataBlock = 0x02;
constexpr uint8_t kLastBlock = 0x04;
constexpr uint8_t kStrangeBlock = 0x7E;
constexpr uint8_t kEndOfBlock = 0x03;
constexpr uint8_t kStrangeEnd = 0x33;
constexpr size_t kHeaderLength = 3;
constexpr size_t kTrailerLength = 3;
constexpr uint16_t kCrcDamage = 0x0180;  // Shows in both bytes of the CRC.
constexpr uint16_t kMinusOne = 0xFFFF;

void AppendLittleEndian(Bytes& bytes, uint16_t value) {
  bytes.push_back(static_cast<uint8_t>(value & 0xFF));
  bytes.push_back(static_cast<uint8_t>(value >> 8));
}

std::string Hex(const char* format, unsigned value) {
  std::array<char, 16> text{};
  std::snprintf(text.data(), text.size(), format, value);
  return text.data();
}

}  // namespace

Transfer::Transfer(const FileStore& files, FileEntry file, size_t block_length, bool empty_last)
    : files_(files), file_(std::move(file)), block_length_(block_length), empty_last_(empty_last) {}

bool Transfer::at_last_block() const {
  const uint64_t left = file_.size - offset_;
  return empty_last_ ? left < block_length_ : left <= block_length_;
}

size_t Transfer::PayloadLength() const {
  return static_cast<size_t>(std::min<uint64_t>(file_.size - offset_, block_length_));
}

Block Transfer::Assemble(uint8_t type, uint16_t field, const Bytes& payload, uint16_t chain) const {
  Block block{type, field};
  block.wire.reserve(kHeaderLength + block_length_ + kTrailerLength);
  block.wire.push_back(type);
  AppendLittleEndian(block.wire, field);
  block.wire.insert(block.wire.end(), payload.begin(), payload.end());
  block.wire.resize(kHeaderLength + block_length_);
  block.crc = Crc16(block.wire, chain);
  AppendLittleEndian(block.wire, block.crc);
  block.wire.push_back(kEndOfBlock);
  return block;
}

std::optional<Block> Transfer::CurrentBlock() const {
  const size_t length = PayloadLength();
  const std::optional<Bytes> payload = files_.Read(file_.name, offset_, length);
  if (!payload) {
    return std::nullopt;
  }
  if (at_last_block()) {
    return Assemble(kLastBlock, static_cast<uint16_t>(length), *payload, chain_);
  }
  return Assemble(kDataBlock, static_cast<uint16_t>(number_), *payload, chain_);
}

void Transfer::Accept(uint16_t crc) {
  chain_ = crc;
  offset_ += PayloadLength();
  ++number_;
}

Block Transfer::Spoil(const Block& block, BlockFaultKind fault) const {
  const auto begin = block.wire.begin() + static_cast<std::ptrdiff_t>(kHeaderLength);
  const Bytes payload(begin, begin + static_cast<std::ptrdiff_t>(block_length_));
  switch (fault) {
    case BlockFaultKind::kWrongSequence:
      return Assemble(block.type, static_cast<uint16_t>(block.field + 1), payload, chain_);
    case BlockFaultKind::kUnknownType:
      return Assemble(kStrangeBlock, block.field, payload, chain_);
    case BlockFaultKind::kNegativeLength:
      return Assemble(kLastBlock, kMinusOne, payload, chain_);
    case BlockFaultKind::kUnchainedCrc:
      return Assemble(block.type, block.field, payload, 0);
    case BlockFaultKind::kEndBlock:
      return EndBlock();
    default:
      break;
  }

  Block spoiled = block;
  if (fault == BlockFaultKind::kDamagedCrc) {
    spoiled.crc = static_cast<uint16_t>(block.crc ^ kCrcDamage);
    spoiled.wire.resize(kHeaderLength + block_length_);
    AppendLittleEndian(spoiled.wire, spoiled.crc);
    spoiled.wire.push_back(kEndOfBlock);
  } else if (fault == BlockFaultKind::kWrongEnd) {
    spoiled.wire.back() = kStrangeEnd;
  } else if (fault == BlockFaultKind::kLostByte) {
    spoiled.wire.erase(spoiled.wire.begin() +
                       static_cast<std::ptrdiff_t>(kHeaderLength + block_length_ / 2));
  } else if (fault == BlockFaultKind::kEndByte) {
    spoiled = Block{kTransferEnd, 0, {kTransferEnd}};
  }
  return spoiled;
}

Block Transfer::EndBlock() const { return Assemble(kTransferEnd, 0, {}, chain_); }

std::string DescribeBlock(const Block& block, std::optional<BlockFaultKind> fault) {
  std::string text = "block" + Hex(" type=%02X", block.type);
  text += (block.type == kLastBlock ? " len=" : " seq=") + std::to_string(block.field);
  text += " bytes=" + std::to_string(block.wire.size()) + Hex(" crc=%04X", block.crc);
  if (fault) {
    text += " fault=" + std::string(FaultName(*fault));
  }
  return text;
}

}  // namespace sim
