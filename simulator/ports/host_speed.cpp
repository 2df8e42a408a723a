#include "simulator/ports/host_speed.h"

// These headers give the speed as a number, not as one of a few codes. They cannot be used together
// with <termios.h>, so this is a file of its own.
#include <asm/ioctls.h>
#include <asm/termbits.h>
#include <sys/ioctl.h>

#include <cerrno>
#include <system_error>

namespace sim {

uint32_t HostSpeed(int terminal) {
  termios2 settings{};
  if (ioctl(terminal, TCGETS2, &settings) != 0) {
    throw std::system_error(errno, std::generic_category(), "cannot read the port's speed");
  }
  return settings.c_ospeed;
}

}  // namespace sim
