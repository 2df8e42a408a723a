#include "paths.h"

#include <utility>

#include "text.h"

namespace cli {

bool Exists(const std::filesystem::path& path) {
  return GetFileAttributesW(path.c_str()) != INVALID_FILE_ATTRIBUTES;
}

bool IsFolder(const std::filesystem::path& path) {
  const DWORD attributes = GetFileAttributesW(path.c_str());
  return attributes != INVALID_FILE_ATTRIBUTES && (attributes & FILE_ATTRIBUTE_DIRECTORY) != 0;
}

void MakeFolder(const std::filesystem::path& folder) {
  if (folder.empty() || IsFolder(folder)) return;
  const std::filesystem::path parent = folder.parent_path();
  if (parent != folder) MakeFolder(parent);
  if (CreateDirectoryW(folder.c_str(), nullptr)) return;
  const DWORD error = GetLastError();
  if (!IsFolder(folder)) throw LocalFailure("make the folder " + Printable(folder.native()), error);
}

Failure LocalFailure(std::string tried, DWORD error) {
  return {.exit = ExitCode::kLocalFile, .tried = std::move(tried), .code = ResultOfWin32(error)};
}

}  // namespace cli
