#include "simulator/usb/driver/state.h"

namespace usb_driver {
namespace {

KSPIN_LOCK state_lock;

}  // namespace

void InitializeStateLock() { KeInitializeSpinLock(&state_lock); }

StateGuard::StateGuard() { KeAcquireSpinLock(&state_lock, &irql_); }

StateGuard::~StateGuard() { KeReleaseSpinLock(&state_lock, irql_); }

}  // namespace usb_driver
