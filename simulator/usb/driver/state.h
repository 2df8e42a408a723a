// What the driver keeps of devices, handles and requests, and the lock that guards all of it.
#ifndef SIMULATOR_USB_DRIVER_STATE_H_
#define SIMULATOR_USB_DRIVER_STATE_H_

#include <cstddef>
#include <cstdint>

#include "simulator/usb/driver/bus.h"
#include "simulator/usb/driver/kernel.h"
#include "simulator/usb/driver/memory.h"
#include "simulator/usb/driver/name.h"

namespace usb_driver {

struct Plug;

// A device object that hosts open. It is not deleted while the driver is loaded but used again when
// nothing is plugged in and no handle is open.
struct HostDevice {
  LIST_ENTRY link;
  DEVICE_OBJECT* object;
  ULONG number;
  Plug* plug;  // null when nothing is plugged in
  ULONG open_handles;
};

struct Request;

// A handle of a host.
struct HostHandle {
  ULONG number;
  bool gets_transfers;
  // The notice of its end. It is made at the open, since a close cannot fail.
  Pooled<Request> closed;
};

// What a host asks for.
struct Request {
  LIST_ENTRY link;
  uint64_t id;
  usb_bus::RequestKind kind;
  ULONG handle_number;
  // The handle and the IRP, which live as long as the request; null for kClosed.
  HostHandle* handle;
  IRP* irp;
};

// The rest of a transfer to the host.
struct Transfer {
  LIST_ENTRY link;
  ULONG length;
  ULONG taken;
  uint8_t bytes[1];
};

enum class PlugState { kNew, kChanging, kPluggedIn, kGone };

inline constexpr wchar_t kLinkPrefix[] = L"\\DosDevices\\";
using LinkName = Name<Length(kLinkPrefix) + usb_bus::kMaxNameLength>;

// A handle of the bus, and the device that was plugged in through it.
struct Plug {
  PlugState state;
  HostDevice* device;
  LinkName link_name;
  // The pending kActAndWait.
  IRP* waiting;
  // Requests that the program does not know of yet.
  LIST_ENTRY arrived;
  // Requests that it has not answered yet.
  LIST_ENTRY taken;
  // Reads that wait for a transfer.
  LIST_ENTRY readers;
  LIST_ENTRY transfers;
};

// The driver's pointer in the handle that an IRP is about: a Plug on the bus, a HostHandle elsewhere.
inline void*& ContextOf(IRP* irp) {
  return IoGetCurrentIrpStackLocation(irp)->FileObject->FsContext;
}

// To be called once, before the first guard.
void InitializeStateLock();

// Locks the state: all of the structures above, and the lists and counters of the driver.
class StateGuard {
 public:
  StateGuard();
  ~StateGuard();
  StateGuard(const StateGuard&) = delete;
  StateGuard& operator=(const StateGuard&) = delete;

 private:
  KIRQL irql_;
};

}  // namespace usb_driver

#endif  // SIMULATOR_USB_DRIVER_STATE_H_
