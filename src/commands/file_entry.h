// One file of a receiver's directory, as the commands of either family read it.
#ifndef RCVLINK_COMMANDS_FILE_ENTRY_H_
#define RCVLINK_COMMANDS_FILE_ENTRY_H_

#include <cstdint>
#include <deque>
#include <string>

#include "platform/win32.h"

struct FileEntry {
  std::wstring name;
  uint32_t size = 0;  // bytes
  SYSTEMTIME time{};  // as the receiver gives it; all zero when it could not be read
};

// A directory. It grows without moving what it has.
using FileEntries = std::deque<FileEntry>;

#endif  // RCVLINK_COMMANDS_FILE_ENTRY_H_
