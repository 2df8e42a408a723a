/// @file commands.h
/// The program's subcommands. Each throws `Failure` when it could do nothing.
#ifndef RCVLINK_CLI_COMMANDS_COMMANDS_H_
#define RCVLINK_CLI_COMMANDS_COMMANDS_H_

#include "context.h"

namespace cli {

Outcome RunPorts(Context& context);
Outcome RunFind(Context& context);
Outcome RunInfo(Context& context);
Outcome RunCheck(Context& context);
Outcome RunList(Context& context);
Outcome RunGet(Context& context);
Outcome RunRemove(Context& context);
Outcome RunMove(Context& context);
Outcome RunSet(Context& context);

}  // namespace cli

#endif  // RCVLINK_CLI_COMMANDS_COMMANDS_H_
