// What a port needs to know of a receiver, of whatever family.
#ifndef SIMULATOR_RECEIVER_H_
#define SIMULATOR_RECEIVER_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

#include "simulator/bytes.h"

namespace sim {

// A receiver at the far end of a link. It never sleeps and owns no clock: its caller passes the
// time, so that the same receiver runs on a real port and in memory.
//
// `host_speed` is the speed in bit/s the host's end of the link is set to at that moment; 0 stands
// for a link that has no speed (USB).
class Receiver {
 public:
  virtual ~Receiver() = default;

  // Takes bytes that the host has sent.
  virtual void Receive(std::span<const uint8_t> bytes, uint32_t host_speed, uint64_t now_ms) = 0;

  // When the next output is due, or nothing while the receiver has nothing to send. The answer
  // may change with every call of Receive and Send.
  virtual std::optional<uint64_t> NextSendTime() const = 0;

  // Gives the output of one write. It may be empty: bytes at a speed that the host does not listen
  // at are lost. Call this until NextSendTime lies in the future.
  virtual Bytes Send(uint64_t now_ms, uint32_t host_speed) = 0;

  // True once the receiver has gone from the link for good, as when its plug is pulled.
  virtual bool gone() const = 0;

  // The speed in bit/s that its own end of the link is set to.
  virtual uint32_t speed() const = 0;

  // The number of the block or chunk of a file that it has sent last, from 0; nothing before the
  // first one.
  virtual std::optional<uint64_t> last_block() const = 0;

  // False while its plug is out. Then no byte passes, and a port that can tell its hosts does so.
  virtual bool plugged() const { return true; }

  // The length of `bytes` up to the end of the last command that changes the line speed; 0 if there
  // is none. Some ports cannot tell whether bytes were sent before or after the host changed its own
  // speed. They take the command that asks for a change, and all before it, as sent before.
  virtual size_t EndOfSpeedCommand(std::span<const uint8_t> bytes) const {
    static_cast<void>(bytes);
    return 0;
  }
};

}  // namespace sim

#endif  // SIMULATOR_RECEIVER_H_
