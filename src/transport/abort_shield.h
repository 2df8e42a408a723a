// Keeps a cancel from cutting a transfer in half: what a receiver must get whole is written behind
// one. A cancel that comes meanwhile is kept, and ends the first wait after the shield.
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

#endif  // RCVLINK_TRANSPORT_ABORT_SHIELD_H_
