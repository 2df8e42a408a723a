// Starting the driver of the simulated USB bus.
#ifndef SIMULATOR_PORTS_DRIVER_SERVICE_H_
#define SIMULATOR_PORTS_DRIVER_SERVICE_H_

#include "simulator/ports/handle.h"

namespace sim {

// Opens the bus of simulated USB devices for overlapped calls. Installs and starts its driver, whose
// file is next to this program's, when it does not run; any number of programs may do so at once.
// Throws std::system_error.
UniqueHandle OpenUsbBus();

}  // namespace sim

#endif  // SIMULATOR_PORTS_DRIVER_SERVICE_H_
