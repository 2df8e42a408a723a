#include "simulator/usb/driver/program.h"

#include <utility>

#include "simulator/usb/driver/bus.h"
#include "simulator/usb/driver/completion.h"
#include "simulator/usb/driver/plugging.h"
#include "simulator/usb/driver/request_bytes.h"
#include "simulator/usb/driver/state.h"
#include "simulator/usb/driver/traffic.h"

namespace usb_driver {
namespace {

using usb_bus::Action;
using usb_bus::ActionKind;
using usb_bus::Reads;
using usb_bus::RequestKind;

Plug* PlugOf(IRP* irp) { return static_cast<Plug*>(ContextOf(irp)); }

NTSTATUS PlugInNamed(DRIVER_OBJECT* driver, Plug* plug, IRP* irp) {
  const IO_STACK_LOCATION* const stack = IoGetCurrentIrpStackLocation(irp);
  const ULONG bytes = stack->Parameters.DeviceIoControl.InputBufferLength;
  return bytes % sizeof(wchar_t) != 0
             ? STATUS_INVALID_PARAMETER
             : PlugIn(driver,
                      plug,
                      static_cast<const wchar_t*>(irp->AssociatedIrp.SystemBuffer),
                      bytes / sizeof(wchar_t));
}

void NTAPI CancelWaiting(DEVICE_OBJECT*, IRP* irp) {
  IoReleaseCancelSpinLock(irp->CancelIrql);
  {
    const StateGuard guard;
    if (PlugOf(irp)->waiting == irp) {
      PlugOf(irp)->waiting = nullptr;
    }
  }
  Complete(irp, STATUS_CANCELLED);
}

// From here to Wait the state must be locked.

Request* FindTaken(Plug* plug, uint64_t id) {
  for (LIST_ENTRY* entry = plug->taken.Flink; entry != &plug->taken; entry = entry->Flink) {
    auto* const request = At<Request>(entry);
    if (request->id == id) {
      return request;
    }
  }
  return nullptr;
}

// Whether an answer is one that the request can have.
bool Fits(const Action& action, const Request& request) {
  if (!NT_SUCCESS(static_cast<NTSTATUS>(action.status))) {
    return action.length == 0;
  }
  if (request.kind == RequestKind::kWrite) {
    return action.length == 0 && action.count <= InputLength(request);
  }
  return action.count == action.length && action.length <= Room(request) &&
         (action.length == 0 || OutputOf(request) != nullptr);
}

void ChangeReads(Plug* plug, HostHandle* handle, Reads reads, Completions& completions) {
  if (reads == Reads::kGetTransfers) {
    handle->gets_transfers = true;
  } else if (reads == Reads::kAreRequests) {
    handle->gets_transfers = false;
    EndReads(plug, handle, STATUS_CANCELLED, completions);
  }
}

NTSTATUS Answer(Plug* plug, const Action& action, const uint8_t* bytes, Completions& completions) {
  const auto status = static_cast<NTSTATUS>(action.status);
  if (status == STATUS_PENDING) {
    return STATUS_INVALID_PARAMETER;
  }
  Request* const request = FindTaken(plug, action.id);
  if (request == nullptr) {
    return STATUS_SUCCESS;
  }
  if (!Fits(action, *request)) {
    return STATUS_INVALID_PARAMETER;
  }
  // Before the claim: the program has executed the request, cancelled or not.
  ChangeReads(plug, request->handle, action.reads, completions);
  if (!Claim(request->irp)) {
    return STATUS_SUCCESS;
  }
  if (action.length != 0) {
    RtlCopyMemory(OutputOf(*request), bytes, action.length);
  }
  completions.Add(Unlink(request), status, NT_SUCCESS(status) ? action.count : 0);
  return STATUS_SUCCESS;
}

NTSTATUS Send(Plug* plug, const Action& action, const uint8_t* bytes, Completions& completions) {
  if (action.length == 0) {
    return STATUS_INVALID_PARAMETER;
  }
  auto transfer = Allocate<Transfer>(action.length);
  if (transfer == nullptr) {
    return STATUS_INSUFFICIENT_RESOURCES;
  }
  transfer->length = action.length;
  RtlCopyMemory(transfer->bytes, bytes, action.length);
  Append(&plug->transfers, std::move(transfer));
  ServeReaders(plug, completions);
  return STATUS_SUCCESS;
}

NTSTATUS Execute(Plug* plug, const Action& action, const uint8_t* bytes, Completions& completions) {
  switch (action.kind) {
    case ActionKind::kAnswer:
      return Answer(plug, action, bytes, completions);
    case ActionKind::kSend:
      return Send(plug, action, bytes, completions);
    default:
      return STATUS_INVALID_PARAMETER;
  }
}

NTSTATUS ExecuteAll(Plug* plug, const uint8_t* input, size_t size, Completions& completions) {
  if (plug->state != PlugState::kPluggedIn) {
    return STATUS_INVALID_DEVICE_STATE;
  }
  for (size_t at = 0; at < size;) {
    Action action;
    if (size - at < sizeof(action)) {
      return STATUS_INVALID_PARAMETER;
    }
    RtlCopyMemory(&action, input + at, sizeof(action));
    if (action.length > size - at - sizeof(action)) {
      return STATUS_INVALID_PARAMETER;
    }
    const NTSTATUS status = Execute(plug, action, input + at + sizeof(action), completions);
    if (!NT_SUCCESS(status)) {
      return status;
    }
    at += usb_bus::Aligned(sizeof(action) + action.length);
  }
  return STATUS_SUCCESS;
}

NTSTATUS Wait(Plug* plug, IRP* irp, Completions& completions) {
  if (plug->waiting != nullptr) {
    return STATUS_INVALID_DEVICE_STATE;
  }
  KeepWhenCompleted(irp);
  IoSetCancelRoutine(irp, CancelWaiting);
  if (irp->Cancel && Claim(irp)) {
    return STATUS_CANCELLED;
  }
  IoMarkIrpPending(irp);
  plug->waiting = irp;
  TellProgram(plug, completions);
  return STATUS_PENDING;
}

NTSTATUS Act(Plug* plug, IRP* irp, bool wait, Completions& completions) {
  const IO_STACK_LOCATION* const stack = IoGetCurrentIrpStackLocation(irp);
  const size_t room = stack->Parameters.DeviceIoControl.OutputBufferLength;
  if (wait && room < usb_bus::kRequestBufferSize) {
    return STATUS_BUFFER_TOO_SMALL;
  }
  const StateGuard guard;
  const NTSTATUS status = ExecuteAll(plug,
                                     static_cast<const uint8_t*>(irp->AssociatedIrp.SystemBuffer),
                                     stack->Parameters.DeviceIoControl.InputBufferLength,
                                     completions);
  return NT_SUCCESS(status) && wait ? Wait(plug, irp, completions) : status;
}

NTSTATUS Control(DRIVER_OBJECT* driver, Plug* plug, IRP* irp, Completions& completions) {
  if (plug == nullptr) {
    return STATUS_INSUFFICIENT_RESOURCES;
  }
  switch (IoGetCurrentIrpStackLocation(irp)->Parameters.DeviceIoControl.IoControlCode) {
    case usb_bus::kPlugIn:
      return PlugInNamed(driver, plug, irp);
    case usb_bus::kUnplug:
      return Unplug(plug);
    case usb_bus::kAct:
      return Act(plug, irp, /*wait=*/false, completions);
    case usb_bus::kActAndWait:
      return Act(plug, irp, /*wait=*/true, completions);
    default:
      return STATUS_INVALID_DEVICE_REQUEST;
  }
}

}  // namespace

NTSTATUS OpenBus(IRP* irp) {
  auto plug = Allocate<Plug>();
  if (plug == nullptr) {
    ContextOf(irp) = nullptr;
    return Complete(irp, STATUS_INSUFFICIENT_RESOURCES);
  }
  plug->state = PlugState::kNew;
  InitializeListHead(&plug->arrived);
  InitializeListHead(&plug->taken);
  InitializeListHead(&plug->readers);
  InitializeListHead(&plug->transfers);
  ContextOf(irp) = plug.release();
  return Complete(irp, STATUS_SUCCESS);
}

NTSTATUS CleanUpBus(IRP* irp) {
  if (Plug* const plug = PlugOf(irp); plug != nullptr) {
    Unplug(plug);
  }
  return Complete(irp, STATUS_SUCCESS);
}

NTSTATUS CloseBus(IRP* irp) {
  const Pooled<Plug> plug(PlugOf(irp));
  ContextOf(irp) = nullptr;
  if (plug != nullptr) {
    Unplug(plug.get());
  }
  return Complete(irp, STATUS_SUCCESS);
}

NTSTATUS ControlBus(DRIVER_OBJECT* driver, IRP* irp) {
  Completions completions;
  const NTSTATUS status = Control(driver, PlugOf(irp), irp, completions);
  return status == STATUS_PENDING ? status : Complete(irp, status);
}

}  // namespace usb_driver
