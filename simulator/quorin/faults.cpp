#include "simulator/quorin/faults.h"

namespace sim {
namespace {

bool Concerns(const BlockFault& fault, uint32_t block, bool last) {
  if (fault.kind == BlockFaultKind::kNegativeLength) {
    return last;
  }
  return fault.kind != BlockFaultKind::kSilence && fault.block == block;
}

bool Concerns(const ReplyFault& fault, std::string_view command, bool answered) {
  if (fault.command == kAnyCommand) {
    return answered;
  }
  if (command.empty()) {
    return answered && fault.command == kPingCommand;
  }
  return command.starts_with(fault.command);
}

}  // namespace

std::optional<BlockFaultKind> TakeBlockFault(Faults& faults, uint32_t block, bool last) {
  for (BlockFault& fault : faults.blocks) {
    if (Concerns(fault, block, last) && TakeOccurrence(fault.times)) {
      return fault.kind;
    }
  }
  return std::nullopt;
}

uint32_t TakeBlockSilence(Faults& faults, uint32_t block) {
  for (BlockFault& fault : faults.blocks) {
    if (fault.kind == BlockFaultKind::kSilence && fault.block == block &&
        TakeOccurrence(fault.times)) {
      return fault.silence_ms;
    }
  }
  return 0;
}

std::optional<ReplyFault> TakeReplyFault(Faults& faults,
                                         ReplyFaultKind kind,
                                         std::string_view command,
                                         bool answered) {
  for (ReplyFault& fault : faults.replies) {
    if (fault.kind == kind && Concerns(fault, command, answered) && TakeOccurrence(fault.times)) {
      return fault;
    }
  }
  return std::nullopt;
}

std::string_view FaultName(BlockFaultKind kind) {
  switch (kind) {
    case BlockFaultKind::kDamagedCrc:
      return "crc";
    case BlockFaultKind::kUnchainedCrc:
      return "unchained";
    case BlockFaultKind::kWrongSequence:
      return "sequence";
    case BlockFaultKind::kWrongEnd:
      return "end";
    case BlockFaultKind::kLostByte:
      return "lost";
    case BlockFaultKind::kUnknownType:
      return "type";
    case BlockFaultKind::kNegativeLength:
      return "length";
    case BlockFaultKind::kEndBlock:
      return "end-block";
    case BlockFaultKind::kEndByte:
      return "end-byte";
    case BlockFaultKind::kSilence:
      return "silence";
  }
  return "unknown";
}

}  // namespace sim
