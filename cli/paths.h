// Folders and files of this computer.
#ifndef RCVLINK_CLI_PATHS_H_
#define RCVLINK_CLI_PATHS_H_

#include <windows.h>

#include <filesystem>
#include <string>

#include "results.h"

namespace cli {

bool Exists(const std::filesystem::path& path);
bool IsFolder(const std::filesystem::path& path);

// Makes a folder and its parents.
// Throws Failure when that does not work.
void MakeFolder(const std::filesystem::path& folder);

// A failure with a file or folder of this computer.
Failure LocalFailure(std::string tried, DWORD error);

}  // namespace cli

#endif  // RCVLINK_CLI_PATHS_H_
