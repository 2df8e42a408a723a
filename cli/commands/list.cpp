#include <algorithm>

#include "command.h"
#include "formats.h"
#include "options.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

constexpr size_t kTimeWidth = 19;

std::string Row(const std::string& size,
                size_t size_width,
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
    Receiver receiver(context);
    const Directory directory = receiver.ListFiles();
    const std::vector<RemoteFile>& files = directory.files;
    uint64_t total = 0;
    for (const RemoteFile& file : files) total += file.size;
    PrintTable(context, files);
    context.PrintDone(std::to_string(files.size()) + (files.size() == 1 ? " file" : " files") +
                      ", " + std::to_string(total) + " bytes\n");
    Json list = Json::array();
    for (const RemoteFile& file : files) list.push_back(ToJson(file));
    Outcome outcome{.document = {{"port", ToUtf8(context.arguments.port)},
                                 {"files", list},
                                 {"bytes", total},
                                 {"complete", directory.doubt.empty()}}};
    if (!directory.doubt.empty()) {
      outcome.document["warning"] = directory.doubt;
      outcome.exit = ExitCode::kFailed;
    }
    return outcome;
  }

 private:
  static void PrintTable(Context& context, const std::vector<RemoteFile>& files) {
    constexpr std::string_view kSizeTitle = "Size";
    size_t size_width = kSizeTitle.size();
    for (const RemoteFile& file : files) {
      size_width = std::max(size_width, std::to_string(file.size).size());
    }
    if (!files.empty()) context.PrintDone(Row(std::string(kSizeTitle), size_width, "Time", "Name"));
    for (const RemoteFile& file : files) {
      context.PrintResult(
          Row(std::to_string(file.size), size_width, FormatTime(file.time), Printable(file.name)));
    }
  }
};

}  // namespace

std::unique_ptr<Command> MakeList() {
  return std::make_unique<List>(
      Command::Text{"ls", "List the receiver's files", "Example: rcvlink-cli ls COM7"});
}

}  // namespace cli
