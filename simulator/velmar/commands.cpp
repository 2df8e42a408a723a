#include "simulator/velmar/commands.h"

#include <cstddef>
#include <utility>

#include "simulator/velmar/command_reader.h"
#include "simulator/velmar/file_logs.h"

namespace sim {
namespace {

constexpr std::string_view kThisPort = "thisport";
constexpr std::string_view kNativeMode = "novatel";
constexpr std::string_view kWholeFile = " all";
constexpr const char* kHiddenPort = "AUX";

VelmarAnswer Complain(std::string_view why) {
  VelmarAnswer answer;
  answer.error = "Invalid message. " + std::string(why);
  return answer;
}

VelmarAnswer Tell(AsciiLog log) {
  VelmarAnswer answer;
  answer.logs.push_back(std::move(log));
  return answer;
}

}  // namespace

VelmarCommandSet::VelmarCommandSet(VelmarIdentity identity,
                                   const VelmarListing& listing,
                                   FileStore files)
    : identity_(std::move(identity)), listing_(listing), files_(std::move(files)) {}

VelmarAnswer VelmarCommandSet::Execute(std::string_view command,
                                       uint32_t speed,
                                       const VelmarFaults& faults) {
  const std::string_view word = TakeWord(command);
  if (SameWord(word, "interfacemode")) {
    return SetInterfaceMode(command);
  }
  if (SameWord(word, "unlogall")) {
    return StopLogs(command);
  }
  if (SameWord(word, "log")) {
    return Log(command, speed, faults);
  }
  if (SameWord(word, "currentfile")) {
    return SetCurrentFile(command);
  }
  if (SameWord(word, "del")) {
    return Delete(command);
  }
  if (SameWord(word, "rename")) {
    return Rename(command);
  }
  if (SameWord(word, kPortCommand)) {
    return SetPort(command, faults);
  }
  return Complain("Unknown command");
}

bool VelmarCommandSet::IsThisPort(std::string_view word) const {
  return SameWord(word, kThisPort) || SameWord(word, identity_.port_name);
}

VelmarAnswer VelmarCommandSet::SetInterfaceMode(std::string_view arguments) const {
  const bool this_port = IsThisPort(TakeWord(arguments));
  const bool receives = SameWord(TakeWord(arguments), kNativeMode);
  const bool sends = SameWord(TakeWord(arguments), kNativeMode);
  if (!this_port || !receives || !sends || !SameWord(arguments, "on")) {
    return Complain("Interface mode not available");
  }
  return {};
}

VelmarAnswer VelmarCommandSet::StopLogs(std::string_view arguments) const {
  if (!arguments.empty() && !IsThisPort(arguments)) {
    return Complain("Unknown port");
  }
  VelmarAnswer answer;
  answer.stop_logs = true;
  return answer;
}

VelmarAnswer VelmarCommandSet::Log(std::string_view arguments,
                                   uint32_t speed,
                                   const VelmarFaults& faults) const {
  const std::string_view name = TakeWord(arguments);
  if (!arguments.empty() && !SameWord(arguments, "once")) {
    return Complain("Unknown trigger");
  }
  if (SameWord(name, "versiona")) {
    return Tell(VersionLog(identity_));
  }
  if (SameWord(name, "comconfiga")) {
    return LogPorts(speed, faults);
  }
  if (SameWord(name, "direnta")) {
    return LogDirectory(faults);
  }
  if (SameWord(name, "filehdra")) {
    return LogFileHeader(faults);
  }
  if (SameWord(name, "filetransferb")) {
    return LogFile();
  }
  return Complain("Unknown log");
}

VelmarAnswer VelmarCommandSet::LogPorts(uint32_t speed, const VelmarFaults& faults) const {
  VelmarPortSettings settings = port_;
  settings.speed = speed;
  AsciiLog log = PortConfigLog(identity_.port_name, settings);
  const size_t own = log.body.find("," + identity_.port_name + ",");
  if (faults.hides_own_port && own != std::string::npos) {
    log.body.replace(own + 1, identity_.port_name.size(), kHiddenPort);
  }
  return Tell(std::move(log));
}

VelmarAnswer VelmarCommandSet::LogDirectory(const VelmarFaults& faults) const {
  std::vector<FileEntry> entries = files_.List();
  for (FileEntry& entry : entries) {
    entry.size = ToldSize(faults, entry.name, entry.size);
  }
  if (entries.empty() && listing_.blank_entry) {
    entries.emplace_back();
  }
  VelmarAnswer answer;
  answer.logs = DirectoryLogs(entries, listing_.quoted_names);
  return answer;
}

std::optional<FileEntry> VelmarCommandSet::CurrentFile() const {
  return files_.Find(current_file_);
}

VelmarAnswer VelmarCommandSet::LogFileHeader(const VelmarFaults& faults) const {
  std::optional<FileEntry> file = CurrentFile();
  if (!file) {
    return Complain("No current file");
  }
  file->size = ToldSize(faults, file->name, file->size);
  return Tell(FileHeaderLog(*file, identity_));
}

VelmarAnswer VelmarCommandSet::LogFile() const {
  VelmarAnswer answer;
  answer.transfer = CurrentFile();
  return answer.transfer ? answer : Complain("No current file");
}

// Names are not quoted and may have blanks in them: the name is everything before "all".
VelmarAnswer VelmarCommandSet::SetCurrentFile(std::string_view arguments) {
  if (arguments.empty()) {
    current_file_.clear();
    return {};
  }
  std::string_view name = arguments;
  if (name.size() > kWholeFile.size() &&
      SameWord(name.substr(name.size() - kWholeFile.size()), kWholeFile)) {
    name.remove_suffix(kWholeFile.size());
  }
  if (!files_.Find(std::string(name))) {
    return Complain("No such file");
  }
  current_file_ = name;
  return {};
}

VelmarAnswer VelmarCommandSet::Delete(std::string_view arguments) {
  if (!SameWord(TakeWord(arguments), "file")) {
    return Complain("Unknown object");
  }
  return files_.Remove(std::string(arguments)) ? VelmarAnswer{} : Complain("No such file");
}

// Both names may have blanks in them: the old one is the longest that there is a file of.
VelmarAnswer VelmarCommandSet::Rename(std::string_view arguments) {
  for (size_t blank = arguments.rfind(' '); blank != std::string_view::npos && blank > 0;
       blank = arguments.rfind(' ', blank - 1)) {
    const std::string name(arguments.substr(0, blank));
    const std::string new_name(arguments.substr(blank + 1));
    if (!files_.Find(name)) {
      continue;
    }
    if (new_name.empty() || !files_.Rename(name, new_name)) {
      return Complain("Wrong new name");
    }
    if (current_file_ == name) {
      current_file_ = new_name;
    }
    return {};
  }
  return Complain("No such file");
}

VelmarAnswer VelmarCommandSet::SetPort(std::string_view arguments, const VelmarFaults& faults) {
  const std::optional<VelmarPortSettings> settings = ParsePortSettings(arguments);
  if (!settings) {
    return Complain("Wrong port settings");
  }
  if (faults.keeps_speed) {
    return {};
  }
  port_ = *settings;
  VelmarAnswer answer;
  // The host must be able to read the reply, so the speed changes after it.
  answer.speed_after_reply = settings->speed;
  answer.setting = "port " + settings->parity + " " + settings->data_bits + " " +
                   settings->stop_bits + " " + settings->handshake;
  return answer;
}

}  // namespace sim
