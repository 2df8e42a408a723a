// How IRPs end: at once, or after the state is unlocked; and how long their memory is kept.
#ifndef SIMULATOR_USB_DRIVER_COMPLETION_H_
#define SIMULATOR_USB_DRIVER_COMPLETION_H_

#include "simulator/usb/driver/kernel.h"
#include "simulator/usb/driver/memory.h"
#include "simulator/usb/driver/state.h"

namespace usb_driver {

// Places in an IRP that are the driver's. The first is for the request, the others are those of
// KeepWhenCompleted.
inline constexpr size_t kRequestContext = 0;
inline constexpr size_t kRoutineContext = 1;
inline constexpr size_t kRoutineArgumentContext = 2;

// Gives `status` back.
NTSTATUS Complete(IRP* irp, NTSTATUS status, ULONG_PTR count = 0);

// To be called for an IRP that is going to be pending.
//
// Wine 8 cancels an IRP by its address, on the thread that calls the driver. A late cancel can find
// the IRP completed, and at its address freed memory, or the IRP of another request. So the memory
// of completed IRPs is kept until no such cancel can come any more. This replaces the completion
// routine that Wine has put into the driver's own stack location. Windows puts none there, and
// nothing is kept.
void KeepWhenCompleted(IRP* irp);

// Ends all IRPs that are kept. To be called at unload.
void ReleaseKeptIrps();

// IRPs that are completed at the end of this object's life. Declare it before the StateGuard: the
// state must be unlocked by then.
class Completions {
 public:
  Completions();
  ~Completions();
  Completions(const Completions&) = delete;
  Completions& operator=(const Completions&) = delete;

  // Takes a request that is in no list, with its IRP if it has one.
  void Add(Pooled<Request> request, NTSTATUS status, ULONG_PTR count = 0);
  // The program's waiting call.
  void Add(IRP* waiting, NTSTATUS status, ULONG_PTR count = 0);

 private:
  LIST_ENTRY requests_;
  IRP* waiting_ = nullptr;
};

}  // namespace usb_driver

#endif  // SIMULATOR_USB_DRIVER_COMPLETION_H_
