// The frames of Velmar logs: ASCII, abbreviated and binary.
#ifndef SIMULATOR_VELMAR_LOG_H_
#define SIMULATOR_VELMAR_LOG_H_

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "simulator/bytes.h"

namespace sim {

inline constexpr uint8_t kBinaryHeaderLength = 28;

// An ASCII log without its header.
struct AsciiLog {
  std::string name;  // With the A at its end.
  std::string body;
  // The body begins with the number of entries that follow in it.
  bool counted = false;
};

// A complete ASCII log. `sequence` is how many logs of the same reply follow.
std::string FrameAsciiLog(const AsciiLog& log,
                          std::string_view port_name,
                          uint32_t sequence,
                          bool damaged_crc);

// An abbreviated log, which has no CRC.
std::string FrameAbbreviatedLog(std::string_view name, std::string_view port_name);

// A binary log, with a header that may be wrong.
struct BinaryLog {
  uint16_t message_id = 0;
  uint8_t port_address = 0;
  uint8_t header_length = kBinaryHeaderLength;
  uint16_t message_length = 0;
  uint16_t sequence = 0;
  Bytes body = {};
  // Only the first of the three sync bytes is right.
  bool wrong_sync = false;
  bool damaged_crc = false;
};

// A complete binary log, the CRC at its end.
Bytes FrameBinaryLog(const BinaryLog& log);

void AppendLittleEndian16(Bytes& bytes, uint16_t value);
void AppendLittleEndian32(Bytes& bytes, uint32_t value);

// A log's body, cut after its first `count` fields.
std::string FirstFields(std::string_view body, size_t count);

// A log's body that ends within quotation marks.
std::string LeftOpen(std::string body);

// A log's body with another first field.
std::string WithFirstField(std::string_view body, std::string_view field);

}  // namespace sim

#endif  // SIMULATOR_VELMAR_LOG_H_
