#include "identity.h"

#include "text.h"

namespace cli {

std::string LinkWord(const Receiver& receiver) {
  return receiver.link() == eInstanceUSB ? "usb" : "serial";
}

Json ToJson(const Arguments& arguments, const Receiver& receiver, const Identity& identity) {
  return {{"port", ToUtf8(arguments.port)},
          {"link", LinkWord(receiver)},
          {"protocol", FamilyWord(identity.family)},
          {"id", ToUtf8(identity.id)},
          {"model", ToUtf8(identity.model)}};
}

}  // namespace cli
