#include <algorithm>

#include "command.h"
#include "identity.h"
#include "port_list.h"
#include "text.h"

namespace cli {
namespace {

// What is known of a port besides its name.
std::string Details(const Port& port) {
  std::string details = Printable(port.friendly_name);
  if (port.vendor.empty()) return details;
  return details + (details.empty() ? "" : " ") + "(vendor " + port.vendor + ", product " +
         port.product + ")";
}

Json OrNull(const std::string& text) { return text.empty() ? Json(nullptr) : Json(text); }

Json ToJson(const Port& port) {
  Json json = {{"port", ToUtf8(port.name)},
               {"link", LinkWord(port.link)},
               {"name", OrNull(ToUtf8(port.friendly_name))}};
  if (port.link == eInstanceUSB) {
    json["vendor"] = OrNull(port.vendor);
    json["product"] = OrNull(port.product);
  }
  return json;
}

class Ports : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& /*app*/, Arguments& /*arguments*/) override {}

  Outcome Run(Context& context) override {
    constexpr size_t kGap = 2;
    const std::vector<Port> ports = ListPorts();
    if (ports.empty()) {
      context.PrintDone("This computer has no COM port and no USB device with the USBIO driver.\n");
    }
    size_t width = 0;
    for (const Port& port : ports) width = std::max(width, Printable(port.name).size() + kGap);
    Json list = Json::array();
    for (const Port& port : ports) {
      const std::string details = Details(port);
      const std::string name = Printable(port.name);
      context.PrintResult((details.empty() ? name : PadRight(name, width) + details) + "\n");
      list.push_back(ToJson(port));
    }
    return {.document = {{"ports", list}}};
  }
};

}  // namespace

std::unique_ptr<Command> MakePorts() {
  return std::make_unique<Ports>(
      Command::Text{"ports",
                    "List the COM ports and USB receivers of this computer",
                    "A USB device is listed when it uses the USBIO driver.\n"
                    "Example: rcvlink-cli ports"});
}

}  // namespace cli
