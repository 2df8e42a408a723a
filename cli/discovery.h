/// @file discovery.h
/// Getting hold of the receiver that the command line names.
#ifndef RCVLINK_CLI_DISCOVERY_H_
#define RCVLINK_CLI_DISCOVERY_H_

#include "context.h"
#include "rcvlink.h"

namespace cli {

struct FoundReceiver {
  void* handle;  ///< the library's, to be given back with `devapi::CloseReceiver`
  EInstanceType link;
};

/// Searches the port, or tries it once when the command line tells speed or RTS.
/// @throws Failure when there is no receiver
FoundReceiver FindReceiver(Context& context);

}  // namespace cli

#endif  // RCVLINK_CLI_DISCOVERY_H_
