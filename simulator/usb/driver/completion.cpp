#include "simulator/usb/driver/completion.h"

#include <utility>

namespace usb_driver {
namespace {

constexpr size_t kKeptIrps = 128;

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
  IRP* released = irp;
  {
    const StateGuard guard;
    std::swap(released, kept_irps[oldest_kept_irp]);
    oldest_kept_irp = (oldest_kept_irp + 1) % kKeptIrps;
  }
  Release(released);
  return STATUS_MORE_PROCESSING_REQUIRED;
}

void SetResult(IRP* irp, NTSTATUS status, ULONG_PTR count) {
  irp->IoStatus.Status = status;
  irp->IoStatus.Information = count;
}

}  // namespace

NTSTATUS Complete(IRP* irp, NTSTATUS status, ULONG_PTR count) {
  SetResult(irp, status, count);
  IoCompleteRequest(irp, IO_NO_INCREMENT);
  return status;
}

void KeepWhenCompleted(IRP* irp) {
  IO_STACK_LOCATION* const stack = IoGetCurrentIrpStackLocation(irp);
  if (stack->CompletionRoutine != nullptr) {
    void** const context = irp->Tail.Overlay.DriverContext;
    context[kRoutineContext] = reinterpret_cast<void*>(stack->CompletionRoutine);
    context[kRoutineArgumentContext] = stack->Context;
    stack->CompletionRoutine = KeepCompleted;
  }
}

void ReleaseKeptIrps() {
  for (IRP* const kept : kept_irps) {
    Release(kept);
  }
}

Completions::Completions() { InitializeListHead(&requests_); }

Completions::~Completions() {
  while (!IsListEmpty(&requests_)) {
    const Pooled<Request> request = Unlink(At<Request>(requests_.Flink));
    if (request->irp != nullptr) {
      IoCompleteRequest(request->irp, IO_NO_INCREMENT);
    }
  }
  if (waiting_ != nullptr) {
    IoCompleteRequest(waiting_, IO_NO_INCREMENT);
  }
}

void Completions::Add(Pooled<Request> request, NTSTATUS status, ULONG_PTR count) {
  if (request->irp != nullptr) {
    SetResult(request->irp, status, count);
  }
  Append(&requests_, std::move(request));
}

void Completions::Add(IRP* waiting, NTSTATUS status, ULONG_PTR count) {
  SetResult(waiting, status, count);
  waiting_ = waiting;
}

}  // namespace usb_driver
