// What a Quorin receiver does on each command.
#ifndef SIMULATOR_QUORIN_COMMANDS_H_
#define SIMULATOR_QUORIN_COMMANDS_H_

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "simulator/files.h"
#include "simulator/quorin/faults.h"
#include "simulator/quorin/settings.h"

namespace sim {

// What a receiver says about itself.
struct QuorinIdentity {
  std::string id = "QR00421";
  std::string model = "HVA3-G3T";
  // The serial port that the host is connected to.
  char port_letter = kFirstPortLetter;
  // What the receiver calls that port; empty for "/dev/ser/" and the letter.
  std::string port_name = {};
};

struct TransferRequest {
  FileEntry file;
  size_t block_length = 0;
};

// The result of a command.
struct Answer {
  bool ok = true;
  // The texts of the messages to send, or the error text when not ok.
  std::vector<std::string> texts = {""};

  // What the receiver has to do besides the reply.
  std::optional<uint32_t> speed_at_once = std::nullopt;
  std::optional<uint32_t> speed_after_reply = std::nullopt;
  std::optional<bool> echo = std::nullopt;
  std::optional<TransferRequest> transfer = std::nullopt;
  bool stop_output = false;
  // What the transcript says about a setting that took effect; empty for nothing.
  std::string setting = {};
};

// Whether a command is executed without a reply when it has no tag.
bool IsSilentWithoutTag(std::string_view command);

// Understands the commands and keeps what they change.
class QuorinCommandSet {
 public:
  QuorinCommandSet(QuorinIdentity identity, FileStore files);

  // `faults` says which sizes are wrong, which names are too long, and whether speeds change.
  Answer Execute(std::string_view command, const Faults& faults);

  const FileStore& files() const { return files_; }

  // What has been set on the port `letter`.
  const PortSettings& port_settings(char letter) const;

 private:
  Answer Print(std::string_view path, const Faults& faults) const;
  Answer PrintFiles(const Faults& faults) const;
  Answer PrintSize(const std::string& name, const Faults& faults) const;
  Answer Set(std::string_view path_and_value, const Faults& faults);
  Answer SetPort(std::string_view path, std::string_view value, const Faults& faults);
  Answer Remove(const std::string& name);
  Answer Get(std::string_view arguments) const;

  QuorinIdentity identity_;
  FileStore files_;
  std::map<char, PortSettings> ports_;
};

}  // namespace sim

#endif  // SIMULATOR_QUORIN_COMMANDS_H_
