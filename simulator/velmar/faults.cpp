#include "simulator/velmar/faults.h"

#include "simulator/velmar/command_reader.h"

namespace sim {

std::optional<VelmarChunkFault> TakeChunkFault(VelmarFaults& faults,
                                               VelmarChunkFaultKind kind,
                                               uint64_t chunk) {
  for (VelmarChunkFault& fault : faults.chunks) {
    if (fault.kind == kind && fault.chunk == chunk && TakeOccurrence(fault.times)) {
      return fault;
    }
  }
  return std::nullopt;
}

std::optional<VelmarReplyFault> TakeReplyFault(VelmarFaults& faults,
                                               VelmarReplyFaultKind kind,
                                               std::string_view command) {
  for (VelmarReplyFault& fault : faults.replies) {
    const bool concerned =
        fault.command == kAnyVelmarCommand || StartsWithWord(command, fault.command);
    if (fault.kind == kind && concerned && TakeOccurrence(fault.times)) {
      return fault;
    }
  }
  return std::nullopt;
}

uint64_t ToldSize(const VelmarFaults& faults, std::string_view file, uint64_t size) {
  for (const SizeLie& lie : faults.sizes) {
    if (lie.file == file) {
      return lie.size;
    }
  }
  return size;
}

std::string_view FaultName(VelmarChunkFaultKind kind) {
  switch (kind) {
    case VelmarChunkFaultKind::kDamagedCrc:
      return "crc";
    case VelmarChunkFaultKind::kFlippedBit:
      return "bit";
    case VelmarChunkFaultKind::kForgedBit:
      return "forged";
    case VelmarChunkFaultKind::kWrongSync:
      return "sync";
    case VelmarChunkFaultKind::kMessageLength:
      return "message-length";
    case VelmarChunkFaultKind::kBodyLength:
      return "body-length";
    case VelmarChunkFaultKind::kHeaderLength:
      return "header-length";
    case VelmarChunkFaultKind::kSilence:
      return "silence";
  }
  return "unknown";
}

}  // namespace sim
