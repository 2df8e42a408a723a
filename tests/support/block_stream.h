// Makes the blocks of a transfer as a receiver sends them.
#ifndef RCVLINK_TESTS_SUPPORT_BLOCK_STREAM_H_
#define RCVLINK_TESTS_SUPPORT_BLOCK_STREAM_H_

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

// Bit by bit: 0x1021, most significant bit first, nothing inverted.
uint16_t SlowCrc(std::string_view bytes, uint16_t crc);

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
                          uint16_t* own_crc = nullptr);

 private:
  uint16_t crc_ = 0;
};

#endif  // RCVLINK_TESTS_SUPPORT_BLOCK_STREAM_H_
