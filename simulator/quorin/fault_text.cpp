#include "simulator/quorin/fault_text.h"

#include <stdexcept>
#include <string>

namespace sim {
namespace {

bool HasAmount(ReplyFaultKind kind) {
  return kind == ReplyFaultKind::kSilence || kind == ReplyFaultKind::kGarbageBefore ||
         kind == ReplyFaultKind::kWrongLength;
}

int32_t ParseAmount(ReplyFaultKind kind, std::string_view text) {
  if (kind == ReplyFaultKind::kSilence) {
    return static_cast<int32_t>(ParseSeconds(text));
  }
  const auto bytes = ParseNumber<int16_t>(text, "number of bytes");
  if (kind == ReplyFaultKind::kGarbageBefore && bytes <= 0) {
    throw std::invalid_argument("'" + std::string(text) + "' must be above 0");
  }
  return bytes;
}

}  // namespace

BlockFault ParseBlockFault(BlockFaultKind kind, std::string_view text) {
  BlockFault fault;
  fault.kind = kind;
  fault.times = CutTimes(text, kOnce);
  if (kind == BlockFaultKind::kSilence) {
    const auto [block, seconds] = SplitAt(text, ':');
    fault.silence_ms = ParseSeconds(seconds);
    text = block;
  }
  fault.block = ParseNumber<uint32_t>(text, "block number");
  return fault;
}

ReplyFault ParseReplyFault(ReplyFaultKind kind, std::string_view text) {
  ReplyFault fault;
  fault.kind = kind;
  fault.times = CutTimes(text, kAlways);
  if (HasAmount(kind)) {
    const auto [amount, command] = SplitAt(text, ':');
    fault.amount = ParseAmount(kind, amount);
    text = command.empty() ? kAnyCommand : command;
  }
  if (text.empty()) {
    throw std::invalid_argument("a command is missing ('*' stands for any)");
  }
  fault.command = text;
  return fault;
}

}  // namespace sim
