// What a Velmar receiver does on each command.
#ifndef SIMULATOR_VELMAR_COMMANDS_H_
#define SIMULATOR_VELMAR_COMMANDS_H_

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "simulator/files.h"
#include "simulator/velmar/faults.h"
#include "simulator/velmar/log.h"
#include "simulator/velmar/port_settings.h"
#include "simulator/velmar/version.h"

namespace sim {

// The result of a command.
struct VelmarAnswer {
  // Why it was refused; empty if it was executed.
  std::string error = {};
  // The error is sent without its text.
  bool bare = false;
  std::vector<AsciiLog> logs = {};
  // The file to send, as binary logs.
  std::optional<FileEntry> transfer = std::nullopt;

  // What the receiver has to do besides the reply.
  std::optional<uint32_t> speed_after_reply = std::nullopt;
  bool stop_logs = false;
  // What the transcript says about a setting that took effect; empty for nothing.
  std::string setting = {};
};

struct VelmarListing {
  // File names are in quotation marks.
  bool quoted_names = false;
  // An empty directory gives one log with an empty name, not none.
  bool blank_entry = false;
};

// Understands the commands and keeps what they change.
class VelmarCommandSet {
 public:
  VelmarCommandSet(VelmarIdentity identity, const VelmarListing& listing, FileStore files);

  // `speed` is that of the line; `faults` says which sizes are wrong, whether the host's port is
  // missing, and whether settings change.
  VelmarAnswer Execute(std::string_view command, uint32_t speed, const VelmarFaults& faults);

  const FileStore& files() const { return files_; }
  const std::string& port_name() const { return identity_.port_name; }

  // What has been set on the port that the host is on, but for its speed.
  const VelmarPortSettings& port_settings() const { return port_; }

 private:
  VelmarAnswer SetInterfaceMode(std::string_view arguments) const;
  VelmarAnswer StopLogs(std::string_view arguments) const;
  VelmarAnswer Log(std::string_view arguments, uint32_t speed, const VelmarFaults& faults) const;
  VelmarAnswer LogPorts(uint32_t speed, const VelmarFaults& faults) const;
  VelmarAnswer LogDirectory(const VelmarFaults& faults) const;
  VelmarAnswer LogFileHeader(const VelmarFaults& faults) const;
  VelmarAnswer LogFile() const;
  VelmarAnswer SetCurrentFile(std::string_view arguments);
  VelmarAnswer Delete(std::string_view arguments);
  VelmarAnswer Rename(std::string_view arguments);
  VelmarAnswer SetPort(std::string_view arguments, const VelmarFaults& faults);

  bool IsThisPort(std::string_view word) const;
  std::optional<FileEntry> CurrentFile() const;

  VelmarIdentity identity_;
  VelmarListing listing_;
  FileStore files_;
  VelmarPortSettings port_;
  // The name of the file that logs are about; empty for none.
  std::string current_file_;
};

}  // namespace sim

#endif  // SIMULATOR_VELMAR_COMMANDS_H_
