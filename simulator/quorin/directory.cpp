#include "simulator/quorin/directory.h"

#include <cstddef>

namespace sim {
namespace {

std::time_t StartOf1988() {
  std::tm start{};
  start.tm_year = 88;
  start.tm_mday = 1;
  start.tm_isdst = -1;
  return std::mktime(&start);
}

}  // namespace

uint64_t SecondsSince1988(std::time_t time) {
  const std::time_t start = StartOf1988();
  return time < start ? 0 : static_cast<uint64_t>(time - start);
}

std::vector<std::string> ListDirectory(const std::vector<FileEntry>& files) {
  if (files.empty()) {
    return {"{}"};
  }
  std::vector<std::string> messages;
  for (const FileEntry& file : files) {
    messages.push_back("{" + file.name + "," + std::to_string(file.size) + "," +
                       std::to_string(SecondsSince1988(file.modified)) + "}");
  }
  messages.front().insert(0, "{");
  messages.back() += "}";
  return messages;
}

}  // namespace sim
