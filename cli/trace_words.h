// What the lines of a report mean, each by itself.
#ifndef RCVLINK_CLI_TRACE_WORDS_H_
#define RCVLINK_CLI_TRACE_WORDS_H_

#include <optional>
#include <string>
#include <string_view>

#include "families.h"

namespace cli {

enum class TraceKind {
  kNote,     // unknown, or about the report itself
  kHost,     // the program calls the library
  kLink,     // a port is opened, set or closed
  kLock,     // a receiver is locked or unlocked
  kCommand,  // a command for the receiver
  kSend,     // the line is cleared and the command sent
  kRead,     // the reply is waited for
  kReply,    // it came
  kBlocks,   // the blocks of a file
  kRetry,    // a block is requested again
  kTimeout,  // no data came in time
  kFailure,
  kCancel,
  kDone,
};

// "command": the word in JSON.
std::string_view NameOf(TraceKind kind);

struct TraceWords {
  TraceKind kind = TraceKind::kNote;
  std::string meaning{};
  std::optional<long> code{};  // the result code in the line
};

// `line`: a line without its stamp, printable.
TraceWords WordsOf(std::string_view line);

// The family of receivers that a line is about; null when the line does not tell.
const Family* FamilyOf(std::string_view line);

// What a command asks for, and its text on the wire, by the name of its class. `family`: null if
// unknown.
std::string CommandMeaning(std::string_view class_name, const Family* family);

// The class of the command that a line reports as made; empty for other lines.
std::string_view CommandClass(std::string_view line);

}  // namespace cli

#endif  // RCVLINK_CLI_TRACE_WORDS_H_
