// A bus of simulated USB devices for tests and the demo, made for Wine. A real receiver has its own
// driver on Windows, not this one.
//
// There is one control device, the bus. Who opens it can plug in one device per handle, and then
// executes what hosts ask of it (bus.h).
//
// Wine sends no CLEANUP, does not let an open be refused, and calls the driver on one thread.
// Windows differs in all three, and the driver is right for both.
//
// This file has what the system calls: the entry, the dispatch routines and the unload.
#include "simulator/usb/driver/bus.h"
#include "simulator/usb/driver/completion.h"
#include "simulator/usb/driver/host.h"
#include "simulator/usb/driver/kernel.h"
#include "simulator/usb/driver/name.h"
#include "simulator/usb/driver/plugging.h"
#include "simulator/usb/driver/program.h"
#include "simulator/usb/driver/request_bytes.h"
#include "simulator/usb/driver/state.h"

namespace usb_driver {
namespace {

using usb_bus::RequestKind;

constexpr wchar_t kBusDevice[] = L"\\Device\\RcvlinkUsbBus";
constexpr wchar_t kBusLink[] = L"\\DosDevices\\rcvlink-usb-bus";

DEVICE_OBJECT* bus_device;

HostDevice* HostDeviceOf(DEVICE_OBJECT* object) {
  return static_cast<HostDevice*>(object->DeviceExtension);
}

NTSTATUS NTAPI DispatchCreate(DEVICE_OBJECT* object, IRP* irp) {
  return object == bus_device ? OpenBus(irp) : OpenByHost(HostDeviceOf(object), irp);
}

NTSTATUS NTAPI DispatchCleanup(DEVICE_OBJECT* object, IRP* irp) {
  return object == bus_device ? CleanUpBus(irp) : CleanUpForHost(HostDeviceOf(object), irp);
}

NTSTATUS NTAPI DispatchClose(DEVICE_OBJECT* object, IRP* irp) {
  return object == bus_device ? CloseBus(irp) : CloseByHost(HostDeviceOf(object), irp);
}

NTSTATUS NTAPI DispatchControl(DEVICE_OBJECT* object, IRP* irp) {
  if (object == bus_device) {
    return ControlBus(object->DriverObject, irp);
  }
  // The buffers of these codes are the caller's own memory, which the driver must not touch.
  if (MethodOf(IoGetCurrentIrpStackLocation(irp)) == METHOD_NEITHER) {
    return Complete(irp, STATUS_INVALID_DEVICE_REQUEST);
  }
  return Forward(HostDeviceOf(object), irp, RequestKind::kControl);
}

NTSTATUS NTAPI DispatchRead(DEVICE_OBJECT* object, IRP* irp) {
  return object == bus_device ? Complete(irp, STATUS_INVALID_DEVICE_REQUEST)
                              : Forward(HostDeviceOf(object), irp, RequestKind::kRead);
}

NTSTATUS NTAPI DispatchWrite(DEVICE_OBJECT* object, IRP* irp) {
  return object == bus_device ? Complete(irp, STATUS_INVALID_DEVICE_REQUEST)
                              : Forward(HostDeviceOf(object), irp, RequestKind::kWrite);
}

// No handle is open any more, so nothing is plugged in.
void NTAPI UnloadDriver(DRIVER_OBJECT*) {
  UNICODE_STRING link = Constant(kBusLink);
  IoDeleteSymbolicLink(&link);
  ReleaseKeptIrps();
  DeleteHostDevices();
  IoDeleteDevice(bus_device);
}

NTSTATUS MakeBus(DRIVER_OBJECT* driver) {
  UNICODE_STRING name = Constant(kBusDevice);
  NTSTATUS status = IoCreateDevice(driver, 0, &name, FILE_DEVICE_UNKNOWN, 0, FALSE, &bus_device);
  if (!NT_SUCCESS(status)) {
    return status;
  }
  UNICODE_STRING link = Constant(kBusLink);
  status = IoCreateSymbolicLink(&link, &name);
  if (!NT_SUCCESS(status)) {
    IoDeleteDevice(bus_device);
    return status;
  }
  bus_device->Flags &= ~static_cast<ULONG>(DO_DEVICE_INITIALIZING);
  return STATUS_SUCCESS;
}

NTSTATUS Load(DRIVER_OBJECT* driver) {
  InitializeStateLock();
  driver->MajorFunction[IRP_MJ_CREATE] = DispatchCreate;
  driver->MajorFunction[IRP_MJ_CLEANUP] = DispatchCleanup;
  driver->MajorFunction[IRP_MJ_CLOSE] = DispatchClose;
  driver->MajorFunction[IRP_MJ_DEVICE_CONTROL] = DispatchControl;
  driver->MajorFunction[IRP_MJ_READ] = DispatchRead;
  driver->MajorFunction[IRP_MJ_WRITE] = DispatchWrite;
  driver->DriverUnload = UnloadDriver;
  return MakeBus(driver);
}

}  // namespace
}  // namespace usb_driver

extern "C" NTSTATUS NTAPI DriverEntry(DRIVER_OBJECT* driver, UNICODE_STRING* registry_path);

extern "C" NTSTATUS NTAPI DriverEntry(DRIVER_OBJECT* driver, UNICODE_STRING*) {
  return usb_driver::Load(driver);
}
