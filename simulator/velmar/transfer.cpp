#include "simulator/velmar/transfer.h"

#include <algorithm>
#include <limits>
#include <utility>

namespace sim {
namespace {

constexpr uint16_t kFileTransferId = 588;
constexpr size_t kCrcLength = 4;
constexpr uint8_t kOtherPort = 0xA0;

uint8_t PortAddress(const std::string& port_name) {
  if (port_name.size() == 4 && port_name.starts_with("COM") && port_name[3] >= '1' &&
      port_name[3] <= '3') {
    return static_cast<uint8_t>((port_name[3] - '0') * 0x20);
  }
  return kOtherPort;
}

}  // namespace

VelmarTransfer::VelmarTransfer(const FileStore& files,
                               FileEntry file,
                               size_t chunk_length,
                               const std::string& port_name)
    : files_(files),
      file_(std::move(file)),
      chunk_length_(chunk_length),
      port_address_(PortAddress(port_name)) {}

// How many chunks follow; the most that the field can hold where there are more.
uint16_t VelmarTransfer::Sequence(const VelmarFaults& faults) const {
  const uint64_t left = file_.size - offset_;
  const uint64_t chunks = (left + chunk_length_ - 1) / chunk_length_;
  const uint64_t following = chunks > 0 ? chunks - 1 : 0;
  if (following == 0) {
    return faults.endless_sequence ? 1 : 0;
  }
  return static_cast<uint16_t>(std::min<uint64_t>(following, std::numeric_limits<uint16_t>::max()));
}

std::optional<VelmarChunk> VelmarTransfer::CurrentChunk(VelmarFaults& faults) const {
  const auto length = static_cast<size_t>(std::min<uint64_t>(file_.size - offset_, chunk_length_));
  const std::optional<Bytes> data = files_.Read(file_.name, offset_, length);
  if (!data) {
    return std::nullopt;
  }
  BinaryLog log;
  log.message_id = kFileTransferId;
  log.port_address = port_address_;
  log.sequence = Sequence(faults);
  // A chunk begins with its offset and its length.
  AppendLittleEndian32(log.body, static_cast<uint32_t>(offset_));
  AppendLittleEndian32(log.body, static_cast<uint32_t>(length));
  log.body.insert(log.body.end(), data->begin(), data->end());

  std::string spoiled;
  const auto take = [&](VelmarChunkFaultKind kind) {
    const auto fault = TakeChunkFault(faults, kind, number_);
    if (fault) {
      spoiled += " fault=" + std::string(FaultName(kind));
    }
    return fault;
  };
  // An empty file has no bit to forge.
  if (length > 0 && take(VelmarChunkFaultKind::kForgedBit)) {
    log.body.back() ^= 1;
  }
  if (const auto fault = take(VelmarChunkFaultKind::kBodyLength)) {
    log.body.resize(fault->amount);
  }
  log.message_length = static_cast<uint16_t>(log.body.size());
  if (const auto fault = take(VelmarChunkFaultKind::kMessageLength)) {
    log.message_length = static_cast<uint16_t>(fault->amount);
  }
  if (const auto fault = take(VelmarChunkFaultKind::kHeaderLength)) {
    log.header_length = static_cast<uint8_t>(fault->amount);
  }
  log.wrong_sync = take(VelmarChunkFaultKind::kWrongSync).has_value();
  log.damaged_crc = take(VelmarChunkFaultKind::kDamagedCrc).has_value();

  VelmarChunk chunk;
  chunk.wire = FrameBinaryLog(log);
  if (take(VelmarChunkFaultKind::kFlippedBit)) {
    chunk.wire[chunk.wire.size() - kCrcLength - 1] ^= 1;
  }
  chunk.description = "log FILETRANSFERB seq=" + std::to_string(log.sequence) +
                      " offset=" + std::to_string(offset_) +
                      " len=" + std::to_string(log.message_length) +
                      " bytes=" + std::to_string(chunk.wire.size()) + spoiled;
  return chunk;
}

void VelmarTransfer::Next() {
  offset_ += chunk_length_;
  ++number_;
}

}  // namespace sim
