// A receiver on a TCP port (Linux).
#ifndef SIMULATOR_PORTS_TCP_H_
#define SIMULATOR_PORTS_TCP_H_

#include <csignal>
#include <cstdint>
#include <span>
#include <string>

#include "simulator/bytes.h"
#include "simulator/ports/descriptor.h"
#include "simulator/ports/port_clock.h"
#include "simulator/receiver.h"

namespace sim {

// A receiver that waits for hosts on a TCP port, and serves one after the other. The connection
// carries the bytes of the line and nothing else.
class TcpPort {
 public:
  // `address` is "[HOST:]PORT"; the host is this computer alone by default, and port 0 a free one.
  // Throws std::invalid_argument or std::system_error.
  explicit TcpPort(const std::string& address);

  // "HOST:PORT".
  const std::string& address() const { return address_; }

  // Carries bytes until `stop` is set or the receiver is gone; see PtyPort. While the receiver's plug
  // is out, no host is connected and none can connect.
  void Serve(Receiver& receiver, const volatile std::sig_atomic_t& stop, const sigset_t& wait_mask);

 private:
  void Listen();
  void Wait(const Receiver& receiver, const sigset_t& wait_mask) const;
  void TakeHost();
  void TakeInput(Receiver& receiver);
  void SendDue(Receiver& receiver);
  void Write();

  std::string host_;
  uint16_t port_ = 0;
  std::string address_;
  Descriptor listener_;
  Descriptor connection_;
  // What the connection had no room for.
  Bytes unwritten_;
  PortClock clock_;
};

}  // namespace sim

#endif  // SIMULATOR_PORTS_TCP_H_
