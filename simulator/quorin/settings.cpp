#include "simulator/quorin/settings.h"

#include <algorithm>
#include <array>
#include <charconv>

namespace sim {
namespace {

constexpr std::array<uint32_t, 12> kSpeeds = {
    300, 600, 1200, 2400, 4800, 9600, 19200, 38400, 57600, 115200, 230400, 460800};

struct Choice {
  std::string_view setting;
  std::string_view value;
};

constexpr std::array<Choice, 8> kChoices = {{
    {"parity", "N"},
    {"parity", "odd"},
    {"parity", "even"},
    {"rts", "on"},
    {"rts", "off"},
    {"stops", "1"},
    {"stops", "2"},
    {"echo", "/dev/null"},
}};

}  // namespace

std::optional<uint32_t> ParseSpeed(std::string_view text) {
  uint32_t speed = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, speed);
  if (error != std::errc() || stop != end ||
      std::find(kSpeeds.begin(), kSpeeds.end(), speed) == kSpeeds.end()) {
    return std::nullopt;
  }
  return speed;
}

bool IsValidSetting(std::string_view setting, std::string_view value) {
  if (setting == "rate") {
    return ParseSpeed(value).has_value();
  }
  return std::any_of(kChoices.begin(), kChoices.end(), [&](const Choice& choice) {
    return choice.setting == setting && choice.value == value;
  });
}

}  // namespace sim
