// From the bytes that a host sends to the commands of a Velmar receiver.
#ifndef SIMULATOR_VELMAR_COMMAND_READER_H_
#define SIMULATOR_VELMAR_COMMAND_READER_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace sim {

// Collects bytes into commands, which end in CR; a LF after the CR is discarded.
class VelmarCommandReader {
 public:
  // Takes one byte; gives the command that it completes, without its end.
  std::optional<std::string> Push(uint8_t byte);

  const std::string& unfinished() const { return text_; }

 private:
  std::string text_;
  bool after_end_ = false;
};

// Removes the first word from `text`, and the blanks around it; gives the word.
std::string_view TakeWord(std::string_view& text);

// Words, whatever their case.
bool SameWord(std::string_view left, std::string_view right);
bool StartsWithWord(std::string_view text, std::string_view start);

// The word of the command that changes the line speed.
inline constexpr std::string_view kPortCommand = "com";

// The length of `bytes` up to the end of the last command that changes the line speed, with a LF
// after it; 0 if there is none. `unfinished` is the start of a command that came before `bytes`.
size_t EndOfPortCommand(std::string_view unfinished, std::span<const uint8_t> bytes);

}  // namespace sim

#endif  // SIMULATOR_VELMAR_COMMAND_READER_H_
