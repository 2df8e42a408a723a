// Requests on their way to the program, and transfers on their way to the host. The state must be
// locked for all of these.
#ifndef SIMULATOR_USB_DRIVER_TRAFFIC_H_
#define SIMULATOR_USB_DRIVER_TRAFFIC_H_

#include "simulator/usb/driver/completion.h"
#include "simulator/usb/driver/kernel.h"
#include "simulator/usb/driver/state.h"

namespace usb_driver {

// Takes an IRP from its cancel routine; false when that routine already runs and will complete the
// IRP.
bool Claim(IRP* irp);

// Ends the pending requests of a handle, or those of all handles when it is null.
void EndRequests(Plug* plug, const HostHandle* handle, NTSTATUS status, Completions& completions);

// Ends the handle's reads that wait for a transfer.
void EndReads(Plug* plug, const HostHandle* handle, NTSTATUS status, Completions& completions);

// Hands what has arrived to the program if it waits for that.
void TellProgram(Plug* plug, Completions& completions);

// Gives transfers to the reads that wait for them.
void ServeReaders(Plug* plug, Completions& completions);

}  // namespace usb_driver

#endif  // SIMULATOR_USB_DRIVER_TRAFFIC_H_
