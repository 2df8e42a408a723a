#include "simulator/damage_text.h"

#include <stdexcept>
#include <string>

#include "simulator/fault_text.h"

namespace sim {
namespace {

constexpr std::string_view kTime = "time";
constexpr std::string_view kByte = "byte";
constexpr std::string_view kBlock = "block";

NoiseKind ParseNoiseKind(std::string_view name) {
  std::string known;
  for (const NoiseKind kind : AllNoiseKinds()) {
    if (NoiseName(kind) == name) {
      return kind;
    }
    known += ' ' + std::string(NoiseName(kind));
  }
  throw std::invalid_argument("'" + std::string(name) + "' is none of" + known);
}

}  // namespace

double ParseRate(std::string_view text) {
  const auto rate = ParseNumber<double>(text, "number");
  if (!(rate >= 0 && rate <= 1)) {
    throw std::invalid_argument("'" + std::string(text) + "' is not between 0 and 1");
  }
  return rate;
}

std::vector<NoiseKind> ParseNoiseKinds(std::string_view text) {
  std::vector<NoiseKind> kinds;
  for (bool more = true; more;) {
    const auto [name, rest] = SplitAt(text, ',');
    kinds.push_back(ParseNoiseKind(name));
    more = name.size() < text.size();
    text = rest;
  }
  return kinds;
}

LineEvent ParseLineEvent(LineEventKind kind, std::string_view text) {
  const auto [when, duration] = SplitAt(text, ':');
  const auto [word, number] = SplitAt(when, '=');
  LineEvent event;
  event.kind = kind;
  if (number.empty()) {
    throw std::invalid_argument("'" + std::string(text) +
                                "' does not begin with time=, byte= or block= and a number");
  }
  if (word == kTime) {
    event.start = LineEventStart::kTime;
    event.at = ParseSeconds(number);
  } else if (word == kByte || word == kBlock) {
    event.start = word == kByte ? LineEventStart::kByte : LineEventStart::kBlock;
    event.at = ParseNumber<uint64_t>(number, "number");
  } else {
    throw std::invalid_argument("'" + std::string(word) + "' is none of time, byte and block");
  }
  if (when.size() < text.size()) {
    event.duration_ms = ParseSeconds(duration);
  } else if (kind == LineEventKind::kSilence) {
    throw std::invalid_argument("'" + std::string(text) + "' does not say for how many seconds");
  }
  return event;
}

}  // namespace sim
