#ifndef TESTS_SIMULATOR_VELMAR_SESSION_H_
#define TESTS_SIMULATOR_VELMAR_SESSION_H_

#include <cstddef>
#include <cstdint>
#include <span>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "simulator/bytes.h"
#include "simulator/files.h"
#include "simulator/ports/memory.h"
#include "simulator/transcript.h"
#include "simulator/velmar/receiver.h"
#include "tests/simulator/session.h"

namespace sim {

inline constexpr const char* kOk = "\r\n<OK\r\n[COM1]";
inline constexpr size_t kAcknowledged = 13;

// A Velmar receiver in memory with a host that talks at a speed of its own.
class VelmarSession {
 public:
  explicit VelmarSession(const VelmarOptions& options = {}, FileStore files = OneFile(2100));

  // Sends a command; gives all that comes back before the receiver has been quiet for `quiet_ms`.
  std::string Ask(std::string_view command, uint64_t quiet_ms = 100);

  void Say(std::string_view command) { port.Write(std::string(command) + "\r", host_speed); }

  // Makes A0101.log current and asks for it; gives what follows the prompt.
  Bytes FetchFile(uint64_t quiet_ms = 100);

  std::ostringstream log;
  Transcript transcript{log};
  VelmarReceiver receiver;
  MemoryPort port{receiver};
  uint32_t host_speed = kHostSpeed;
};

VelmarOptions WithReplyFault(const VelmarReplyFault& fault);
VelmarOptions WithChunkFault(const VelmarChunkFault& fault);

// The CRC-32 of a log as a host computes it, bit by bit.
uint32_t HostCrc32(std::span<const uint8_t> bytes);

// What a host reads from an ASCII log.
struct SeenLog {
  std::vector<std::string> header;
  std::vector<std::string> body;
  bool good_crc = false;

  int sequence() const { return std::stoi(header.at(2)); }
};

// Parses a reply: an acknowledgement, the prompt and only ASCII logs. Any other reply fails the
// test and gives what was read of it.
std::vector<SeenLog> ReadLogs(const std::string& reply);

// What a host reads from a binary log of the usual header length.
struct SeenChunk {
  unsigned header_length = 0;
  unsigned message_length = 0;
  unsigned sequence = 0;
  uint32_t offset = 0;
  uint32_t length = 0;
  Bytes data = {};
  bool good_sync = false;
  bool good_crc = false;
};

// Parses consecutive binary logs. Their bodies have `body_length` bytes or, if that is 0, the
// length in their headers.
std::vector<SeenChunk> ReadChunks(const Bytes& bytes, size_t body_length = 0);

// The bytes of all chunks.
Bytes Contents(const std::vector<SeenChunk>& chunks);

}  // namespace sim

#endif  // TESTS_SIMULATOR_VELMAR_SESSION_H_
