// The program's side: what a program that plays a device does to the bus. Each function completes
// the IRP, now or later.
#ifndef SIMULATOR_USB_DRIVER_PROGRAM_H_
#define SIMULATOR_USB_DRIVER_PROGRAM_H_

#include "simulator/usb/driver/kernel.h"

namespace usb_driver {

NTSTATUS OpenBus(IRP* irp);

// The program's last use of the handle: its device is unplugged.
NTSTATUS CleanUpBus(IRP* irp);

NTSTATUS CloseBus(IRP* irp);

// The control codes of bus.h.
NTSTATUS ControlBus(DRIVER_OBJECT* driver, IRP* irp);

}  // namespace usb_driver

#endif  // SIMULATOR_USB_DRIVER_PROGRAM_H_
