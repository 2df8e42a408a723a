// The time of a port, which is that of its receiver.
#ifndef SIMULATOR_PORTS_PORT_CLOCK_H_
#define SIMULATOR_PORTS_PORT_CLOCK_H_

#include <chrono>
#include <cstdint>
#include <optional>

#include "simulator/receiver.h"

namespace sim {

// Counts milliseconds from 0.
class PortClock {
 public:
  uint64_t NowMs() const {
    const auto elapsed = std::chrono::steady_clock::now() - start_;
    return static_cast<uint64_t>(
        std::chrono::duration_cast<std::chrono::milliseconds>(elapsed).count());
  }

  bool IsDue(const Receiver& receiver) const {
    const std::optional<uint64_t> next = receiver.NextSendTime();
    return next && *next <= NowMs();
  }

  // How long to wait for the receiver's next output; nothing when there will be none by itself.
  std::optional<uint64_t> WaitMs(const Receiver& receiver) const {
    const std::optional<uint64_t> next = receiver.NextSendTime();
    if (!next) {
      return std::nullopt;
    }
    const uint64_t now_ms = NowMs();
    return *next > now_ms ? *next - now_ms : 0;
  }

 private:
  std::chrono::steady_clock::time_point start_ = std::chrono::steady_clock::now();
};

}  // namespace sim

#endif  // SIMULATOR_PORTS_PORT_CLOCK_H_
