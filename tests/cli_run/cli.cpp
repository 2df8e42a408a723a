#include "tests/cli_run/cli.h"

#include <algorithm>
#include <filesystem>

namespace cli_run {

std::vector<std::string> Cli::LocalFiles() const {
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(folder.path())) {
    names.push_back(entry.path().filename().string());
  }
  std::ranges::sort(names);
  return names;
}

std::string Content(size_t size) {
  std::string content(size, '\0');
  uint32_t value = 12345;
  for (char& byte : content) {
    value = value * 1103515245 + 12345;
    byte = static_cast<char>(value >> 24);
  }
  return content;
}

}  // namespace cli_run
