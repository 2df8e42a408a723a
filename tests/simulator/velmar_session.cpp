#include "tests/simulator/velmar_session.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <utility>

namespace sim {
namespace {

constexpr size_t kHeaderLength = 28;
constexpr size_t kCrcLength = 4;
constexpr size_t kChunkStart = 36;

uint32_t Number(const Bytes& bytes, size_t at, size_t length) {
  uint32_t number = 0;
  for (size_t i = length; i-- > 0;) {
    number = number * 256 + bytes.at(at + i);
  }
  return number;
}

std::vector<std::string> Fields(const std::string& text) {
  std::vector<std::string> fields(1);
  bool quoted = false;
  for (const char character : text) {
    quoted = quoted != (character == '"');
    if (character == ',' && !quoted) {
      fields.emplace_back();
    } else {
      fields.back() += character;
    }
  }
  return fields;
}

Bytes Part(const Bytes& bytes, size_t begin, size_t end) {
  return Bytes(bytes.begin() + static_cast<std::ptrdiff_t>(begin),
               bytes.begin() + static_cast<std::ptrdiff_t>(end));
}

}  // namespace

VelmarSession::VelmarSession(const VelmarOptions& options, FileStore files)
    : receiver(options, std::move(files), &transcript) {}

std::string VelmarSession::Ask(std::string_view command, uint64_t quiet_ms) {
  Say(command);
  std::string all;
  for (Bytes some = port.Read(SIZE_MAX, quiet_ms); !some.empty();
       some = port.Read(SIZE_MAX, quiet_ms)) {
    all += ToText(some);
  }
  return all;
}

Bytes VelmarSession::FetchFile(uint64_t quiet_ms) {
  EXPECT_EQ(Ask("currentfile A0101.log all", quiet_ms), kOk);
  const std::string reply = Ask("log filetransferb", quiet_ms);
  EXPECT_EQ(reply.substr(0, kAcknowledged), kOk);
  return ToBytes(std::string_view(reply).substr(std::min(kAcknowledged, reply.size())));
}

VelmarOptions WithReplyFault(const VelmarReplyFault& fault) {
  VelmarOptions options;
  options.faults.replies = {fault};
  return options;
}

VelmarOptions WithChunkFault(const VelmarChunkFault& fault) {
  VelmarOptions options;
  options.faults.chunks = {fault};
  return options;
}

uint32_t HostCrc32(std::span<const uint8_t> bytes) {
  uint32_t crc = 0;
  for (const uint8_t byte : bytes) {
    crc ^= byte;
    for (int bit = 0; bit < 8; ++bit) {
      const uint32_t low = crc & 1;
      crc >>= 1;
      if (low == 1) {
        crc ^= 0xEDB88320U;
      }
    }
  }
  return crc;
}

std::vector<SeenLog> ReadLogs(const std::string& reply) {
  EXPECT_EQ(reply.substr(0, kAcknowledged), kOk);
  std::vector<SeenLog> logs;
  for (size_t at = kAcknowledged; at < reply.size();) {
    const size_t semicolon = reply.find(';', at);
    const size_t star = reply.find('*', at);
    const size_t end = reply.find("\r\n", at);
    if (reply[at] != '#' || semicolon > star || star > end || end == std::string::npos ||
        end - star != 9) {
      ADD_FAILURE() << "no ASCII log: " << reply.substr(at);
      break;
    }
    SeenLog log;
    log.header = Fields(reply.substr(at, semicolon - at));
    log.body = Fields(reply.substr(semicolon + 1, star - semicolon - 1));
    const Bytes text = ToBytes(std::string_view(reply).substr(at + 1, star - at - 1));
    log.good_crc = std::stoul(reply.substr(star + 1, 8), nullptr, 16) == HostCrc32(text);
    logs.push_back(log);
    at = end + 2;
  }
  return logs;
}

std::vector<SeenChunk> ReadChunks(const Bytes& bytes, size_t body_length) {
  std::vector<SeenChunk> chunks;
  for (size_t at = 0; at < bytes.size();) {
    SeenChunk chunk;
    const size_t left = bytes.size() - at;
    const size_t length = left < kChunkStart ? 0
                          : body_length != 0 ? body_length
                                             : Number(bytes, at + 8, 2);
    if (length < kChunkStart - kHeaderLength || left < kHeaderLength + length + kCrcLength) {
      ADD_FAILURE() << "no binary log at " << at;
      break;
    }
    const size_t end = at + kHeaderLength + length;
    chunk.good_sync = bytes[at] == 0xAA && bytes[at + 1] == 0x44 && bytes[at + 2] == 0x12;
    chunk.header_length = bytes[at + 3];
    chunk.message_length = Number(bytes, at + 8, 2);
    chunk.sequence = Number(bytes, at + 10, 2);
    chunk.offset = Number(bytes, at + 28, 4);
    chunk.length = Number(bytes, at + 32, 4);
    chunk.data = Part(bytes, at + kChunkStart, end);
    chunk.good_crc = Number(bytes, end, kCrcLength) == HostCrc32(Part(bytes, at, end));
    chunks.push_back(chunk);
    at = end + kCrcLength;
  }
  return chunks;
}

Bytes Contents(const std::vector<SeenChunk>& chunks) {
  Bytes all;
  for (const SeenChunk& chunk : chunks) {
    all.insert(all.end(), chunk.data.begin(), chunk.data.end());
  }
  return all;
}

}  // namespace sim
