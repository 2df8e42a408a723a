// The command line of a simulated USB device.
#ifndef SIMULATOR_PROGRAM_USB_OPTIONS_H_
#define SIMULATOR_PROGRAM_USB_OPTIONS_H_

#include <CLI/CLI.hpp>

#include "simulator/usb/device.h"

namespace sim {

// Adds the options of a USB device to a family's subcommand; they are stored in `options` when the
// command line is parsed.
void AddUsbOptions(CLI::App& command, UsbOptions& options);

}  // namespace sim

#endif  // SIMULATOR_PROGRAM_USB_OPTIONS_H_
