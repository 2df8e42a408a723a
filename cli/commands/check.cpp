#include <windows.h>

#include <wtypes.h>

#include "command.h"
#include "options.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

class Check : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override { AddPort(app, arguments); }

  Outcome Run(Context& context) override {
    const Arguments& arguments = context.arguments;
    const std::string tried = "check the connection";
    Receiver receiver(context);
    receiver.ThrowIfCancelled(tried);
    short answer = VARIANT_FALSE;
    const long code =
        devapi::CheckConnection(receiver.handle(), context.interrupt.event(), &answer);
    if (code != S_OK || answer == VARIANT_FALSE) {
      Failure failure = receiver.FailureOf(tried, code, "the receiver does not answer");
      if (failure.exit != ExitCode::kCancelled) failure.exit = ExitCode::kNoReceiver;
      throw failure;
    }
    context.PrintResult(Printable(arguments.port) + ": the receiver answers\n");
    return {.document = {{"port", ToUtf8(arguments.port)}, {"answers", true}}};
  }
};

}  // namespace

std::unique_ptr<Command> MakeCheck() {
  return std::make_unique<Check>(
      Command::Text{"check",
                    "Check whether the receiver answers",
                    "Example: rcvlink-cli check COM7 --speed 115200 && echo connected"});
}

}  // namespace cli
