#include "simulator/quorin/fault_text.h"

#include <charconv>
#include <cmath>
#include <stdexcept>
#include <string>
#include <utility>

namespace sim {
namespace {

constexpr double kMsPerSecond = 1000.0;
constexpr double kMaxSilenceSeconds = 24.0 * 60 * 60;

template <typename Number>
Number ParseNumber(std::string_view text, std::string_view what) {
  Number number{};
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc() || stop != end) {
    throw std::invalid_argument("'" + std::string(text) + "' is no " + std::string(what));
  }
  return number;
}

uint32_t ParseSeconds(std::string_view text) {
  const auto seconds = ParseNumber<double>(text, "number of seconds");
  if (!(seconds >= 0 && seconds <= kMaxSilenceSeconds)) {
    throw std::invalid_argument("'" + std::string(text) + "' is not between 0 and a day");
  }
  return static_cast<uint32_t>(std::lround(seconds * kMsPerSecond));
}

// Cuts "@TIMES" off the end of `text`.
uint32_t CutTimes(std::string_view& text, uint32_t otherwise) {
  const size_t at = text.rfind('@');
  if (at == std::string_view::npos) {
    return otherwise;
  }
  const uint32_t times = ParseTimes(text.substr(at + 1));
  text = text.substr(0, at);
  return times;
}

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

// The two sides of the first `mark`; the second is empty when there is none.
std::pair<std::string_view, std::string_view> SplitAt(std::string_view text, char mark) {
  const size_t at = text.find(mark);
  if (at == std::string_view::npos) {
    return {text, {}};
  }
  return {text.substr(0, at), text.substr(at + 1)};
}

}  // namespace

uint32_t ParseTimes(std::string_view text) {
  if (text == "always") {
    return kAlways;
  }
  const auto times = ParseNumber<uint32_t>(text, "number of times");
  if (times == 0) {
    throw std::invalid_argument("a fault that happens 0 times is none");
  }
  return times;
}

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

SizeLie ParseSizeLie(std::string_view text) {
  const size_t at = text.rfind('=');
  if (at == std::string_view::npos || at == 0) {
    throw std::invalid_argument("'" + std::string(text) + "' is not of the form NAME=SIZE");
  }
  return {std::string(text.substr(0, at)), ParseNumber<uint64_t>(text.substr(at + 1), "size")};
}

}  // namespace sim
