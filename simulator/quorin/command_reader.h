// From the bytes that a host sends to the commands of a Quorin receiver.
#ifndef SIMULATOR_QUORIN_COMMAND_READER_H_
#define SIMULATOR_QUORIN_COMMAND_READER_H_

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace sim {

// The one command that begins with a '#', which otherwise ends a transfer.
inline constexpr std::string_view kEchoOff = "#OFF#";

// A line as it came: `raw` with its end, `text` without.
struct CommandLine {
  std::string raw;
  std::string text;
};

// Collects bytes into lines.
class CommandReader {
 public:
  // Takes one byte; gives the line that it completes.
  std::optional<CommandLine> Push(uint8_t byte);

  // Starts a new line with a '#' that has taken effect already. It may also be the first character
  // of "#OFF#".
  void RestartAfterHash();

  const std::string& unfinished() const { return raw_; }

 private:
  std::string raw_;
  std::string text_;
};

// A command without its tag.
struct Command {
  std::optional<std::string> tag;
  std::string text;
};

// Splits "%tag%text". When the host gave up after a tag, another tag follows; then the last one
// counts.
Command SplitTag(std::string_view line);

}  // namespace sim

#endif  // SIMULATOR_QUORIN_COMMAND_READER_H_
