#ifndef TESTS_SIMULATOR_SESSION_H_
#define TESTS_SIMULATOR_SESSION_H_

#include <cstddef>
#include <cstdint>
#include <sstream>
#include <string>
#include <string_view>

#include "simulator/bytes.h"
#include "simulator/files.h"
#include "simulator/ports/memory.h"
#include "simulator/quorin/receiver.h"
#include "simulator/transcript.h"

namespace sim {

inline constexpr uint32_t kHostSpeed = 9600;
inline constexpr size_t kBlockSize = 518;
inline constexpr std::string_view kAck = "\x06";
inline constexpr std::string_view kNak = "\x15";
inline constexpr std::string_view kHash = "#";

// Byte i of the test payload is (7 i + 3) modulo 256.
Bytes TestPayload(size_t size);

// A store with one file, "A0101.log".
FileStore OneFile(size_t size);

// A Quorin receiver in memory with a host that talks at a speed of its own.
class Session {
 public:
  explicit Session(const QuorinOptions& options = {}, FileStore files = OneFile(1100));

  // Sends text; gives all that comes back before the receiver has been quiet for `quiet_ms`.
  std::string Ask(std::string_view text, uint64_t quiet_ms = 100);

  void Say(std::string_view text) { port.Write(text, host_speed); }

  // Asks for A0101.log in blocks of 512 and starts the transfer; gives the first block.
  Bytes StartTransfer();

  // Sends a control byte; gives the block that follows, or whatever comes within `wait_ms`.
  Bytes NextBlock(std::string_view control, uint64_t wait_ms = 1000);

  std::ostringstream log;
  Transcript transcript{log};
  QuorinReceiver receiver;
  MemoryPort port{receiver};
  uint32_t host_speed = kHostSpeed;
};

// What a host reads from a block.
struct SeenBlock {
  explicit SeenBlock(const Bytes& wire);

  unsigned type = 0;
  unsigned field = 0;
  unsigned crc = 0;
  unsigned end = 0;
};

}  // namespace sim

#endif  // TESTS_SIMULATOR_SESSION_H_
