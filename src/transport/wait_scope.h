// A scope in which other things end the waits of a connection than usual.
#ifndef RCVLINK_TRANSPORT_WAIT_SCOPE_H_
#define RCVLINK_TRANSPORT_WAIT_SCOPE_H_

#include "platform/event.h"
#include "transport/connection.h"

class WaitScope {
 public:
  // Nothing ends a wait early: for bytes that the receiver must get whole. A Cancel that comes
  // meanwhile ends the first wait after the scope.
  static WaitScope Shielded(CIConnection* connection) {
    return WaitScope(connection, {.shielded = true});
  }

  // The host's event ends a Read too. A null event, or a handle that is none, ends nothing.
  static WaitScope Watching(CIConnection* connection, HANDLE event) {
    return WaitScope(connection, {.watched = IsWaitable(event) ? event : nullptr});
  }

  WaitScope(const WaitScope&) = delete;
  WaitScope& operator=(const WaitScope&) = delete;
  ~WaitScope() { connection_->ExchangeWaitRule(previous_); }

 private:
  WaitScope(CIConnection* connection, const WaitRule& rule)
      : connection_(connection), previous_(connection->ExchangeWaitRule(rule)) {}

  CIConnection* connection_;
  WaitRule previous_;
};

#endif  // RCVLINK_TRANSPORT_WAIT_SCOPE_H_
