#include "simulator/transcript.h"

namespace sim {
namespace {

constexpr uint8_t kFirstPrintable = 0x20;
constexpr uint8_t kLastPrintable = 0x7E;
constexpr std::string_view kHexDigits = "0123456789ABCDEF";

void AppendEscaped(std::string& out, uint8_t byte) {
  if (byte == '\r') {
    out += "\\r";
  } else if (byte == '\n') {
    out += "\\n";
  } else if (byte == '\\') {
    out += "\\\\";
  } else if (byte >= kFirstPrintable && byte <= kLastPrintable) {
    out += static_cast<char>(byte);
  } else {
    out += "\\x";
    out += kHexDigits[byte >> 4];
    out += kHexDigits[byte & 0x0F];
  }
}

}  // namespace

std::string Escape(std::span<const uint8_t> bytes) {
  std::string out;
  for (const uint8_t byte : bytes) {
    AppendEscaped(out, byte);
  }
  return out;
}

std::string Escape(std::string_view text) {
  return Escape(std::span<const uint8_t>(ToBytes(text)));
}

void Transcript::WriteLine(char mark, std::string_view text) {
  if (out_ != nullptr) {
    *out_ << mark << ' ' << text << '\n' << std::flush;
  }
}

}  // namespace sim
