// The headers of Velmar logs.
#ifndef RCVLINK_VELMAR_LOG_HEADER_H_
#define RCVLINK_VELMAR_LOG_HEADER_H_

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/little_endian.h"

namespace VelmarCommands {

// The fields of an ASCII log's header that are read. There are ten of them before the ";".
struct AsciiHeader {
  std::wstring message_name;  // "#VERSIONA"
  std::wstring port;
  int sequence = 0;  // the number of logs that still follow
  int gps_week = 0;
  double gps_seconds = 0;
};

// None when there are fewer than ten fields.
std::optional<AsciiHeader> ParseHeaderFields(std::string_view text);

// The first 36 bytes of a binary log: its header of 28 bytes and the first 8 bytes of its body.
// Before all of them have come the log's length is not used. All numbers are little-endian.
class BinaryHeader {
 public:
  static constexpr size_t kLength = 36;
  static constexpr uint8_t kSync = 0xAA;

  void Assign(std::string_view log);  // of at least kLength bytes

  uint8_t HeaderLength() const { return bytes_[3]; }
  uint16_t MessageLength() const { return Word(8); }  // body without header and checksum
  uint16_t Sequence() const { return Word(10); }      // not 0 while more logs follow
  // The whole log, its checksum included.
  size_t LogLength() const { return size_t{MessageLength()} + kCrcLength + HeaderLength(); }

 private:
  static constexpr size_t kCrcLength = 4;

  uint16_t Word(size_t offset) const { return rcvlink::ReadUint16(bytes_, offset); }

  std::array<uint8_t, kLength> bytes_{};
};

}  // namespace VelmarCommands

#endif  // RCVLINK_VELMAR_LOG_HEADER_H_
