// Changes for a scope what ends the waits of a connection early.
#ifndef RCVLINK_TRANSPORT_WAIT_SCOPE_H_
#define RCVLINK_TRANSPORT_WAIT_SCOPE_H_

#include <utility>

#include "platform/handle.h"
#include "transport/connection.h"

namespace rcvlink {

class WaitScope {
 public:
  // Neither Cancel nor the abort event ends a wait: for bytes that the receiver must get whole. A
  // Cancel that comes meanwhile ends the first wait after the scope.
  static WaitScope Shielded(CIConnection* connection) {
    return WaitScope(connection, {.shielded = true});
  }

  // The host's event ends a Read as well. A null event, or an invalid handle, ends nothing.
  static WaitScope Watching(CIConnection* connection, HANDLE event) {
    // A second handle of the event, since the host may close its own during the wait.
    HANDLE copy = nullptr;
    const HANDLE process = GetCurrentProcess();
    if (event) DuplicateHandle(process, event, process, &copy, SYNCHRONIZE, FALSE, 0);
    return WaitScope(connection, {.watched = copy}, KernelHandle(copy));
  }

  WaitScope(const WaitScope&) = delete;
  WaitScope& operator=(const WaitScope&) = delete;
  ~WaitScope() { connection_->ExchangeWaitRule(previous_); }

 private:
  WaitScope(CIConnection* connection, const WaitRule& rule, KernelHandle watched = {})
      : connection_(connection),
        previous_(connection->ExchangeWaitRule(rule)),
        watched_(std::move(watched)) {}

  CIConnection* connection_;
  WaitRule previous_;
  KernelHandle watched_;
};

}  // namespace rcvlink

#endif  // RCVLINK_TRANSPORT_WAIT_SCOPE_H_
