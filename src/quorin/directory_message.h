// One message of a Quorin directory listing: "{{name,size,time}", "{name,size,time}", ...,
// "{name,size,time}}", or "{}" for an empty directory.
#ifndef RCVLINK_QUORIN_DIRECTORY_MESSAGE_H_
#define RCVLINK_QUORIN_DIRECTORY_MESSAGE_H_

#include <optional>
#include <string_view>

#include "commands/file_entry.h"

namespace QuorinCommands {

struct DirectoryMessage {
  enum class Kind {
    kNothing,  // only opening braces and blanks
    kEnd,      // a closing brace and no entry: the list is empty
    kEntry
  };
  Kind kind = Kind::kNothing;
  FileEntry entry;
  bool last = false;  // the list ends after this entry
};

// Reads one message. Raises E_INVALIDARG when the runtime library cannot compute the year 1988.
DirectoryMessage ParseDirectoryMessage(std::string_view text);

// The local time at `seconds` after 1988-01-01 00:00:00 local time, from which receivers count.
// None when it is out of the runtime library's range.
std::optional<SYSTEMTIME> TimeFromReceiver(int64_t seconds);

}  // namespace QuorinCommands

#endif  // RCVLINK_QUORIN_DIRECTORY_MESSAGE_H_
