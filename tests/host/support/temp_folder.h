// A folder of a test's own, seen from both sides.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_TEMP_FOLDER_H_
#define RCVLINK_TESTS_HOST_SUPPORT_TEMP_FOLDER_H_

#include <filesystem>
#include <string>

#include "tests/host/support/bed_connection.h"

namespace bed {

// The same folder under two names: Wine shows the Linux root folder as drive Z.
std::filesystem::path ToWindowsPath(const std::string& unix_path);
std::string ToUnixPath(const std::filesystem::path& windows_path);

// A new, empty folder, removed with its content in the end.
class TempFolder {
 public:
  TempFolder();

  const std::filesystem::path& path() const { return path_; }
  const std::string& unix_path() const { return unix_path_; }

  // The path of a file in the folder.
  std::filesystem::path operator/(const std::string& name) const { return path_ / name; }

  // The name is UTF-8 and may be one that Windows does not have.
  void Write(const std::string& name, const std::string& content) const;
  std::string Read(const std::string& name) const;

 private:
  mutable Connection connection_;  // a request does not change the folder
  std::string unix_path_;
  std::filesystem::path path_;
};

}  // namespace bed

#endif  // RCVLINK_TESTS_HOST_SUPPORT_TEMP_FOLDER_H_
