// The flags that the driver gives to its commands.
#ifndef RCVLINK_QUORIN_PROTOCOL_FLAGS_H_
#define RCVLINK_QUORIN_PROTOCOL_FLAGS_H_

#include <cstdint>

#include "quorin/quorin_command.h"

// Tagged; 0x0002 is set as it always was, and nothing reads it.
constexpr uint32_t kCommandFlags = QuorinCommands::kTagged | 0x0002;

#endif  // RCVLINK_QUORIN_PROTOCOL_FLAGS_H_
