// A folder for one test.
#ifndef RCVLINK_TESTS_CLI_TEMPORARY_FOLDER_H_
#define RCVLINK_TESTS_CLI_TEMPORARY_FOLDER_H_

#include <windows.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

namespace cli {

// Deleted with its content at the end of the test.
class TemporaryFolder {
 public:
  TemporaryFolder()
      : path_(std::filesystem::temp_directory_path() /
              ("rcvlink-cli-test-" + std::to_string(GetCurrentProcessId()))) {
    std::filesystem::create_directories(path_);
  }
  ~TemporaryFolder() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;

  const std::filesystem::path& path() const { return path_; }

  bool Has(const std::wstring& name) const { return std::filesystem::exists(path_ / name); }

  void Write(const std::wstring& name, const std::string& text) const {
    std::ofstream(path_ / name, std::ios::binary) << text;
  }

  std::string Read(const std::wstring& name) const {
    std::ifstream file(path_ / name, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
  }

 private:
  std::filesystem::path path_;
};

}  // namespace cli

#endif  // RCVLINK_TESTS_CLI_TEMPORARY_FOLDER_H_
