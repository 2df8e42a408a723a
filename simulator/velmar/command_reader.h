/// @file command_reader.h
/// From the bytes that a host sends to the commands of a Velmar receiver.
#ifndef SIMULATOR_VELMAR_COMMAND_READER_H_
#define SIMULATOR_VELMAR_COMMAND_READER_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace sim {

// Collects bytes into commands, which end in CR; a LF behind the CR is dropped.
class VelmarCommandReader {
 public:
  // Takes one byte; gives the command that it completes, without its end.
  std::optional<std::string> Push(uint8_t byte);

  const std::string& unfinished() const { return text_; }

 private:
  std::string text_;
  bool after_end_ = false;
};

// Takes the first word off `text`, and the blanks around it.
std::string_view TakeWord(std::string_view& text);

// Words, whatever their case.
bool SameWord(std::string_view left, std::string_view right);
bool StartsWithWord(std::string_view text, std::string_view start);

// The word of the command that changes the line speed.
inline constexpr std::string_view kPortCommand = "com";

// How many of `bytes` end with the last command in them that changes the line speed, a LF behind it
// included; 0 if there is none. `unfinished` is what came before of a command.
size_t EndOfPortCommand(std::string_view unfinished, std::span<const uint8_t> bytes);

}  // namespace sim

#endif  // SIMULATOR_VELMAR_COMMAND_READER_H_
