#include "simulator/usb/driver/traffic.h"

#include <algorithm>
#include <utility>

#include "simulator/usb/driver/bus.h"
#include "simulator/usb/driver/request_bytes.h"

namespace usb_driver {
namespace {

void EndListed(LIST_ENTRY* list,
               const HostHandle* handle,
               NTSTATUS status,
               Completions& completions) {
  for (LIST_ENTRY* entry = list->Flink; entry != list;) {
    auto* const request = At<Request>(entry);
    entry = entry->Flink;
    if (handle != nullptr && request->handle != handle) {
      continue;
    }
    if (request->irp != nullptr && !Claim(request->irp)) {
      RemoveEntryList(&request->link);
      // Its cancel routine will unlink it, so it is left as a list of its own.
      InitializeListHead(&request->link);
    } else {
      completions.Add(Unlink(request), status);
    }
  }
}

void WriteRecord(const Request& request, ULONG input_length, uint8_t* record) {
  usb_bus::Request header = {};
  header.id = request.id;
  header.handle = request.handle_number;
  header.kind = request.kind;
  header.control_code = ControlCode(request);
  header.length = input_length;
  header.room = Room(request);
  RtlZeroMemory(record, usb_bus::Aligned(sizeof(header) + input_length));
  RtlCopyMemory(record, &header, sizeof(header));
  if (input_length != 0) {
    RtlCopyMemory(record + sizeof(header), request.irp->AssociatedIrp.SystemBuffer, input_length);
  }
}

// Writes what has arrived to the buffer, as much as it holds; gives the length.
size_t TakeArrived(Plug* plug, uint8_t* buffer, size_t size) {
  size_t used = 0;
  while (!IsListEmpty(&plug->arrived)) {
    auto* const first = At<Request>(plug->arrived.Flink);
    const ULONG input_length = InputLength(*first);
    const size_t length = usb_bus::Aligned(sizeof(usb_bus::Request) + input_length);
    if (length > size - used) {
      break;
    }
    WriteRecord(*first, input_length, buffer + used);
    used += length;
    // The notice of a closed handle is not answered, so it ends here.
    if (Pooled<Request> request = Unlink(first); request->kind != usb_bus::RequestKind::kClosed) {
      Append(&plug->taken, std::move(request));
    }
  }
  return used;
}

}  // namespace

bool Claim(IRP* irp) { return IoSetCancelRoutine(irp, nullptr) != nullptr; }

void EndRequests(Plug* plug, const HostHandle* handle, NTSTATUS status, Completions& completions) {
  EndListed(&plug->arrived, handle, status, completions);
  EndListed(&plug->taken, handle, status, completions);
  EndListed(&plug->readers, handle, status, completions);
}

void EndReads(Plug* plug, const HostHandle* handle, NTSTATUS status, Completions& completions) {
  EndListed(&plug->readers, handle, status, completions);
}

void TellProgram(Plug* plug, Completions& completions) {
  IRP* const irp = plug->waiting;
  if (irp == nullptr || IsListEmpty(&plug->arrived) || !Claim(irp)) {
    return;
  }
  plug->waiting = nullptr;
  const IO_STACK_LOCATION* const stack = IoGetCurrentIrpStackLocation(irp);
  const size_t length = TakeArrived(plug,
                                    static_cast<uint8_t*>(irp->AssociatedIrp.SystemBuffer),
                                    stack->Parameters.DeviceIoControl.OutputBufferLength);
  completions.Add(irp, STATUS_SUCCESS, length);
}

void ServeReaders(Plug* plug, Completions& completions) {
  for (LIST_ENTRY* entry = plug->readers.Flink;
       entry != &plug->readers && !IsListEmpty(&plug->transfers);) {
    auto* const reader = At<Request>(entry);
    entry = entry->Flink;
    if (!Claim(reader->irp)) {
      continue;
    }
    auto* const transfer = At<Transfer>(plug->transfers.Flink);
    const ULONG count = std::min(transfer->length - transfer->taken, Room(*reader));
    RtlCopyMemory(OutputOf(*reader), transfer->bytes + transfer->taken, count);
    transfer->taken += count;
    if (transfer->taken == transfer->length) {
      Unlink(transfer);
    }
    completions.Add(Unlink(reader), STATUS_SUCCESS, count);
  }
}

}  // namespace usb_driver
