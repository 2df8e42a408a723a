#include "simulator/usb/driver/request_bytes.h"

namespace usb_driver {
namespace {

using usb_bus::RequestKind;

// The lowest two bits of a control code.
constexpr ULONG kMethodMask = 3;

const IO_STACK_LOCATION* StackOf(const Request& request) {
  return IoGetCurrentIrpStackLocation(request.irp);
}

}  // namespace

ULONG MethodOf(const IO_STACK_LOCATION* stack) {
  return stack->Parameters.DeviceIoControl.IoControlCode & kMethodMask;
}

ULONG ControlCode(const Request& request) {
  return request.kind == RequestKind::kControl
             ? StackOf(request)->Parameters.DeviceIoControl.IoControlCode
             : 0;
}

ULONG InputLength(const Request& request) {
  switch (request.kind) {
    case RequestKind::kControl:
      return StackOf(request)->Parameters.DeviceIoControl.InputBufferLength;
    case RequestKind::kWrite:
      return StackOf(request)->Parameters.Write.Length;
    default:
      return 0;
  }
}

ULONG Room(const Request& request) {
  switch (request.kind) {
    case RequestKind::kControl:
      // With METHOD_IN_DIRECT the second buffer is input, too.
      return MethodOf(StackOf(request)) == METHOD_IN_DIRECT
                 ? 0
                 : StackOf(request)->Parameters.DeviceIoControl.OutputBufferLength;
    case RequestKind::kRead:
      return StackOf(request)->Parameters.Read.Length;
    default:
      return 0;
  }
}

void* OutputOf(const Request& request) {
  if (request.kind == RequestKind::kControl && MethodOf(StackOf(request)) == METHOD_OUT_DIRECT) {
    return request.irp->MdlAddress == nullptr
               ? nullptr
               : MmGetSystemAddressForMdlSafe(request.irp->MdlAddress, NormalPagePriority);
  }
  return request.irp->AssociatedIrp.SystemBuffer;
}

}  // namespace usb_driver
