// A receiver in memory, for tests: no port, no waiting.
#ifndef SIMULATOR_PORTS_MEMORY_H_
#define SIMULATOR_PORTS_MEMORY_H_

#include <cstddef>
#include <cstdint>
#include <deque>
#include <span>
#include <string_view>

#include "simulator/bytes.h"
#include "simulator/receiver.h"

namespace sim {

// A receiver plugged into memory. Time is a number that only moves while the host waits, so a
// session with long silences runs in no time. For one thread at a time.
class MemoryPort {
 public:
  // `receiver` must outlive the port.
  explicit MemoryPort(Receiver& receiver, uint64_t start_ms = 0);

  // Sends bytes at `host_speed`, which is the host's speed from now on; 0 on a link without speed.
  void Write(std::span<const uint8_t> bytes, uint32_t host_speed);
  void Write(std::string_view text, uint32_t host_speed);

  // Sets the host's end to another speed without sending anything.
  void SetHostSpeed(uint32_t host_speed) { host_speed_ = host_speed; }

  // Gives up to `max_bytes` of what waits for the host. If nothing does, the clock moves to the
  // next output within the time-out, or by the whole time-out, and the result is empty.
  Bytes Read(size_t max_bytes, uint64_t timeout_ms);

  // Reads on until `size` bytes have come or `timeout_ms` have passed since the call.
  Bytes ReadFull(size_t size, uint64_t timeout_ms);

  // Discards the bytes that wait for the host.
  void Purge();

  // Moves the clock; what the receiver sends in that time waits for the host.
  void Advance(uint64_t ms);

  uint64_t Now() const { return now_ms_; }

 private:
  void Collect();

  Receiver& receiver_;
  uint64_t now_ms_;
  uint32_t host_speed_ = 0;
  std::deque<uint8_t> waiting_;
};

}  // namespace sim

#endif  // SIMULATOR_PORTS_MEMORY_H_
