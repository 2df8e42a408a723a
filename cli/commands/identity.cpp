#include "identity.h"

#include "text.h"

namespace cli {

std::string LinkWord(EInstanceType link) { return link == eInstanceUSB ? "usb" : "serial"; }

std::string LinkInWords(const Receiver& receiver) {
  const std::string word = LinkWord(receiver.link());
  return receiver.setting() ? word + ", " + InWords(receiver.setting()->line) : word;
}

Json ToJson(const std::wstring& port, const Receiver& receiver, const Identity& identity) {
  Json json = {{"port", ToUtf8(port)},
               {"link", LinkWord(receiver.link())},
               {"speed", nullptr},
               {"rts", nullptr},
               {"protocol", FamilyWord(identity.family)},
               {"id", ToUtf8(identity.id)},
               {"model", ToUtf8(identity.model)}};
  if (const auto& setting = receiver.setting()) {
    if (setting->line.speed != 0) json["speed"] = setting->line.speed;
    json["rts"] = RtsWord(setting->line.rts);
  }
  return json;
}

}  // namespace cli
