#include <algorithm>

#include "command.h"
#include "formats.h"
#include "options.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

constexpr std::size_t kTimeWidth = 19;

std::string Row(const std::string& size,
                std::size_t size_width,
                const std::string& time,
                const std::string& name) {
  return PadLeft(size, size_width) + "  " + PadRight(time, kTimeWidth) + "  " + name + "\n";
}

Json ToJson(const RemoteFile& file) {
  constexpr char kDateFromTime = 'T';
  const std::string time = FormatTime(file.time, kDateFromTime);
  return {{"name", ToUtf8(file.name)},
          {"size", file.size},
          {"time", time == "-" ? Json(nullptr) : Json(time)}};
}

class List : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override { AddPort(app, arguments); }

  Outcome Run(Context& context) override {
    constexpr std::string_view kSizeTitle = "Size";
    Receiver receiver(context);
    const std::vector<RemoteFile> files = receiver.ListFiles();
    std::size_t size_width = kSizeTitle.size();
    std::uint64_t total = 0;
    for (const RemoteFile& file : files) {
      size_width = std::max(size_width, std::to_string(file.size).size());
      total += file.size;
    }
    if (!files.empty()) context.PrintDone(Row(std::string(kSizeTitle), size_width, "Time", "Name"));
    Outcome outcome{.document = Json::array()};
    for (const RemoteFile& file : files) {
      context.PrintResult(
          Row(std::to_string(file.size), size_width, FormatTime(file.time), Printable(file.name)));
      outcome.document.push_back(ToJson(file));
    }
    const std::string count =
        std::to_string(files.size()) + (files.size() == 1 ? " file" : " files");
    context.PrintDone(count + ", " + std::to_string(total) + " bytes\n");
    return outcome;
  }
};

}  // namespace

std::unique_ptr<Command> MakeList() {
  return std::make_unique<List>(
      Command::Text{"ls", "List the receiver's files", "Example: rcvlink-cli ls COM7"});
}

}  // namespace cli
