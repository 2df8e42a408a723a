#include "simulator/velmar/fault_text.h"

#include <cstdint>
#include <limits>
#include <stdexcept>
#include <string>

namespace sim {
namespace {

constexpr int64_t kMaxBytes = 100'000'000;
constexpr int64_t kMaxNumber = 1'000'000;

bool IsLateness(VelmarReplyFaultKind kind) {
  return kind == VelmarReplyFaultKind::kSilence || kind == VelmarReplyFaultKind::kLatePrompt ||
         kind == VelmarReplyFaultKind::kLateLog;
}

int64_t ParseBetween(std::string_view text, int64_t least, int64_t most) {
  const auto number = ParseNumber<int64_t>(text, "number");
  if (number < least || number > most) {
    throw std::invalid_argument("'" + std::string(text) + "' is not between " +
                                std::to_string(least) + " and " + std::to_string(most));
  }
  return number;
}

int64_t ParseAmount(VelmarReplyFaultKind kind, std::string_view text) {
  switch (kind) {
    case VelmarReplyFaultKind::kGarbageBefore:
    case VelmarReplyFaultKind::kEndlessPrompt:
      return ParseBetween(text, 1, kMaxBytes);
    case VelmarReplyFaultKind::kSequenceGap:
      return ParseBetween(text, 1, kMaxNumber);
    case VelmarReplyFaultKind::kFewerFields:
      return ParseBetween(text, 0, kMaxNumber);
    case VelmarReplyFaultKind::kCount:
      return ParseNumber<int64_t>(text, "number");
    default:
      return ParseSeconds(text);
  }
}

uint32_t ParseAmount(VelmarChunkFaultKind kind, std::string_view text) {
  switch (kind) {
    case VelmarChunkFaultKind::kHeaderLength:
      return static_cast<uint32_t>(ParseBetween(text, 0, std::numeric_limits<uint8_t>::max()));
    case VelmarChunkFaultKind::kMessageLength:
    case VelmarChunkFaultKind::kBodyLength:
      return static_cast<uint32_t>(ParseBetween(text, 0, std::numeric_limits<uint16_t>::max()));
    default:
      return ParseSeconds(text);
  }
}

}  // namespace

bool HasAmount(VelmarChunkFaultKind kind) {
  return kind == VelmarChunkFaultKind::kMessageLength ||
         kind == VelmarChunkFaultKind::kBodyLength || kind == VelmarChunkFaultKind::kHeaderLength ||
         kind == VelmarChunkFaultKind::kSilence;
}

bool HasAmount(VelmarReplyFaultKind kind) {
  switch (kind) {
    case VelmarReplyFaultKind::kGarbageBefore:
    case VelmarReplyFaultKind::kEndlessPrompt:
    case VelmarReplyFaultKind::kFewerFields:
    case VelmarReplyFaultKind::kCount:
    case VelmarReplyFaultKind::kSequenceGap:
      return true;
    default:
      return IsLateness(kind);
  }
}

VelmarChunkFault ParseChunkFault(VelmarChunkFaultKind kind, std::string_view text) {
  VelmarChunkFault fault;
  fault.kind = kind;
  fault.times = CutTimes(text, kOnce);
  if (HasAmount(kind)) {
    const auto [chunk, amount] = SplitAt(text, ':');
    fault.amount = ParseAmount(kind, amount);
    text = chunk;
  }
  fault.chunk = ParseNumber<uint32_t>(text, "chunk number");
  return fault;
}

VelmarReplyFault ParseReplyFault(VelmarReplyFaultKind kind, std::string_view text) {
  VelmarReplyFault fault;
  fault.kind = kind;
  fault.times = CutTimes(text, kAlways);
  if (HasAmount(kind)) {
    const auto [amount, command] = SplitAt(text, ':');
    fault.amount = ParseAmount(kind, amount);
    text = command.empty() ? kAnyVelmarCommand : command;
  }
  if (text.empty()) {
    throw std::invalid_argument("a command is missing ('*' stands for any)");
  }
  fault.command = text;
  return fault;
}

VelmarComponent ParseComponent(std::string_view text) {
  const auto [type, model] = SplitAt(text, ':');
  if (type.empty()) {
    throw std::invalid_argument("a component's type is missing");
  }
  return {std::string(type), std::string(model)};
}

}  // namespace sim
