/// @file identity.h
/// What find and info tell of a receiver.
#ifndef RCVLINK_CLI_COMMANDS_IDENTITY_H_
#define RCVLINK_CLI_COMMANDS_IDENTITY_H_

#include <string>

#include "context.h"
#include "receiver.h"

namespace cli {

/// The link as a word of --link.
std::string LinkWord(const Receiver& receiver);

/// {"port", "link", "protocol", "id", "model"}
Json ToJson(const Arguments& arguments, const Receiver& receiver, const Identity& identity);

}  // namespace cli

#endif  // RCVLINK_CLI_COMMANDS_IDENTITY_H_
