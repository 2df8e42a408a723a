// A receiver on a COM port (Windows).
#ifndef SIMULATOR_PORTS_COM_H_
#define SIMULATOR_PORTS_COM_H_

#include <cstddef>
#include <cstdint>
#include <string>

#include "simulator/bytes.h"
#include "simulator/ports/handle.h"
#include "simulator/ports/overlapped.h"
#include "simulator/ports/port_clock.h"
#include "simulator/receiver.h"

namespace sim {

// A receiver at the far end of the cable of a COM port: the other end of a pair of virtual ports, or
// of a null modem. The port is set to the receiver's speed; that of the host cannot be seen.
class ComPort {
 public:
  // `name` is COM8. Throws std::system_error when it cannot be opened.
  explicit ComPort(const std::wstring& name);

  // Carries bytes until the event `stop` is set or the receiver is gone. Throws
  // std::runtime_error when the port fails.
  void Serve(Receiver& receiver, HANDLE stop);

 private:
  void SetSpeed(uint32_t speed);
  void StartRead();
  void TakeInput(Receiver& receiver);
  void SendDue(Receiver& receiver);
  void FollowSpeed(const Receiver& receiver);

  UniqueHandle port_;
  // After the port, so that they end first.
  OverlappedTransfer read_;
  OverlappedTransfer write_;
  uint32_t speed_ = 0;
  PortClock clock_;
};

}  // namespace sim

#endif  // SIMULATOR_PORTS_COM_H_
