#include "simulator/quorin/command_reader.h"

#include <cstddef>

namespace sim {
namespace {

constexpr size_t kMaxLineLength = 1024;

// A host may send '#' to end a transfer that has ended already. It then stands before the next
// command.
std::string_view WithoutStrayHashes(std::string_view line) {
  while (line.starts_with('#') && line != kEchoOff) {
    line.remove_prefix(1);
  }
  return line;
}

}  // namespace

std::optional<CommandLine> CommandReader::Push(uint8_t byte) {
  const char character = static_cast<char>(byte);
  if (raw_.size() < kMaxLineLength) {
    raw_ += character;
  }
  if (character != '\n') {
    if (text_.size() < kMaxLineLength) {
      text_ += character;
    }
    return std::nullopt;
  }
  while (text_.ends_with('\r')) {
    text_.pop_back();
  }
  CommandLine line{raw_, std::string(WithoutStrayHashes(text_))};
  raw_.clear();
  text_.clear();
  return line;
}

void CommandReader::RestartAfterHash() {
  raw_.clear();
  text_ = "#";
}

Command SplitTag(std::string_view line) {
  Command command;
  while (line.starts_with('%')) {
    const size_t end = line.find('%', 1);
    if (end == std::string_view::npos || end == 1) {
      break;
    }
    command.tag = line.substr(1, end - 1);
    line.remove_prefix(end + 1);
  }
  command.text = line;
  return command;
}

}  // namespace sim
