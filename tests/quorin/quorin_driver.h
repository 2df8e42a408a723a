// A driver on a scripted connection, with a receiver that answers as it is told.
#ifndef RCVLINK_TESTS_QUORIN_QUORIN_DRIVER_H_
#define RCVLINK_TESTS_QUORIN_QUORIN_DRIVER_H_

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "platform/handle.h"
#include "quorin/quorin_protocol.h"
#include "tests/quorin/quorin_responder.h"
#include "tests/support/scripted_connection.h"

class ProgressRecorder : public CIProtocolCallback {
 public:
  std::vector<int> percents;
  std::function<void(BYTE)> on_progress;

  void OnProgress(BYTE percent) override {
    percents.push_back(percent);
    if (on_progress) on_progress(percent);
  }
};

// The driver under test, with the handle of its lock for the report's lines.
class QuorinDriver : public CQuorinProtocol {
 public:
  using CQuorinProtocol::CQuorinProtocol;

  HANDLE LockHandle() const { return connection_lock_.handle(); }
  // As the report writes a handle: sixteen digits.
  std::string LockText() const {
    char digits[32] = {};
    std::snprintf(digits,
                  sizeof(digits),
                  "[0x%016llX]",
                  static_cast<unsigned long long>(reinterpret_cast<uintptr_t>(LockHandle())));
    return digits;
  }
};

// Whether another thread could take the connection at once.
inline bool IsFreeForOthers(CIProtocol& driver) {
  HRESULT locked = E_FAIL;
  std::thread([&] {
    // The lock comes first if it is free, or else the event.
    const KernelHandle event(CreateEventW(nullptr, TRUE, TRUE, nullptr));
    locked = driver.LockConnection(event.get());
    if (locked == S_OK) driver.UnlockConnection();
  }).join();
  return locked == S_OK;
}

class QuorinDriverTest : public testing::Test {
 protected:
  QuorinDriverTest() { driver.SetCallback(&progress); }

  std::vector<std::string> Said() const { return Conversation(connection->calls); }

  ScriptedConnection* connection = new ScriptedConnection;  // the driver's
  QuorinResponder receiver{*connection};
  QuorinDriver driver{std::unique_ptr<CIConnection>(connection)};
  ProgressRecorder progress;
};

#endif  // RCVLINK_TESTS_QUORIN_QUORIN_DRIVER_H_
