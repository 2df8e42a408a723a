// Where a receiver was found the last time, for each port.
#ifndef RCVLINK_CLI_PORT_MEMORY_H_
#define RCVLINK_CLI_PORT_MEMORY_H_

#include <filesystem>
#include <optional>
#include <string>

#include "sweep.h"

namespace cli {

// A small JSON file that only makes searches faster: commands work without it, too. Programs that
// run at the same time may use the same file.
class PortMemory {
 public:
  // `file`: need not exist, nor its folder; empty: nothing is remembered.
  explicit PortMemory(std::filesystem::path file) : file_(std::move(file)) {}

  // Where the memory of this user is: in the folder for application data. Empty when Windows does
  // not know it.
  static std::filesystem::path UsualFile();

  // Nothing for a port that is not known, or when the file cannot be read or is damaged.
  std::optional<KnownSetting> Recall(const std::wstring& port) const;

  // Returns false when the file could not be written.
  bool Remember(const std::wstring& port, const KnownSetting& setting) const;

  // Returns false when the file could not be written.
  bool Forget(const std::wstring& port) const;

 private:
  std::filesystem::path file_;
};

}  // namespace cli

#endif  // RCVLINK_CLI_PORT_MEMORY_H_
