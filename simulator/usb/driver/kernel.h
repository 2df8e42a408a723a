#ifndef SIMULATOR_USB_DRIVER_KERNEL_H_
#define SIMULATOR_USB_DRIVER_KERNEL_H_

// MinGW has these two both as intrinsics and in the kernel's header, which the compiler does not
// accept in C++. Said to be there already, the first are left out.
#define __INTRINSIC_DEFINED_InterlockedBitTestAndSet
#define __INTRINSIC_DEFINED_InterlockedBitTestAndReset

#include <ntddk.h>

#endif  // SIMULATOR_USB_DRIVER_KERNEL_H_
