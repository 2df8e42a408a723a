// What find and info print about a receiver.
#ifndef RCVLINK_CLI_COMMANDS_IDENTITY_H_
#define RCVLINK_CLI_COMMANDS_IDENTITY_H_

#include <string>

#include "context.h"
#include "receiver.h"

namespace cli {

// The link as a word of --link.
std::string LinkWord(EInstanceType link);

// "usb", or "serial, 57600 bit/s, RTS on"
std::string LinkInWords(const Receiver& receiver);

// {"port", "link", "speed", "rts", "protocol", "id", "model"}; speed and rts are null on USB
Json ToJson(const std::wstring& port, const Receiver& receiver, const Identity& identity);

}  // namespace cli

#endif  // RCVLINK_CLI_COMMANDS_IDENTITY_H_
