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

}  // namespace cli_run
