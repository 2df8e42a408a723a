// The logs of a Velmar receiver that are about its files.
#ifndef SIMULATOR_VELMAR_FILE_LOGS_H_
#define SIMULATOR_VELMAR_FILE_LOGS_H_

#include <string>
#include <vector>

#include "simulator/files.h"
#include "simulator/velmar/log.h"
#include "simulator/velmar/version.h"

namespace sim {

// The logs that list `files`, one log a file.
std::vector<AsciiLog> DirectoryLogs(const std::vector<FileEntry>& files, bool quoted_names);

// The log about the current file.
AsciiLog FileHeaderLog(const FileEntry& file, const VelmarIdentity& identity);

}  // namespace sim

#endif  // SIMULATOR_VELMAR_FILE_LOGS_H_
