// All subcommands.
#ifndef RCVLINK_CLI_COMMANDS_COMMANDS_H_
#define RCVLINK_CLI_COMMANDS_COMMANDS_H_

#include "command.h"

namespace cli {

// Makes one of each, in the order of the help.
Commands MakeCommands();

}  // namespace cli

#endif  // RCVLINK_CLI_COMMANDS_COMMANDS_H_
