#include "tests/cli_run/cli.h"

#include <algorithm>
#include <filesystem>

namespace cli_run {

std::unique_ptr<bed::SimulatedPort> Cli::ReceiverOfMoreThanTheDisk() const {
  constexpr uint64_t kListed = 2'147'483'647;
  constexpr uint64_t kMostFiles = 60;  // a longer list is cut
  const uint64_t needed = std::filesystem::space(folder.path()).available / kListed + 1;
  if (needed > kMostFiles) return nullptr;
  std::vector<std::string> simulator = {"velmar"};
  Files files;
  for (uint64_t i = 0; i < needed; ++i) {
    const std::string name = "f" + std::to_string(i);
    files.emplace(name, "x");
    simulator.insert(simulator.end(), {"--lie-size", name + "=" + std::to_string(kListed)});
  }
  return std::make_unique<bed::SimulatedPort>(simulator, files);
}

std::vector<std::string> Cli::LocalFiles() const {
  std::vector<std::string> names;
  for (const auto& entry : std::filesystem::directory_iterator(folder.path())) {
    names.push_back(entry.path().filename().string());
  }
  std::ranges::sort(names);
  return names;
}

}  // namespace cli_run
