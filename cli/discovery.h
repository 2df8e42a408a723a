/// @file discovery.h
/// Getting hold of the receiver that the command line names.
#ifndef RCVLINK_CLI_DISCOVERY_H_
#define RCVLINK_CLI_DISCOVERY_H_

#include "context.h"

namespace cli {

/// Searches the port, or tries it once when the command line tells speed or RTS.
/// @return the library's handle, to be given back with `devapi::CloseReceiver`
/// @throws Failure when there is no receiver
void* FindReceiver(Context& context);

/// What a result of the search means to the user.
Failure SearchFailure(const Arguments& arguments, long code);

}  // namespace cli

#endif  // RCVLINK_CLI_DISCOVERY_H_
