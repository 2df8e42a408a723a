#include "simulator/velmar/version.h"

#include <array>
#include <string_view>

namespace sim {
namespace {

struct KnownComponent {
  std::string_view type;
  std::string_view model;
  std::string_view serial;
  std::string_view hardware;
  std::string_view software;
  std::string_view boot;
  std::string_view date;
  std::string_view time;
};

constexpr std::array<KnownComponent, 4> kKnown = {{
    {kReceiverCard, "", "", "V4-2.01", "VMR040100", "VMB010000", "2021/Feb/03", "10:15:20"},
    {"ENCLOSURE", "VX-40", "EN4471", "X1", "VXR010200", "", "2021/Jan/11", "08:02:54"},
    {"DB_USERAPPAUTO", "Site logger, twice daily", "", "", "3", "", "2021/Mar/19", "16:40:07"},
    {"DB_HEIGHTMODEL", "World, 0.25 deg", "G96", "", "", "", "2019/Nov/27", "12:00:00"},
}};

constexpr KnownComponent kOther = {"", "UNNAMED", "0", "", "1.0", "", "2021/Feb/03", "10:15:20"};

const KnownComponent& Known(std::string_view type) {
  for (const KnownComponent& component : kKnown) {
    if (component.type == type) {
      return component;
    }
  }
  return kOther;
}

std::string Quoted(std::string_view text) { return ",\"" + std::string(text) + "\""; }

std::string ComponentEntry(const VelmarComponent& component, const VelmarIdentity& identity) {
  const KnownComponent& known = Known(component.type);
  const bool card = component.type == kReceiverCard;
  const std::string_view usual_model = card ? std::string_view(identity.model) : known.model;
  return "," + component.type + Quoted(component.model.empty() ? usual_model : component.model) +
         Quoted(card ? std::string_view(identity.id) : known.serial) + Quoted(known.hardware) +
         Quoted(known.software) + Quoted(known.boot) + Quoted(known.date) + Quoted(known.time);
}

}  // namespace

AsciiLog VersionLog(const VelmarIdentity& identity) {
  std::string body = std::to_string(identity.components.size());
  for (const VelmarComponent& component : identity.components) {
    body += ComponentEntry(component, identity);
  }
  return {"VERSIONA", body, true};
}

}  // namespace sim
