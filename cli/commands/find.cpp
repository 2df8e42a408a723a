#include "command.h"
#include "identity.h"
#include "options.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

class Find : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override { AddPort(app, arguments); }

  Outcome Run(Context& context) override {
    const Arguments& arguments = context.arguments;
    Receiver receiver(context);
    const Identity identity = receiver.Identify();
    context.PrintResult(Printable(arguments.port) + " (" + LinkWord(receiver) +
                        "): " + FamilyName(identity.family) + " receiver, model " +
                        Printable(identity.model) + ", id " + Printable(identity.id) + "\n");
    return {.document = ToJson(arguments, receiver, identity)};
  }
};

}  // namespace

std::unique_ptr<Command> MakeFind() {
  return std::make_unique<Find>(Command::Text{
      "find",
      "Find the receiver on a port",
      "Without --speed or --rts all speeds are tried, which takes minutes on a silent port.\n"
      "Examples:\n"
      "  rcvlink-cli find COM7\n"
      "  rcvlink-cli find COM7 --protocol quorin --speed 115200"});
}

}  // namespace cli
