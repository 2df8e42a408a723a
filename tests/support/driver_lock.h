// The lock of a driver, for tests: its handle as in the report, and whether it is held.
#ifndef RCVLINK_TESTS_SUPPORT_DRIVER_LOCK_H_
#define RCVLINK_TESTS_SUPPORT_DRIVER_LOCK_H_

#include <cstdint>
#include <cstdio>
#include <string>
#include <thread>

#include "platform/handle.h"
#include "receiver/protocol.h"

// A driver that gives access to the handle of its lock.
template <typename Driver>
class WithLockText : public Driver {
 public:
  using Driver::Driver;

  // As the report writes a handle: sixteen digits.
  std::string LockText() const {
    char digits[32] = {};
    const auto value = reinterpret_cast<uintptr_t>(this->connection_lock_.handle());
    std::snprintf(digits, sizeof(digits), "[0x%016llX]", static_cast<unsigned long long>(value));
    return digits;
  }
};

// Whether another thread could take the connection at once.
inline bool IsFreeForOthers(CIProtocol& driver) {
  HRESULT locked = E_FAIL;
  std::thread([&] {
    // The lock comes first if it is free, or else the event.
    const rcvlink::KernelHandle event(CreateEventW(nullptr, TRUE, TRUE, nullptr));
    locked = driver.LockConnection(event.get());
    if (locked == S_OK) driver.UnlockConnection();
  }).join();
  return locked == S_OK;
}

#endif  // RCVLINK_TESTS_SUPPORT_DRIVER_LOCK_H_
