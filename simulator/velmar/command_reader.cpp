#include "simulator/velmar/command_reader.h"

#include <algorithm>
#include <utility>

namespace sim {
namespace {

constexpr size_t kMaxCommandLength = 1024;
constexpr char kBlank = ' ';

char Lower(char letter) {
  return letter >= 'A' && letter <= 'Z' ? static_cast<char>(letter - 'A' + 'a') : letter;
}

void SkipBlanks(std::string_view& text) {
  text.remove_prefix(std::min(text.find_first_not_of(kBlank), text.size()));
}

}  // namespace

std::optional<std::string> VelmarCommandReader::Push(uint8_t byte) {
  const char character = static_cast<char>(byte);
  if (std::exchange(after_end_, false) && character == '\n') {
    return std::nullopt;
  }
  if (character == '\r') {
    after_end_ = true;
    return std::exchange(text_, {});
  }
  if (text_.size() < kMaxCommandLength) {
    text_ += character;
  }
  return std::nullopt;
}

std::string_view TakeWord(std::string_view& text) {
  SkipBlanks(text);
  const std::string_view word = text.substr(0, text.find(kBlank));
  text.remove_prefix(word.size());
  SkipBlanks(text);
  return word;
}

bool SameWord(std::string_view left, std::string_view right) {
  return left.size() == right.size() && StartsWithWord(left, right);
}

bool StartsWithWord(std::string_view text, std::string_view start) {
  return text.size() >= start.size() &&
         std::equal(start.begin(), start.end(), text.begin(), [](char left, char right) {
           return Lower(left) == Lower(right);
         });
}

size_t EndOfPortCommand(std::string_view unfinished, std::span<const uint8_t> bytes) {
  VelmarCommandReader reader;
  for (const char character : unfinished) {
    reader.Push(static_cast<uint8_t>(character));
  }
  size_t end = 0;
  for (size_t i = 0; i < bytes.size(); ++i) {
    const std::optional<std::string> command = reader.Push(bytes[i]);
    std::string_view text = command ? std::string_view(*command) : std::string_view();
    if (SameWord(TakeWord(text), kPortCommand)) {
      end = i + 1;
    } else if (end > 0 && end == i && bytes[i] == '\n') {
      ++end;
    }
  }
  return end;
}

}  // namespace sim
