// The kernel's header, made fit for C++.
#ifndef SIMULATOR_USB_DRIVER_KERNEL_H_
#define SIMULATOR_USB_DRIVER_KERNEL_H_

// MinGW has these two both as intrinsics and in the kernel's header, which the compiler does not
// accept in C++. These macros say that the intrinsics are declared already, and leave them out.
#define __INTRINSIC_DEFINED_InterlockedBitTestAndSet
#define __INTRINSIC_DEFINED_InterlockedBitTestAndReset

#include <ntddk.h>

#endif  // SIMULATOR_USB_DRIVER_KERNEL_H_
