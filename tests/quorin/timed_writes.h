// A scripted connection that keeps the time-outs of its writes.
#ifndef RCVLINK_TESTS_QUORIN_TIMED_WRITES_H_
#define RCVLINK_TESTS_QUORIN_TIMED_WRITES_H_

#include <vector>

#include "tests/support/scripted_connection.h"

class TimedWrites : public ScriptedConnection {
 public:
  std::vector<DWORD> timeouts;

  HRESULT Write(const void* buffer, DWORD size, DWORD timeout_ms) override {
    timeouts.push_back(timeout_ms);
    return ScriptedConnection::Write(buffer, size, timeout_ms);
  }
};

#endif  // RCVLINK_TESTS_QUORIN_TIMED_WRITES_H_
