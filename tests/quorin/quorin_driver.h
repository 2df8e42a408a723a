// A driver on a scripted connection, with a receiver whose answers the test sets.
#ifndef RCVLINK_TESTS_QUORIN_QUORIN_DRIVER_H_
#define RCVLINK_TESTS_QUORIN_QUORIN_DRIVER_H_

#include <gtest/gtest.h>

#include <functional>
#include <initializer_list>
#include <memory>
#include <string>
#include <vector>

#include "quorin/quorin_protocol.h"
#include "tests/quorin/quorin_responder.h"
#include "tests/support/driver_lock.h"
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

inline std::vector<std::string> Joined(std::initializer_list<std::vector<std::string>> parts) {
  std::vector<std::string> all;
  for (const auto& part : parts) all.insert(all.end(), part.begin(), part.end());
  return all;
}

// The driver under test, with the handle of its lock for the report's lines.
using QuorinDriver = WithLockText<CQuorinProtocol>;

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
