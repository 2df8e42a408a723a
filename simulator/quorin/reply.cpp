#include "simulator/quorin/reply.h"

#include <algorithm>
#include <array>
#include <cstdio>

namespace sim {
namespace {

constexpr size_t kMaxBodyLength = 0xFFF;

}  // namespace

Bytes FrameReply(std::string_view identifier,
                 const std::optional<std::string>& tag,
                 std::string_view text,
                 int32_t length_error) {
  std::string body = tag ? "%" + *tag + "%" : "";
  body += text;
  body.resize(std::min(body.size(), kMaxBodyLength));

  const int64_t told = static_cast<int64_t>(body.size()) + length_error;
  const auto length = static_cast<unsigned>(std::clamp<int64_t>(told, 0, kMaxBodyLength));
  std::array<char, 4> digits{};
  std::snprintf(digits.data(), digits.size(), "%03X", length & 0xFFFU);
  return ToBytes(std::string(identifier) + digits.data() + body + "\r\n");
}

}  // namespace sim
