/// @file part_file.h
/// A download's file on this computer.
#ifndef RCVLINK_CLI_PART_FILE_H_
#define RCVLINK_CLI_PART_FILE_H_

#include <filesystem>

#include "handle.h"
#include "results.h"

namespace cli {

/// A file that grows under the name of its target with ".part" behind it, and vanishes unless it is
/// kept, also when the process is killed.
class PartFile {
 public:
  /// @param overwrite whether files of either name may be replaced
  /// @throws Failure when it cannot be made
  PartFile(std::filesystem::path target, bool overwrite);
  ~PartFile();
  PartFile(const PartFile&) = delete;
  PartFile& operator=(const PartFile&) = delete;

  /// @return ERROR_SUCCESS, or the Win32 error
  DWORD Write(const void* data, DWORD size);

  /// Completes the file and gives it its name.
  /// @throws Failure when that does not work; the file is gone then
  void Keep();

  /// A failure with this file.
  Failure FailureOf(DWORD error) const;

 private:
  bool SetVanishing(bool vanishing);

  std::filesystem::path target_;
  std::filesystem::path part_;
  bool overwrite_;
  bool kept_ = false;
  UniqueHandle file_;
};

}  // namespace cli

#endif  // RCVLINK_CLI_PART_FILE_H_
