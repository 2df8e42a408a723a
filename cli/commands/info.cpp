#include "command.h"
#include "identity.h"
#include "options.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

std::string Row(const std::string& label, const std::string& value) {
  constexpr size_t kLabelWidth = 10;
  return PadRight(label, kLabelWidth) + value + "\n";
}

class Info : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override { AddPort(app, arguments); }

  Outcome Run(Context& context) override {
    const Arguments& arguments = context.arguments;
    Receiver receiver(context);
    const Identity identity = receiver.Identify();
    const bool renaming = identity.offers_renaming();
    context.PrintResult(
        Row("Port", Printable(arguments.port) + " (" + LinkInWords(receiver) + ")") +
        Row("Id", Printable(identity.id)) + Row("Model", Printable(identity.model)) +
        Row("Family", FamilyName(identity.family)) +
        Row("Variant", std::to_string(identity.variant)) +
        Row("Renaming", renaming ? "offered" : "not offered") +
        Row("Features", std::to_string(identity.features)));
    Json document = ToJson(arguments.port, receiver, identity);
    document["variant"] = identity.variant;
    document["features"] = identity.features;
    document["renaming"] = renaming;
    return {.document = document};
  }
};

}  // namespace

std::unique_ptr<Command> MakeInfo() {
  return std::make_unique<Info>(Command::Text{
      "info", "Show everything known about the receiver", "Example: rcvlink-cli info COM7 --json"});
}

}  // namespace cli
