// Makes the blocks of a transfer as a receiver sends them.
#ifndef RCVLINK_TESTS_QUORIN_BLOCK_STREAM_H_
#define RCVLINK_TESTS_QUORIN_BLOCK_STREAM_H_

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

// Bit by bit: 0x1021, most significant bit first, nothing inverted.
inline uint16_t SlowCrc(std::string_view bytes, uint16_t crc) {
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

class BlockStream {
 public:
  static constexpr size_t kPayload = 512;

  // The next block, its checksum carried on from the one before.
  std::string Data(uint16_t sequence, std::string_view payload) {
    return Next(0x02, sequence, payload);
  }
  std::string Last(std::string_view payload) {
    return Next(0x04, static_cast<uint16_t>(payload.size()), payload);
  }
  std::string Next(uint8_t type, uint16_t field, std::string_view payload) {
    return Make(type, field, payload, crc_, &crc_);
  }
  uint16_t crc() const { return crc_; }

  // A block whose checksum carries on from any value.
  static std::string Make(uint8_t type,
                          uint16_t field,
                          std::string_view payload,
                          uint16_t previous_crc,
                          uint16_t* own_crc = nullptr) {
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

 private:
  static void AppendWord(std::string& bytes, uint16_t word) {
    bytes += static_cast<char>(word & 0xFF);
    bytes += static_cast<char>(word >> 8);
  }

  uint16_t crc_ = 0;
};

#endif  // RCVLINK_TESTS_QUORIN_BLOCK_STREAM_H_
