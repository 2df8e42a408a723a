// The flags that the driver gives to its commands.
#ifndef RCVLINK_QUORIN_PROTOCOL_FLAGS_H_
#define RCVLINK_QUORIN_PROTOCOL_FLAGS_H_

#include <cstdint>

#include "quorin/quorin_command.h"

namespace rcvlink {

// Tagged, so that a late answer to an earlier command is not taken for this one's. The library does
// not read 0x0002; a class derived from a command finds it in GetFlags.
constexpr uint32_t kCommandFlags = QuorinCommands::kTagged | 0x0002;

}  // namespace rcvlink

#endif  // RCVLINK_QUORIN_PROTOCOL_FLAGS_H_
