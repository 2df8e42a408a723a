// Keeps a cancel from cutting a transfer in half: what a receiver must get whole is written behind
// one. A cancel that comes meanwhile is kept, and ends the first wait after the shield. AbortWatch
// is the opposite: waits end when the host's own event is signalled. A connection has room for one
// abort event, so neither goes inside another.
#ifndef RCVLINK_TRANSPORT_ABORT_SHIELD_H_
#define RCVLINK_TRANSPORT_ABORT_SHIELD_H_

#include "platform/handle.h"
#include "transport/connection.h"

class AbortShield {
 public:
  explicit AbortShield(CIConnection* connection)
      : connection_(connection), never_(CreateEventW(nullptr, TRUE, FALSE, nullptr)) {
    connection_->SetAbortEvent(never_.get());
  }
  AbortShield(const AbortShield&) = delete;
  AbortShield& operator=(const AbortShield&) = delete;
  ~AbortShield() { connection_->SetAbortEvent(nullptr); }

 private:
  CIConnection* connection_;
  KernelHandle never_;  // an event that nobody signals
};

// A null event leaves the connection as it is: Cancel ends its waits.
class AbortWatch {
 public:
  AbortWatch(CIConnection* connection, HANDLE abort_event) : connection_(connection) {
    connection_->SetAbortEvent(abort_event);
  }
  AbortWatch(const AbortWatch&) = delete;
  AbortWatch& operator=(const AbortWatch&) = delete;
  ~AbortWatch() { connection_->SetAbortEvent(nullptr); }

 private:
  CIConnection* connection_;
};

#endif  // RCVLINK_TRANSPORT_ABORT_SHIELD_H_
