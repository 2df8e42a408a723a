// Plugging devices in and out: the device objects and the paths that hosts open.
#ifndef SIMULATOR_USB_DRIVER_PLUGGING_H_
#define SIMULATOR_USB_DRIVER_PLUGGING_H_

#include <cstddef>

#include "simulator/usb/driver/kernel.h"
#include "simulator/usb/driver/state.h"

namespace usb_driver {

// Plugs a device in whose path has the name of `length` characters. Its handles get IRPs from
// `driver`.
NTSTATUS PlugIn(DRIVER_OBJECT* driver, Plug* plug, const wchar_t* name, size_t length);

// Ends whatever is pending on the device.
NTSTATUS Unplug(Plug* plug);

// Deletes all device objects. Nothing may be plugged in, and no handle may be open.
void DeleteHostDevices();

}  // namespace usb_driver

#endif  // SIMULATOR_USB_DRIVER_PLUGGING_H_
