// The bytes that a host hands in with a request, and where those for the host go.
#ifndef SIMULATOR_USB_DRIVER_REQUEST_BYTES_H_
#define SIMULATOR_USB_DRIVER_REQUEST_BYTES_H_

#include "simulator/usb/driver/kernel.h"
#include "simulator/usb/driver/state.h"

namespace usb_driver {

// How the buffers of a control code are passed: METHOD_BUFFERED and so on.
ULONG MethodOf(const IO_STACK_LOCATION* stack);

// 0 unless the request is a control code.
ULONG ControlCode(const Request& request);

// The bytes that come with the request.
ULONG InputLength(const Request& request);

// The bytes that the host takes in return.
ULONG Room(const Request& request);

// Where the bytes for the host go; null when that cannot be reached.
void* OutputOf(const Request& request);

}  // namespace usb_driver

#endif  // SIMULATOR_USB_DRIVER_REQUEST_BYTES_H_
