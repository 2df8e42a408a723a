#include "simulator/usb/driver/host.h"

#include <utility>

#include "simulator/usb/driver/completion.h"
#include "simulator/usb/driver/request_bytes.h"
#include "simulator/usb/driver/traffic.h"

namespace usb_driver {
namespace {

using usb_bus::RequestKind;

ULONG last_handle;
uint64_t last_request;

HostHandle* HandleOf(IRP* irp) { return static_cast<HostHandle*>(ContextOf(irp)); }

void NTAPI CancelRequest(DEVICE_OBJECT*, IRP* irp) {
  IoReleaseCancelSpinLock(irp->CancelIrql);
  Pooled<Request> request;
  {
    const StateGuard guard;
    request = Unlink(static_cast<Request*>(irp->Tail.Overlay.DriverContext[kRequestContext]));
  }
  Complete(irp, STATUS_CANCELLED);
}

// Puts a request where it waits for the program or for a transfer, and gives STATUS_PENDING. With
// any other status the caller must complete it.
NTSTATUS Enqueue(HostDevice* device, Pooled<Request> request, Completions& completions) {
  const StateGuard guard;
  Plug* const plug = device->plug;
  if (plug == nullptr) {
    return STATUS_DEVICE_NOT_CONNECTED;
  }
  IRP* const irp = request->irp;
  request->id = ++last_request;
  irp->Tail.Overlay.DriverContext[kRequestContext] = request.get();
  KeepWhenCompleted(irp);
  IoSetCancelRoutine(irp, CancelRequest);
  if (irp->Cancel && Claim(irp)) {
    return STATUS_CANCELLED;
  }
  IoMarkIrpPending(irp);
  if (request->kind == RequestKind::kRead && request->handle->gets_transfers) {
    Append(&plug->readers, std::move(request));
    ServeReaders(plug, completions);
  } else {
    Append(&plug->arrived, std::move(request));
    TellProgram(plug, completions);
  }
  return STATUS_PENDING;
}

}  // namespace

NTSTATUS OpenByHost(HostDevice* device, IRP* irp) {
  ContextOf(irp) = nullptr;
  auto handle = Allocate<HostHandle>();
  auto closed = Allocate<Request>();
  if (handle == nullptr || closed == nullptr) {
    return Complete(irp, STATUS_INSUFFICIENT_RESOURCES);
  }
  {
    const StateGuard guard;
    handle->number = ++last_handle;
    ++device->open_handles;
  }
  closed->kind = RequestKind::kClosed;
  closed->handle_number = handle->number;
  handle->closed = std::move(closed);
  ContextOf(irp) = handle.release();
  return Complete(irp, STATUS_SUCCESS);
}

NTSTATUS CleanUpForHost(HostDevice* device, IRP* irp) {
  if (const HostHandle* const handle = HandleOf(irp); handle != nullptr) {
    Completions completions;
    const StateGuard guard;
    if (device->plug != nullptr) {
      EndRequests(device->plug, handle, STATUS_CANCELLED, completions);
    }
  }
  return Complete(irp, STATUS_SUCCESS);
}

NTSTATUS CloseByHost(HostDevice* device, IRP* irp) {
  const Pooled<HostHandle> handle(HandleOf(irp));
  ContextOf(irp) = nullptr;
  if (handle != nullptr) {
    Completions completions;
    const StateGuard guard;
    --device->open_handles;
    if (device->plug != nullptr) {
      EndRequests(device->plug, handle.get(), STATUS_CANCELLED, completions);
      Append(&device->plug->arrived, std::move(handle->closed));
      TellProgram(device->plug, completions);
    }
  }
  return Complete(irp, STATUS_SUCCESS);
}

NTSTATUS Forward(HostDevice* device, IRP* irp, RequestKind kind) {
  HostHandle* const handle = HandleOf(irp);
  auto request = Allocate<Request>();
  if (request == nullptr || handle == nullptr) {
    return Complete(irp, STATUS_INSUFFICIENT_RESOURCES);
  }
  request->kind = kind;
  request->handle_number = handle->number;
  request->handle = handle;
  request->irp = irp;
  if (InputLength(*request) > usb_bus::kMaxInput) {
    return Complete(irp, STATUS_INVALID_BUFFER_SIZE);
  }
  Completions completions;
  const NTSTATUS status = Enqueue(device, std::move(request), completions);
  return status == STATUS_PENDING ? status : Complete(irp, status);
}

}  // namespace usb_driver
