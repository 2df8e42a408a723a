// Replies as Velmar receivers give them, for tests.
#ifndef RCVLINK_TESTS_VELMAR_VELMAR_REPLIES_H_
#define RCVLINK_TESTS_VELMAR_VELMAR_REPLIES_H_

#include <cstdint>
#include <string>
#include <string_view>

inline const std::string kOkPrompt = "\r\n<OK\r\n[COM1]";
inline const std::string kErrorPrompt = "\r\n<ERROR:[COM1]";
inline const std::string kErrorTextPrompt = "\r\n<ERROR:Invalid message\r\n[COM1]";

// An ASCII log: ten header fields, the body, a checksum that is not checked.
inline std::string AsciiLog(const std::string& name,
                            const std::string& body,
                            int sequence = 0,
                            const std::string& port = "COM1") {
  return "#" + name + "," + port + "," + std::to_string(sequence) +
         ",55.0,FINESTEERING,1888,405078.5,00000000,0000,1111;" + body + "*12345678\r\n";
}

// A binary FILETRANSFER log around a chunk. The lengths may be wrong.
struct BinaryLog {
  std::string chunk;
  uint16_t sequence = 0;
  int message_length = -1;  // -1: the right one
  uint8_t header_length = 28;

  std::string Bytes() const {
    constexpr size_t kHeader = 28;
    const int length = message_length < 0 ? static_cast<int>(chunk.size()) + 8 : message_length;
    std::string log(kHeader, '\0');
    log[0] = '\xAA';
    log[1] = '\x44';
    log[2] = '\x12';
    log[3] = static_cast<char>(header_length);
    log[8] = static_cast<char>(length);
    log[9] = static_cast<char>(length >> 8);
    log[10] = static_cast<char>(sequence);
    log[11] = static_cast<char>(sequence >> 8);
    return log + "8 bytes:" + chunk + "crc!";
  }
};

#endif  // RCVLINK_TESTS_VELMAR_VELMAR_REPLIES_H_
