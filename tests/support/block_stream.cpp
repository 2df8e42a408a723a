#include "tests/support/block_stream.h"

uint16_t SlowCrc(std::string_view bytes, uint16_t crc) {
  for (const char c : bytes) {
    const auto bits = static_cast<uint8_t>(c);
    for (int bit = 7; bit >= 0; --bit) {
      const bool one = ((crc >> 15) & 1) != ((bits >> bit) & 1);
      crc = static_cast<uint16_t>(crc << 1);
      if (one) crc = static_cast<uint16_t>(crc ^ 0x1021);
    }
  }
  return crc;
}

namespace {

void AppendWord(std::string& bytes, uint16_t word) {
  bytes += static_cast<char>(word & 0xFF);
  bytes += static_cast<char>(word >> 8);
}

}  // namespace

std::string BlockStream::Make(uint8_t type,
                              uint16_t field,
                              std::string_view payload,
                              uint16_t previous_crc,
                              uint16_t* own_crc) {
  std::string bytes(1, static_cast<char>(type));
  AppendWord(bytes, field);
  bytes += payload;
  bytes.resize(3 + kPayload);
  const uint16_t crc = SlowCrc(bytes, previous_crc);
  AppendWord(bytes, crc);
  bytes += '\x03';
  if (own_crc) *own_crc = crc;
  return bytes;
}
