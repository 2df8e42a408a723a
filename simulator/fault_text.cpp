#include "simulator/fault_text.h"

#include <cmath>
#include <cstddef>

namespace sim {
namespace {

constexpr double kMsPerSecond = 1000.0;
constexpr double kMaxSilenceSeconds = 24.0 * 60 * 60;

}  // namespace

uint32_t ParseSeconds(std::string_view text) {
  const auto seconds = ParseNumber<double>(text, "number of seconds");
  if (!(seconds >= 0 && seconds <= kMaxSilenceSeconds)) {
    throw std::invalid_argument("'" + std::string(text) + "' is not between 0 and a day");
  }
  return static_cast<uint32_t>(std::lround(seconds * kMsPerSecond));
}

uint32_t ParseTimes(std::string_view text) {
  if (text == "always") {
    return kAlways;
  }
  const auto times = ParseNumber<uint32_t>(text, "number of times");
  if (times == 0) {
    throw std::invalid_argument("a fault that happens 0 times is none");
  }
  return times;
}

uint32_t CutTimes(std::string_view& text, uint32_t otherwise) {
  const size_t at = text.rfind('@');
  if (at == std::string_view::npos) {
    return otherwise;
  }
  const uint32_t times = ParseTimes(text.substr(at + 1));
  text = text.substr(0, at);
  return times;
}

std::pair<std::string_view, std::string_view> SplitAt(std::string_view text, char mark) {
  const size_t at = text.find(mark);
  if (at == std::string_view::npos) {
    return {text, {}};
  }
  return {text.substr(0, at), text.substr(at + 1)};
}

SizeLie ParseSizeLie(std::string_view text) {
  const size_t at = text.rfind('=');
  if (at == std::string_view::npos || at == 0) {
    throw std::invalid_argument("'" + std::string(text) + "' is not of the form NAME=SIZE");
  }
  return {std::string(text.substr(0, at)), ParseNumber<uint64_t>(text.substr(at + 1), "size")};
}

}  // namespace sim
