// The speed that the host has set on its end of a pseudo-terminal.
#ifndef SIMULATOR_PORTS_HOST_SPEED_H_
#define SIMULATOR_PORTS_HOST_SPEED_H_

#include <cstdint>

namespace sim {

// The speed in bit/s that a terminal is set to, also an unusual one; asked on either end of a pty.
// Throws std::system_error.
uint32_t HostSpeed(int terminal);

}  // namespace sim

#endif  // SIMULATOR_PORTS_HOST_SPEED_H_
