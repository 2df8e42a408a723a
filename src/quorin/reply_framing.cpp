#include "quorin/reply_framing.h"

#include <algorithm>
#include <charconv>

namespace QuorinCommands {
namespace {

constexpr size_t kIdentifierLength = 2;
constexpr size_t kMaxBodyLength = 4095;
constexpr int kHexadecimal = 16;

ReplyKind KindOf(std::string_view identifier) {
  if (identifier == "  ") return ReplyKind::kBlank;
  if (identifier == "RE") return ReplyKind::kReply;
  if (identifier == "ER") return ReplyKind::kError;
  return ReplyKind::kNone;
}

bool IsLetterOrDigit(char c) {
  return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z');
}

// The number at the start of the text, as scanf's %X reads it: an 0x before it is skipped, and
// hexadecimal digits after the three characters of the length count as well. A tagged body begins
// with "%", which ends the number. An untagged body must not begin with such a digit: its message
// would get another length.
std::optional<size_t> ScanHexadecimal(std::string_view text) {
  const auto parse = [](std::string_view digits) -> std::optional<size_t> {
    size_t value = 0;
    const auto [end, error] =
        std::from_chars(digits.data(), digits.data() + digits.size(), value, kHexadecimal);
    if (error != std::errc()) return std::nullopt;
    return value;
  };
  if (text.starts_with("0x") || text.starts_with("0X")) {
    if (const auto value = parse(text.substr(2))) return value;
  }
  return parse(text);
}

std::optional<size_t> BodyLength(std::string_view after_identifier) {
  constexpr size_t kLengthCharacters = kReplyHeaderLength - kIdentifierLength;
  if (!std::ranges::all_of(after_identifier.substr(0, kLengthCharacters), IsLetterOrDigit)) {
    return std::nullopt;
  }
  const auto length = ScanHexadecimal(after_identifier);
  return length && *length <= kMaxBodyLength ? length : std::nullopt;
}

}  // namespace

std::optional<ReplyHeader> FindReplyHeader(std::string_view bytes, size_t& scan_from) {
  for (; scan_from + kReplyHeaderLength <= bytes.size(); ++scan_from) {
    const ReplyKind kind = KindOf(bytes.substr(scan_from, kIdentifierLength));
    if (kind == ReplyKind::kNone) continue;
    const auto length = BodyLength(bytes.substr(scan_from + kIdentifierLength));
    if (length) return ReplyHeader{scan_from, kind, *length};
  }
  return std::nullopt;
}

}  // namespace QuorinCommands
