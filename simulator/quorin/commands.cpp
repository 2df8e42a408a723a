#include "simulator/quorin/commands.h"

#include <algorithm>
#include <charconv>
#include <utility>

#include "simulator/quorin/command_reader.h"
#include "simulator/quorin/directory.h"

namespace sim {
namespace {

constexpr std::string_view kPrint = "print,";
constexpr std::string_view kSet = "set,";
constexpr std::string_view kRemove = "remove,";
constexpr std::string_view kGet = "get,";
constexpr std::string_view kStopOutput = "dm";

constexpr std::string_view kLogFolder = "log/";
constexpr std::string_view kListing = "&[name,size,time]";
constexpr std::string_view kSizeOf = "&size";
constexpr std::string_view kSerialPorts = "par/dev/ser/";

constexpr size_t kMaxBlockLength = 4096;
constexpr size_t kLongNameLength = 40;

Answer Complain(std::string_view why) {
  Answer answer;
  answer.ok = false;
  answer.texts = {"{" + std::string(why) + "}"};
  return answer;
}

Answer Tell(std::string text) {
  Answer answer;
  answer.texts = {std::move(text)};
  return answer;
}

// A path means the same with and without its leading slash.
std::string_view Relative(std::string_view path) {
  if (path.starts_with('/')) {
    path.remove_prefix(1);
  }
  return path;
}

// Removes `prefix` from `text` if it is there.
bool Consume(std::string_view& text, std::string_view prefix) {
  if (!text.starts_with(prefix)) {
    return false;
  }
  text.remove_prefix(prefix.size());
  return true;
}

bool ConsumeNumber(std::string_view& text, uint32_t& number) {
  const auto [stop, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  if (error != std::errc()) {
    return false;
  }
  text.remove_prefix(static_cast<size_t>(stop - text.data()));
  return true;
}

uint64_t ToldSize(const FileEntry& file, const Faults& faults) {
  for (const SizeLie& lie : faults.sizes) {
    if (lie.file == file.name) {
      return lie.size;
    }
  }
  return file.size;
}

}  // namespace

bool IsSilentWithoutTag(std::string_view command) {
  return command.empty() || command == kEchoOff || command == kStopOutput ||
         command.starts_with(kSet);
}

QuorinCommandSet::QuorinCommandSet(QuorinIdentity identity, FileStore files)
    : identity_(std::move(identity)), files_(std::move(files)) {
  for (char letter = kFirstPortLetter; letter <= kLastPortLetter; ++letter) {
    ports_[letter] = {};
  }
}

const PortSettings& QuorinCommandSet::port_settings(char letter) const { return ports_.at(letter); }

Answer QuorinCommandSet::Execute(std::string_view command, const Faults& faults) {
  if (command.empty()) {
    return {};
  }
  if (command == kEchoOff) {
    Answer answer;
    answer.echo = false;
    answer.setting = "echo off";
    return answer;
  }
  if (command == kStopOutput) {
    Answer answer;
    answer.stop_output = true;
    return answer;
  }
  if (Consume(command, kPrint)) {
    return Print(Relative(command), faults);
  }
  if (Consume(command, kSet)) {
    return Set(Relative(command), faults);
  }
  if (Consume(command, kRemove)) {
    return Remove(std::string(command));
  }
  if (Consume(command, kGet)) {
    return Get(command);
  }
  return Complain("unknown command");
}

Answer QuorinCommandSet::Print(std::string_view path, const Faults& faults) const {
  if (path == "cur/term") {
    return Tell(identity_.port_name.empty() ? std::string("/dev/ser/") + identity_.port_letter
                                            : identity_.port_name);
  }
  if (path == "par/rcvid") {
    return Tell(identity_.id);
  }
  if (path == "par/rcv/model") {
    return Tell(identity_.model);
  }
  if (Consume(path, kLogFolder)) {
    if (path == kListing) {
      return PrintFiles(faults);
    }
    if (path.ends_with(kSizeOf)) {
      path.remove_suffix(kSizeOf.size());
      return PrintSize(std::string(path), faults);
    }
  }
  return Complain("unknown object");
}

Answer QuorinCommandSet::PrintFiles(const Faults& faults) const {
  std::vector<FileEntry> entries = files_.List();
  for (FileEntry& entry : entries) {
    entry.size = ToldSize(entry, faults);
    if (faults.long_names && entry.name.size() < kLongNameLength) {
      entry.name.resize(kLongNameLength, '_');
    }
  }
  Answer answer;
  answer.texts = ListDirectory(entries);
  return answer;
}

Answer QuorinCommandSet::PrintSize(const std::string& name, const Faults& faults) const {
  const std::optional<FileEntry> file = files_.Find(name);
  return file ? Tell(std::to_string(ToldSize(*file, faults))) : Complain("no such file");
}

Answer QuorinCommandSet::Set(std::string_view path_and_value, const Faults& faults) {
  const size_t comma = path_and_value.find(',');
  if (comma == std::string_view::npos) {
    return Complain("value missing");
  }
  std::string_view path = path_and_value.substr(0, comma);
  const std::string_view value = path_and_value.substr(comma + 1);
  if (path == "cur/term/rate") {
    const std::optional<uint32_t> speed = ParseSpeed(value);
    if (!speed || faults.keeps_speed) {
      return Complain("wrong value");
    }
    ports_[identity_.port_letter]["rate"] = value;
    Answer answer;
    // The host must be able to read the reply, so the speed changes after it.
    answer.speed_after_reply = speed;
    return answer;
  }
  return Consume(path, kSerialPorts) ? SetPort(path, value, faults) : Complain("unknown object");
}

Answer QuorinCommandSet::SetPort(std::string_view path,
                                 std::string_view value,
                                 const Faults& faults) {
  if (path.size() < 3 || path[0] < kFirstPortLetter || path[0] > kLastPortLetter ||
      path[1] != '/') {
    return Complain("unknown object");
  }
  const char letter = path[0];
  const std::string setting(path.substr(2));
  if (!IsValidSetting(setting, value) || (setting == "rate" && faults.keeps_speed)) {
    return Complain("wrong value");
  }
  ports_[letter][setting] = value;

  Answer answer;
  const bool own_port = letter == identity_.port_letter;
  if (setting == "rate" && own_port) {
    answer.speed_at_once = ParseSpeed(value);
    return answer;
  }
  if (setting == "echo" && own_port) {
    answer.echo = false;
  }
  answer.setting = std::string("port ") + letter + " " + setting + " " + std::string(value);
  return answer;
}

Answer QuorinCommandSet::Remove(const std::string& name) {
  return files_.Remove(name) ? Answer{} : Complain("no such file");
}

// The arguments read "NAME":{number,block length}, with the quotation marks.
Answer QuorinCommandSet::Get(std::string_view arguments) const {
  const size_t name_end = arguments.rfind('"');
  if (!arguments.starts_with('"') || name_end == 0) {
    return Complain("wrong arguments");
  }
  const std::string name(arguments.substr(1, name_end - 1));
  arguments.remove_prefix(name_end + 1);
  uint32_t first = 0;
  uint32_t block_length = 0;
  const bool understood = Consume(arguments, ":{") && ConsumeNumber(arguments, first) &&
                          Consume(arguments, ",") && ConsumeNumber(arguments, block_length) &&
                          arguments == "}";
  if (!understood || block_length == 0 || block_length > kMaxBlockLength) {
    return Complain("wrong arguments");
  }
  const std::optional<FileEntry> file = files_.Find(name);
  if (!file) {
    return Complain("no such file");
  }
  Answer answer;
  answer.transfer = TransferRequest{*file, block_length};
  return answer;
}

}  // namespace sim
