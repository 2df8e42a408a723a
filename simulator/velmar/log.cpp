#include "simulator/velmar/log.h"

#include <array>
#include <cstdio>

#include "simulator/velmar/crc32.h"

namespace sim {
namespace {

// The receiver's clock stands still, so that equal sessions give equal bytes.
constexpr uint16_t kWeek = 2290;
constexpr uint32_t kMillisecondsOfWeek = 172'800'000;
constexpr std::string_view kSecondsOfWeek = "172800.000";

constexpr std::string_view kIdle = "62.5";
constexpr uint8_t kIdleHalfPercent = 125;
constexpr std::string_view kTimeStatus = "FINESTEERING";
constexpr uint8_t kTimeStatusCode = 180;
constexpr std::string_view kStatus = "02000000";
constexpr uint32_t kStatusBits = 0x02000000;
constexpr std::string_view kReserved = "b1f6";
constexpr uint16_t kReservedBits = 0xB1F6;
constexpr uint16_t kSoftwareVersion = 16248;

constexpr std::array<uint8_t, 3> kSync = {0xAA, 0x44, 0x12};
constexpr std::array<uint8_t, 3> kWrongSync = {0xAA, 0x55, 0x21};
constexpr uint8_t kBinaryType = 0;
constexpr uint32_t kCrcDamage = 0x01800000;

std::string Join(const std::array<std::string, 10>& fields, char separator) {
  std::string text;
  for (const std::string& field : fields) {
    if (!text.empty()) {
      text += separator;
    }
    text += field;
  }
  return text;
}

std::string Header(std::string_view name,
                   std::string_view port_name,
                   uint32_t sequence,
                   char separator) {
  return Join({std::string(name),
               std::string(port_name),
               std::to_string(sequence),
               std::string(kIdle),
               std::string(kTimeStatus),
               std::to_string(kWeek),
               std::string(kSecondsOfWeek),
               std::string(kStatus),
               std::string(kReserved),
               std::to_string(kSoftwareVersion)},
              separator);
}

// Where the field that begins at `start` ends: at a comma outside of quotation marks.
size_t FieldEnd(std::string_view body, size_t start) {
  bool quoted = false;
  for (size_t i = start; i < body.size(); ++i) {
    if (body[i] == '"') {
      quoted = !quoted;
    } else if (body[i] == ',' && !quoted) {
      return i;
    }
  }
  return body.size();
}

}  // namespace

void AppendLittleEndian16(Bytes& bytes, uint16_t value) {
  bytes.push_back(static_cast<uint8_t>(value & 0xFF));
  bytes.push_back(static_cast<uint8_t>(value >> 8));
}

void AppendLittleEndian32(Bytes& bytes, uint32_t value) {
  AppendLittleEndian16(bytes, static_cast<uint16_t>(value & 0xFFFF));
  AppendLittleEndian16(bytes, static_cast<uint16_t>(value >> 16));
}

std::string FrameAsciiLog(const AsciiLog& log,
                          std::string_view port_name,
                          uint32_t sequence,
                          bool damaged_crc) {
  const std::string text = Header(log.name, port_name, sequence, ',') + ";" + log.body;
  const uint32_t crc = Crc32(ToBytes(text)) ^ (damaged_crc ? kCrcDamage : 0);
  std::array<char, 9> digits{};
  std::snprintf(digits.data(), digits.size(), "%08x", static_cast<unsigned>(crc));
  return "#" + text + "*" + digits.data() + "\r\n";
}

std::string FrameAbbreviatedLog(std::string_view name, std::string_view port_name) {
  return "<" + Header(name, port_name, 0, ' ') + "\r\n<     1\r\n";
}

Bytes FrameBinaryLog(const BinaryLog& log) {
  const auto& sync = log.wrong_sync ? kWrongSync : kSync;
  Bytes bytes(sync.begin(), sync.end());
  bytes.push_back(log.header_length);
  AppendLittleEndian16(bytes, log.message_id);
  bytes.push_back(kBinaryType);
  bytes.push_back(log.port_address);
  AppendLittleEndian16(bytes, log.message_length);
  AppendLittleEndian16(bytes, log.sequence);
  bytes.push_back(kIdleHalfPercent);
  bytes.push_back(kTimeStatusCode);
  AppendLittleEndian16(bytes, kWeek);
  AppendLittleEndian32(bytes, kMillisecondsOfWeek);
  AppendLittleEndian32(bytes, kStatusBits);
  AppendLittleEndian16(bytes, kReservedBits);
  AppendLittleEndian16(bytes, kSoftwareVersion);
  bytes.insert(bytes.end(), log.body.begin(), log.body.end());
  AppendLittleEndian32(bytes, Crc32(bytes) ^ (log.damaged_crc ? kCrcDamage : 0));
  return bytes;
}

std::string FirstFields(std::string_view body, size_t count) {
  size_t end = 0;
  for (size_t i = 0; i < count && end < body.size(); ++i) {
    end = FieldEnd(body, i == 0 ? 0 : end + 1);
  }
  return std::string(body.substr(0, end));
}

std::string LeftOpen(std::string body) {
  const size_t quote = body.rfind('"');
  if (quote != std::string::npos) {
    body.erase(quote, 1);
  } else {
    const size_t comma = body.rfind(',');
    body.insert(comma == std::string::npos ? 0 : comma + 1, 1, '"');
  }
  return body;
}

std::string WithFirstField(std::string_view body, std::string_view field) {
  return std::string(field) + std::string(body.substr(FieldEnd(body, 0)));
}

}  // namespace sim
