// A bus of simulated USB devices for tests and the demo, made for Wine. Where a real receiver is on
// Windows, its own driver stands instead of this one.
//
// There is one control device, the bus. Who opens it can plug in one device per handle, and then
// carries out what hosts ask of it (bus.h).
//
// Wine tells of no CLEANUP, does not let an open be refused, and calls the driver on one thread;
// Windows differs in all three, and the driver is right for both.
#include <cstddef>

#include "simulator/usb/driver/bus.h"
#include "simulator/usb/driver/kernel.h"

namespace {

using usb_bus::Action;
using usb_bus::ActionKind;
using usb_bus::Reads;
using usb_bus::RequestKind;

constexpr ULONG kPoolTag = 0x6B6E6C72;  // "rlnk"

template <size_t kCount>
constexpr size_t Length(const wchar_t (&)[kCount]) {
  return kCount - 1;
}

constexpr wchar_t kBusDevice[] = L"\\Device\\RcvlinkUsbBus";
constexpr wchar_t kBusLink[] = L"\\DosDevices\\rcvlink-usb-bus";
constexpr wchar_t kDevicePrefix[] = L"\\Device\\RcvlinkUsb";
constexpr wchar_t kLinkPrefix[] = L"\\DosDevices\\";
constexpr size_t kMaxDigits = 10;
constexpr size_t kDeviceNameLength = Length(kDevicePrefix) + kMaxDigits;

// The lowest two bits of a control code.
constexpr ULONG kMethodMask = 3;

template <size_t kCount>
UNICODE_STRING Constant(const wchar_t (&text)[kCount]) {
  const auto bytes = static_cast<USHORT>(Length(text) * sizeof(wchar_t));
  return {bytes, bytes, const_cast<wchar_t*>(text)};
}

// A name that is put together in place.
template <size_t kCapacity>
class Name {
 public:
  void Clear() { length_ = 0; }
  void Append(const wchar_t* text, size_t length) {
    for (size_t i = 0; i < length && length_ < kCapacity; ++i) {
      text_[length_++] = text[i];
    }
  }
  void Append(ULONG number) {
    wchar_t digits[kMaxDigits];
    size_t first = kMaxDigits;
    do {
      digits[--first] = static_cast<wchar_t>(L'0' + number % 10);
      number /= 10;
    } while (number != 0);
    Append(digits + first, kMaxDigits - first);
  }
  UNICODE_STRING Get() {
    const auto bytes = static_cast<USHORT>(length_ * sizeof(wchar_t));
    return {bytes, bytes, text_};
  }

 private:
  wchar_t text_[kCapacity];
  size_t length_;
};

// Things that are linked have the link as their first member.
template <typename T>
T* At(LIST_ENTRY* entry) {
  static_assert(offsetof(T, link) == 0);
  return reinterpret_cast<T*>(entry);
}

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
  // The notice of its end. It is made beforehand, as a close cannot fail.
  Request* closed;
};

// What a host asks for.
struct Request {
  LIST_ENTRY link;
  uint64_t id;
  RequestKind kind;
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

// A handle of the bus, and the device that was plugged in through it.
struct Plug {
  PlugState state;
  HostDevice* device;
  Name<Length(kLinkPrefix) + usb_bus::kMaxNameLength> link_name;
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

// Guards everything below, and all of the structures above.
KSPIN_LOCK state_lock;
DEVICE_OBJECT* bus_device;
LIST_ENTRY host_devices;
ULONG last_device;
ULONG last_handle;
uint64_t last_request;

class StateGuard {
 public:
  StateGuard() { KeAcquireSpinLock(&state_lock, &irql_); }
  ~StateGuard() { KeReleaseSpinLock(&state_lock, irql_); }
  StateGuard(const StateGuard&) = delete;
  StateGuard& operator=(const StateGuard&) = delete;

 private:
  KIRQL irql_;
};

// The memory is zero; null when there is none.
template <typename T>
T* Allocate(size_t more_bytes = 0) {
  const size_t size = sizeof(T) + more_bytes;
  void* const memory = ExAllocatePoolWithTag(NonPagedPool, size, kPoolTag);
  if (memory != nullptr) {
    RtlZeroMemory(memory, size);
  }
  return static_cast<T*>(memory);
}

template <typename T>
void Free(T* memory) {
  if (memory != nullptr) {
    ExFreePoolWithTag(memory, kPoolTag);
  }
}

NTSTATUS Complete(IRP* irp, NTSTATUS status, ULONG_PTR count = 0) {
  irp->IoStatus.Status = status;
  irp->IoStatus.Information = count;
  IoCompleteRequest(irp, IO_NO_INCREMENT);
  return status;
}

// ---- IRPs that are over
//
// Wine 8 cancels an IRP by its address, on the thread that calls the driver. A cancel that is on its
// way while the IRP completes meets whatever is at that address then: memory that was freed, or the
// IRP of quite another request. So the memory of IRPs that are over is kept for a while, until no
// such cancel can be on its way any more. It goes by the completion routine that Wine has put into
// the driver's own stack location; Windows does not put one there, and nothing is kept.

constexpr size_t kKeptIrps = 128;

// Places in an IRP that are the driver's.
constexpr size_t kRequestContext = 0;
constexpr size_t kRoutineContext = 1;
constexpr size_t kRoutineArgumentContext = 2;

IRP* kept_irps[kKeptIrps];
size_t oldest_kept_irp;

// Ends an IRP that was completed. The state must not be locked.
void Release(IRP* kept) {
  if (kept != nullptr) {
    IoCompleteRequest(kept, IO_NO_INCREMENT);
  }
}

NTSTATUS NTAPI KeepCompleted(DEVICE_OBJECT* device, IRP* irp, void*) {
  void** const context = irp->Tail.Overlay.DriverContext;
  const auto routine = reinterpret_cast<PIO_COMPLETION_ROUTINE>(context[kRoutineContext]);
  const NTSTATUS status = routine(device, irp, context[kRoutineArgumentContext]);
  if (status == STATUS_MORE_PROCESSING_REQUIRED) {
    return status;
  }
  IRP* released = nullptr;
  {
    const StateGuard guard;
    released = kept_irps[oldest_kept_irp];
    kept_irps[oldest_kept_irp] = irp;
    oldest_kept_irp = (oldest_kept_irp + 1) % kKeptIrps;
  }
  Release(released);
  return STATUS_MORE_PROCESSING_REQUIRED;
}

// To be called for an IRP that is going to be pending.
void KeepWhenCompleted(IRP* irp) {
  IO_STACK_LOCATION* const stack = IoGetCurrentIrpStackLocation(irp);
  if (stack->CompletionRoutine != nullptr) {
    void** const context = irp->Tail.Overlay.DriverContext;
    context[kRoutineContext] = reinterpret_cast<void*>(stack->CompletionRoutine);
    context[kRoutineArgumentContext] = stack->Context;
    stack->CompletionRoutine = KeepCompleted;
  }
}

// IRPs that are to be completed once the state is no longer locked.
class Completions {
 public:
  Completions() { InitializeListHead(&requests_); }
  ~Completions() {
    while (!IsListEmpty(&requests_)) {
      auto* const request = At<Request>(RemoveHeadList(&requests_));
      if (request->irp != nullptr) {
        IoCompleteRequest(request->irp, IO_NO_INCREMENT);
      }
      Free(request);
    }
    if (waiting_ != nullptr) {
      IoCompleteRequest(waiting_, IO_NO_INCREMENT);
    }
  }
  Completions(const Completions&) = delete;
  Completions& operator=(const Completions&) = delete;

  // Takes a request that is in no list, with its IRP if it has one.
  void Add(Request* request, NTSTATUS status, ULONG_PTR count = 0) {
    if (request->irp != nullptr) {
      request->irp->IoStatus.Status = status;
      request->irp->IoStatus.Information = count;
    }
    InsertTailList(&requests_, &request->link);
  }
  // The program's waiting call.
  void Add(IRP* waiting, NTSTATUS status, ULONG_PTR count = 0) {
    waiting->IoStatus.Status = status;
    waiting->IoStatus.Information = count;
    waiting_ = waiting;
  }

 private:
  LIST_ENTRY requests_;
  IRP* waiting_ = nullptr;
};

// ---- The bytes of a request

const IO_STACK_LOCATION* StackOf(const Request& request) {
  return IoGetCurrentIrpStackLocation(request.irp);
}

ULONG MethodOf(const IO_STACK_LOCATION* stack) {
  return stack->Parameters.DeviceIoControl.IoControlCode & kMethodMask;
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
      return MethodOf(StackOf(request)) == METHOD_IN_DIRECT
                 ? 0
                 : StackOf(request)->Parameters.DeviceIoControl.OutputBufferLength;
    case RequestKind::kRead:
      return StackOf(request)->Parameters.Read.Length;
    default:
      return 0;
  }
}

// Where the bytes for the host go; null when that cannot be reached.
void* OutputOf(const Request& request) {
  if (request.kind == RequestKind::kControl && MethodOf(StackOf(request)) == METHOD_OUT_DIRECT) {
    return request.irp->MdlAddress == nullptr
               ? nullptr
               : MmGetSystemAddressForMdlSafe(request.irp->MdlAddress, NormalPagePriority);
  }
  return request.irp->AssociatedIrp.SystemBuffer;
}

// ---- Requests and transfers on their way. For all of these the state must be locked.

// Takes an IRP back from its cancel routine; false when that is already on its way and will
// complete the IRP.
bool Claim(IRP* irp) { return IoSetCancelRoutine(irp, nullptr) != nullptr; }

// Ends the requests of a list that `wanted` is true for.
template <typename Predicate>
void EndRequests(LIST_ENTRY* list, NTSTATUS status, Completions& completions, Predicate wanted) {
  for (LIST_ENTRY* entry = list->Flink; entry != list;) {
    auto* const request = At<Request>(entry);
    entry = entry->Flink;
    if (!wanted(*request)) {
      continue;
    }
    RemoveEntryList(&request->link);
    if (request->irp != nullptr && !Claim(request->irp)) {
      // Its cancel routine takes it out of a list: from now on of one of its own.
      InitializeListHead(&request->link);
    } else {
      completions.Add(request, status);
    }
  }
}

void WriteRecord(const Request& request, ULONG input_length, uint8_t* record) {
  usb_bus::Request header = {};
  header.id = request.id;
  header.handle = request.handle_number;
  header.kind = request.kind;
  if (request.kind == RequestKind::kControl) {
    header.control_code = StackOf(request)->Parameters.DeviceIoControl.IoControlCode;
  }
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
    auto* const request = At<Request>(plug->arrived.Flink);
    const ULONG input_length = InputLength(*request);
    const size_t length = usb_bus::Aligned(sizeof(usb_bus::Request) + input_length);
    if (length > size - used) {
      break;
    }
    WriteRecord(*request, input_length, buffer + used);
    used += length;
    RemoveEntryList(&request->link);
    if (request->kind == RequestKind::kClosed) {
      Free(request);
    } else {
      InsertTailList(&plug->taken, &request->link);
    }
  }
  return used;
}

// Hands what has arrived to the program if it waits for that.
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

// Gives transfers to the reads that wait for them.
void ServeReaders(Plug* plug, Completions& completions) {
  for (LIST_ENTRY* entry = plug->readers.Flink;
       entry != &plug->readers && !IsListEmpty(&plug->transfers);) {
    auto* const request = At<Request>(entry);
    entry = entry->Flink;
    if (!Claim(request->irp)) {
      continue;
    }
    RemoveEntryList(&request->link);
    auto* const transfer = At<Transfer>(plug->transfers.Flink);
    const ULONG left = transfer->length - transfer->taken;
    const ULONG room = Room(*request);
    const ULONG count = left < room ? left : room;
    RtlCopyMemory(OutputOf(*request), transfer->bytes + transfer->taken, count);
    transfer->taken += count;
    if (transfer->taken == transfer->length) {
      RemoveEntryList(&transfer->link);
      Free(transfer);
    }
    completions.Add(request, STATUS_SUCCESS, count);
  }
}

// ---- The host's side

void NTAPI CancelRequest(DEVICE_OBJECT*, IRP* irp) {
  IoReleaseCancelSpinLock(irp->CancelIrql);
  auto* const request = static_cast<Request*>(irp->Tail.Overlay.DriverContext[kRequestContext]);
  {
    const StateGuard guard;
    RemoveEntryList(&request->link);
  }
  Free(request);
  Complete(irp, STATUS_CANCELLED);
}

// Puts a request where it waits for the program, or for a transfer.
NTSTATUS Enqueue(HostDevice* device, Request* request, Completions& completions) {
  const StateGuard guard;
  Plug* const plug = device->plug;
  if (plug == nullptr) {
    return STATUS_DEVICE_NOT_CONNECTED;
  }
  request->id = ++last_request;
  request->irp->Tail.Overlay.DriverContext[kRequestContext] = request;
  KeepWhenCompleted(request->irp);
  IoSetCancelRoutine(request->irp, CancelRequest);
  if (request->irp->Cancel && Claim(request->irp)) {
    return STATUS_CANCELLED;
  }
  IoMarkIrpPending(request->irp);
  if (request->kind == RequestKind::kRead && request->handle->gets_transfers) {
    InsertTailList(&plug->readers, &request->link);
    ServeReaders(plug, completions);
  } else {
    InsertTailList(&plug->arrived, &request->link);
    TellProgram(plug, completions);
  }
  return STATUS_PENDING;
}

NTSTATUS Forward(HostDevice* device, IRP* irp, RequestKind kind) {
  FILE_OBJECT* const file = IoGetCurrentIrpStackLocation(irp)->FileObject;
  auto* const handle = static_cast<HostHandle*>(file->FsContext);
  auto* const request = Allocate<Request>();
  if (request == nullptr || handle == nullptr) {
    Free(request);
    return Complete(irp, STATUS_INSUFFICIENT_RESOURCES);
  }
  request->kind = kind;
  request->handle_number = handle->number;
  request->handle = handle;
  request->irp = irp;

  Completions completions;
  const NTSTATUS status = InputLength(*request) > usb_bus::kMaxInput
                              ? STATUS_INVALID_BUFFER_SIZE
                              : Enqueue(device, request, completions);
  if (status != STATUS_PENDING) {
    Free(request);
    Complete(irp, status);
  }
  return status;
}

NTSTATUS OpenByHost(HostDevice* device, IRP* irp) {
  FILE_OBJECT* const file = IoGetCurrentIrpStackLocation(irp)->FileObject;
  file->FsContext = nullptr;
  auto* const handle = Allocate<HostHandle>();
  auto* const closed = Allocate<Request>();
  if (handle == nullptr || closed == nullptr) {
    Free(handle);
    Free(closed);
    return Complete(irp, STATUS_INSUFFICIENT_RESOURCES);
  }
  closed->kind = RequestKind::kClosed;
  handle->closed = closed;
  file->FsContext = handle;
  {
    const StateGuard guard;
    handle->number = ++last_handle;
    closed->handle_number = handle->number;
    ++device->open_handles;
  }
  return Complete(irp, STATUS_SUCCESS);
}

// Ends what is still pending on a handle that is being closed. The state must be locked.
void EndRequestsOf(const HostHandle* handle, Plug* plug, Completions& completions) {
  const auto of_handle = [handle](const Request& request) { return request.handle == handle; };
  EndRequests(&plug->arrived, STATUS_CANCELLED, completions, of_handle);
  EndRequests(&plug->taken, STATUS_CANCELLED, completions, of_handle);
  EndRequests(&plug->readers, STATUS_CANCELLED, completions, of_handle);
}

NTSTATUS CleanUpForHost(HostDevice* device, IRP* irp) {
  FILE_OBJECT* const file = IoGetCurrentIrpStackLocation(irp)->FileObject;
  if (file->FsContext != nullptr) {
    Completions completions;
    const StateGuard guard;
    if (device->plug != nullptr) {
      EndRequestsOf(static_cast<HostHandle*>(file->FsContext), device->plug, completions);
    }
  }
  return Complete(irp, STATUS_SUCCESS);
}

NTSTATUS CloseByHost(HostDevice* device, IRP* irp) {
  FILE_OBJECT* const file = IoGetCurrentIrpStackLocation(irp)->FileObject;
  auto* const handle = static_cast<HostHandle*>(file->FsContext);
  file->FsContext = nullptr;
  if (handle == nullptr) {
    return Complete(irp, STATUS_SUCCESS);
  }
  {
    Completions completions;
    const StateGuard guard;
    --device->open_handles;
    if (device->plug == nullptr) {
      Free(handle->closed);
    } else {
      EndRequestsOf(handle, device->plug, completions);
      InsertTailList(&device->plug->arrived, &handle->closed->link);
      TellProgram(device->plug, completions);
    }
  }
  Free(handle);
  return Complete(irp, STATUS_SUCCESS);
}

// ---- Plugging in and out

bool IsNameCharacter(wchar_t character) {
  return (character >= L'A' && character <= L'Z') || (character >= L'a' && character <= L'z') ||
         (character >= L'0' && character <= L'9') || character == L'-' || character == L'_' ||
         character == L'.';
}

bool IsName(const wchar_t* text, size_t length) {
  if (length == 0 || length > usb_bus::kMaxNameLength) {
    return false;
  }
  for (size_t i = 0; i < length; ++i) {
    if (!IsNameCharacter(text[i])) {
      return false;
    }
  }
  return true;
}

Name<kDeviceNameLength> DeviceName(ULONG number) {
  Name<kDeviceNameLength> name;
  name.Clear();
  name.Append(kDevicePrefix, Length(kDevicePrefix));
  name.Append(number);
  return name;
}

bool ChangeState(Plug* plug, PlugState from, PlugState to) {
  const StateGuard guard;
  if (plug->state != from) {
    return false;
  }
  plug->state = to;
  return true;
}

// Gives a device that is not in use to the plug; null when there is none.
HostDevice* ReuseDevice(Plug* plug) {
  const StateGuard guard;
  for (LIST_ENTRY* entry = host_devices.Flink; entry != &host_devices; entry = entry->Flink) {
    auto* const device = At<HostDevice>(entry);
    if (device->plug == nullptr && device->open_handles == 0) {
      device->plug = plug;
      return device;
    }
  }
  return nullptr;
}

NTSTATUS MakeDevice(DRIVER_OBJECT* driver, Plug* plug, HostDevice** made) {
  ULONG number = 0;
  {
    const StateGuard guard;
    number = ++last_device;
  }
  Name<kDeviceNameLength> name = DeviceName(number);
  UNICODE_STRING text = name.Get();
  DEVICE_OBJECT* object = nullptr;
  const NTSTATUS status =
      IoCreateDevice(driver, sizeof(HostDevice), &text, FILE_DEVICE_UNKNOWN, 0, FALSE, &object);
  if (!NT_SUCCESS(status)) {
    return status;
  }
  auto* const device = static_cast<HostDevice*>(object->DeviceExtension);
  device->object = object;
  device->number = number;
  device->plug = plug;
  device->open_handles = 0;
  {
    const StateGuard guard;
    InsertTailList(&host_devices, &device->link);
  }
  object->Flags |= DO_BUFFERED_IO;
  object->Flags &= ~static_cast<ULONG>(DO_DEVICE_INITIALIZING);
  *made = device;
  return STATUS_SUCCESS;
}

NTSTATUS PlugIn(DRIVER_OBJECT* driver, Plug* plug, IRP* irp) {
  const IO_STACK_LOCATION* const stack = IoGetCurrentIrpStackLocation(irp);
  const auto* const name = static_cast<const wchar_t*>(irp->AssociatedIrp.SystemBuffer);
  const size_t bytes = stack->Parameters.DeviceIoControl.InputBufferLength;
  const size_t length = bytes / sizeof(wchar_t);
  if (bytes % sizeof(wchar_t) != 0 || !IsName(name, length)) {
    return STATUS_INVALID_PARAMETER;
  }
  if (!ChangeState(plug, PlugState::kNew, PlugState::kChanging)) {
    return STATUS_INVALID_DEVICE_STATE;
  }
  plug->link_name.Clear();
  plug->link_name.Append(kLinkPrefix, Length(kLinkPrefix));
  plug->link_name.Append(name, length);

  HostDevice* device = ReuseDevice(plug);
  NTSTATUS status = device == nullptr ? MakeDevice(driver, plug, &device) : STATUS_SUCCESS;
  if (NT_SUCCESS(status)) {
    Name<kDeviceNameLength> device_name = DeviceName(device->number);
    UNICODE_STRING target = device_name.Get();
    UNICODE_STRING link = plug->link_name.Get();
    status = IoCreateSymbolicLink(&link, &target);
  }
  const StateGuard guard;
  if (NT_SUCCESS(status)) {
    plug->device = device;
    plug->state = PlugState::kPluggedIn;
  } else {
    if (device != nullptr) {
      device->plug = nullptr;
    }
    plug->state = PlugState::kNew;
  }
  return status;
}

NTSTATUS Unplug(Plug* plug) {
  if (!ChangeState(plug, PlugState::kPluggedIn, PlugState::kChanging)) {
    return STATUS_INVALID_DEVICE_STATE;
  }
  UNICODE_STRING link = plug->link_name.Get();
  IoDeleteSymbolicLink(&link);
  Completions completions;
  const StateGuard guard;
  const auto any = [](const Request&) { return true; };
  EndRequests(&plug->arrived, STATUS_DEVICE_NOT_CONNECTED, completions, any);
  EndRequests(&plug->taken, STATUS_DEVICE_NOT_CONNECTED, completions, any);
  EndRequests(&plug->readers, STATUS_DEVICE_NOT_CONNECTED, completions, any);
  while (!IsListEmpty(&plug->transfers)) {
    Free(At<Transfer>(RemoveHeadList(&plug->transfers)));
  }
  if (plug->waiting != nullptr && Claim(plug->waiting)) {
    completions.Add(plug->waiting, STATUS_DEVICE_NOT_CONNECTED);
    plug->waiting = nullptr;
  }
  plug->device->plug = nullptr;
  plug->device = nullptr;
  plug->state = PlugState::kGone;
  return STATUS_SUCCESS;
}

// ---- The program's side

Plug* PlugOf(IRP* irp) {
  return static_cast<Plug*>(IoGetCurrentIrpStackLocation(irp)->FileObject->FsContext);
}

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
    EndRequests(&plug->readers, STATUS_CANCELLED, completions, [handle](const Request& request) {
      return request.handle == handle;
    });
  }
}

NTSTATUS CarryOutAnswer(Plug* plug,
                        const Action& action,
                        const uint8_t* bytes,
                        Completions& completions) {
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
  // Whatever becomes of the request, it was carried out.
  ChangeReads(plug, request->handle, action.reads, completions);
  if (!Claim(request->irp)) {
    return STATUS_SUCCESS;
  }
  RemoveEntryList(&request->link);
  if (action.length != 0) {
    RtlCopyMemory(OutputOf(*request), bytes, action.length);
  }
  completions.Add(request, status, NT_SUCCESS(status) ? action.count : 0);
  return STATUS_SUCCESS;
}

NTSTATUS CarryOutSend(Plug* plug,
                      const Action& action,
                      const uint8_t* bytes,
                      Completions& completions) {
  if (action.length == 0) {
    return STATUS_INVALID_PARAMETER;
  }
  auto* const transfer = Allocate<Transfer>(action.length);
  if (transfer == nullptr) {
    return STATUS_INSUFFICIENT_RESOURCES;
  }
  transfer->length = action.length;
  RtlCopyMemory(transfer->bytes, bytes, action.length);
  InsertTailList(&plug->transfers, &transfer->link);
  ServeReaders(plug, completions);
  return STATUS_SUCCESS;
}

// The state must be locked.
NTSTATUS CarryOut(Plug* plug, const uint8_t* input, size_t size, Completions& completions) {
  if (plug->state != PlugState::kPluggedIn) {
    return STATUS_INVALID_DEVICE_STATE;
  }
  for (size_t at = 0; at < size;) {
    Action action;
    if (size - at < sizeof(action)) {
      return STATUS_INVALID_PARAMETER;
    }
    RtlCopyMemory(&action, input + at, sizeof(action));
    const uint8_t* const bytes = input + at + sizeof(action);
    if (action.length > size - at - sizeof(action)) {
      return STATUS_INVALID_PARAMETER;
    }
    NTSTATUS status = STATUS_INVALID_PARAMETER;
    if (action.kind == ActionKind::kAnswer) {
      status = CarryOutAnswer(plug, action, bytes, completions);
    } else if (action.kind == ActionKind::kSend) {
      status = CarryOutSend(plug, action, bytes, completions);
    }
    if (!NT_SUCCESS(status)) {
      return status;
    }
    at += usb_bus::Aligned(sizeof(action) + action.length);
  }
  return STATUS_SUCCESS;
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

// The state must be locked.
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
  const NTSTATUS status = CarryOut(plug,
                                   static_cast<const uint8_t*>(irp->AssociatedIrp.SystemBuffer),
                                   stack->Parameters.DeviceIoControl.InputBufferLength,
                                   completions);
  return NT_SUCCESS(status) && wait ? Wait(plug, irp, completions) : status;
}

NTSTATUS OpenBus(IRP* irp) {
  auto* const plug = Allocate<Plug>();
  IoGetCurrentIrpStackLocation(irp)->FileObject->FsContext = plug;
  if (plug == nullptr) {
    return Complete(irp, STATUS_INSUFFICIENT_RESOURCES);
  }
  plug->state = PlugState::kNew;
  InitializeListHead(&plug->arrived);
  InitializeListHead(&plug->taken);
  InitializeListHead(&plug->readers);
  InitializeListHead(&plug->transfers);
  return Complete(irp, STATUS_SUCCESS);
}

NTSTATUS CleanUpBus(IRP* irp) {
  Plug* const plug = PlugOf(irp);
  if (plug != nullptr) {
    Unplug(plug);
  }
  return Complete(irp, STATUS_SUCCESS);
}

NTSTATUS CloseBus(IRP* irp) {
  Plug* const plug = PlugOf(irp);
  IoGetCurrentIrpStackLocation(irp)->FileObject->FsContext = nullptr;
  if (plug != nullptr) {
    Unplug(plug);
    Free(plug);
  }
  return Complete(irp, STATUS_SUCCESS);
}

NTSTATUS ControlBus(DRIVER_OBJECT* driver, Plug* plug, IRP* irp, Completions& completions) {
  const IO_STACK_LOCATION* const stack = IoGetCurrentIrpStackLocation(irp);
  if (plug == nullptr) {
    return STATUS_INSUFFICIENT_RESOURCES;
  }
  switch (stack->Parameters.DeviceIoControl.IoControlCode) {
    case usb_bus::kPlugIn:
      return PlugIn(driver, plug, irp);
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

// ---- What the system calls

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
    Completions completions;
    const NTSTATUS status = ControlBus(object->DriverObject, PlugOf(irp), irp, completions);
    return status == STATUS_PENDING ? status : Complete(irp, status);
  }
  // The buffers of these codes are the caller's own memory, which is none of our business.
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
  for (IRP* const kept : kept_irps) {
    Release(kept);
  }
  while (!IsListEmpty(&host_devices)) {
    IoDeleteDevice(At<HostDevice>(RemoveHeadList(&host_devices))->object);
  }
  IoDeleteDevice(bus_device);
}

}  // namespace

extern "C" NTSTATUS NTAPI DriverEntry(DRIVER_OBJECT* driver, UNICODE_STRING* registry_path);

extern "C" NTSTATUS NTAPI DriverEntry(DRIVER_OBJECT* driver, UNICODE_STRING*) {
  KeInitializeSpinLock(&state_lock);
  InitializeListHead(&host_devices);
  driver->MajorFunction[IRP_MJ_CREATE] = DispatchCreate;
  driver->MajorFunction[IRP_MJ_CLEANUP] = DispatchCleanup;
  driver->MajorFunction[IRP_MJ_CLOSE] = DispatchClose;
  driver->MajorFunction[IRP_MJ_DEVICE_CONTROL] = DispatchControl;
  driver->MajorFunction[IRP_MJ_READ] = DispatchRead;
  driver->MajorFunction[IRP_MJ_WRITE] = DispatchWrite;
  driver->DriverUnload = UnloadDriver;

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
