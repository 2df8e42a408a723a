// What the bodies of Velmar's logs say. Each function reads one body (or, for the directory, all
// its logs) and does no more; what a body cannot say yet, because it is not whole, is
// Progress::kMore.
#ifndef RCVLINK_VELMAR_LOGS_H_
#define RCVLINK_VELMAR_LOGS_H_

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "commands/file_entry.h"

namespace VelmarCommands {

enum class Progress {
  kNothing,   // not a field has come
  kMore,      // fields are missing
  kMoreLogs,  // all logs so far are whole, and more of them follow
  kComplete,
  kContradiction,  // the logs do not follow each other
  kNoMemory
};

// VERSION: the components of the receiver.
struct VersionLog {
  std::wstring model;
  std::wstring serial_number;
  std::wstring hardware_version;
  std::wstring software_version;
};
Progress DecodeVersion(std::string_view body, VersionLog& log);

// DIRENT: one log a file, counting down to 0. The entries are those of the complete logs from
// the first on, up to number 0 or to the one behind a gap, also when more are to come.
Progress DecodeDirectory(std::string_view text, std::vector<FileEntry>& entries);

// FILEHDR: the file that is current.
struct FileHeaderLog {
  std::wstring file_name;  // with the quotes it came in
  int file_size = 0;
};
Progress DecodeFileHeader(std::string_view body, FileHeaderLog& log);

// COMCONFIG: the settings of the port of that name. A word that is none of the known ones leaves
// what was there.
struct PortConfigLog {
  std::wstring port_name;
  int baud = 0;
  uint8_t parity = 0;  // 0 none, 1 even, 2 odd
  uint8_t data_bits = 0;
  uint8_t stop_bits = 0;
  uint8_t handshake = 0;  // 0 none, 1 XON, 2 CTS
};
Progress DecodePortConfig(std::string_view body, std::wstring_view port, PortConfigLog& log);

}  // namespace VelmarCommands

#endif  // RCVLINK_VELMAR_LOGS_H_
