// The host's side: what hosts do to a device that is plugged in. Each function completes the IRP,
// now or later.
#ifndef SIMULATOR_USB_DRIVER_HOST_H_
#define SIMULATOR_USB_DRIVER_HOST_H_

#include "simulator/usb/driver/bus.h"
#include "simulator/usb/driver/kernel.h"
#include "simulator/usb/driver/state.h"

namespace usb_driver {

NTSTATUS OpenByHost(HostDevice* device, IRP* irp);

// The host's last use of the handle: what is still pending on it ends.
NTSTATUS CleanUpForHost(HostDevice* device, IRP* irp);

NTSTATUS CloseByHost(HostDevice* device, IRP* irp);

// Hands a request to the program, or a read to the next transfer.
NTSTATUS Forward(HostDevice* device, IRP* irp, usb_bus::RequestKind kind);

}  // namespace usb_driver

#endif  // SIMULATOR_USB_DRIVER_HOST_H_
