#include <algorithm>

#include "command.h"
#include "serial_ports.h"
#include "text.h"

namespace cli {
namespace {

class Ports : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& /*app*/, Arguments& /*arguments*/) override {}

  Outcome Run(Context& context) override {
    constexpr std::size_t kGap = 2;
    const std::vector<SerialPort> ports = ListSerialPorts();
    if (ports.empty()) context.PrintDone("This computer has no COM ports.\n");
    std::size_t width = 0;
    for (const SerialPort& port : ports) width = std::max(width, port.port.size() + kGap);
    Outcome outcome{.document = Json::array()};
    for (const SerialPort& port : ports) {
      const std::string name = ToUtf8(port.port);
      const bool named = !port.friendly_name.empty();
      const std::string gap(named ? width - port.port.size() : 0, ' ');
      context.PrintResult(name + gap + Printable(port.friendly_name) + "\n");
      outcome.document.push_back(
          {{"port", name}, {"name", named ? Json(ToUtf8(port.friendly_name)) : Json(nullptr)}});
    }
    return outcome;
  }
};

}  // namespace

std::unique_ptr<Command> MakePorts() {
  return std::make_unique<Ports>(
      Command::Text{"ports", "List this computer's COM ports", "Example: rcvlink-cli ports"});
}

}  // namespace cli
