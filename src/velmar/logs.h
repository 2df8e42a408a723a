// Decoders of Velmar's logs. Each function reads one body (for the directory, all logs), without
// any access to the link. A body that is not whole yet gives Progress::kMore.
#ifndef RCVLINK_VELMAR_LOGS_H_
#define RCVLINK_VELMAR_LOGS_H_

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "commands/file_entry.h"

namespace VelmarCommands {

enum class Progress {
  kNothing,   // no field has come
  kMore,      // fields are missing
  kMoreLogs,  // all logs so far are whole, and more of them follow
  kComplete,
  kContradiction,  // a log is missing between two others
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

// DIRENT: one log for each file. Their sequence numbers count down to 0. The entries are those of
// the whole logs, from the first one to number 0, or to the first one after a gap, which is
// included. They are set also when more logs are to come.
Progress DecodeDirectory(std::string_view text, FileEntries& entries);

// FILEHDR: the file that is current.
struct FileHeaderLog {
  std::wstring file_name;  // with its quotes
  int file_size = 0;
};
Progress DecodeFileHeader(std::string_view body, FileHeaderLog& log);

// COMCONFIG: the settings of the port of that name. An unknown word leaves its field at 0, none.
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
