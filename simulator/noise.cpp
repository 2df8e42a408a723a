#include "simulator/noise.h"

#include <array>
#include <limits>
#include <utility>

namespace sim {
namespace {

struct NamedKind {
  NoiseKind kind;
  std::string_view name;
};
constexpr std::array kKinds = {NamedKind{NoiseKind::kFlip, "flip"},
                               NamedKind{NoiseKind::kDrop, "drop"},
                               NamedKind{NoiseKind::kInsert, "insert"},
                               NamedKind{NoiseKind::kDouble, "double"},
                               NamedKind{NoiseKind::kBurst, "burst"},
                               NamedKind{NoiseKind::kStall, "stall"},
                               NamedKind{NoiseKind::kUnplug, "unplug"}};

constexpr uint32_t kLastBit = 7;
constexpr uint32_t kShortestBurst = 2;
constexpr uint32_t kLongestBurst = 16;
// Shorter and longer than what hosts wait for a byte.
constexpr uint32_t kShortestStallMs = 50;
constexpr uint32_t kLongestStallMs = 5000;
constexpr uint32_t kShortestUnplugMs = 500;
constexpr uint32_t kLongestUnplugMs = 5000;

}  // namespace

std::vector<NoiseKind> AllNoiseKinds() {
  std::vector<NoiseKind> kinds;
  for (const NamedKind& named : kKinds) {
    kinds.push_back(named.kind);
  }
  return kinds;
}

std::string_view NoiseName(NoiseKind kind) {
  for (const NamedKind& named : kKinds) {
    if (named.kind == kind) {
      return named.name;
    }
  }
  return "unknown";
}

Noise::Noise(double rate, std::vector<NoiseKind> kinds, uint64_t seed)
    : rate_(rate), kinds_(std::move(kinds)), generator_(seed) {}

uint32_t Noise::Between(uint32_t least, uint32_t most) {
  return least + static_cast<uint32_t>(generator_() % (most - least + 1));
}

std::optional<Damage> Noise::Next() {
  constexpr uint32_t kLastByte = std::numeric_limits<uint8_t>::max();
  if (burst_left_ > 0) {
    --burst_left_;
    return Damage{NoiseKind::kBurst, Between(1, kLastByte)};
  }
  // From 0 up to, but without, 1.
  constexpr double kRange = 0x1p64;
  if (rate_ == 0 || static_cast<double>(generator_()) / kRange >= rate_) {
    return std::nullopt;
  }
  const NoiseKind kind = kinds_[Between(0, static_cast<uint32_t>(kinds_.size()) - 1)];
  switch (kind) {
    case NoiseKind::kFlip:
      return Damage{kind, 1U << Between(0, kLastBit)};
    case NoiseKind::kInsert:
      return Damage{kind, Between(0, kLastByte)};
    case NoiseKind::kBurst:
      burst_left_ = Between(kShortestBurst, kLongestBurst) - 1;
      return Damage{kind, Between(1, kLastByte)};
    case NoiseKind::kStall:
      return Damage{kind, Between(kShortestStallMs, kLongestStallMs)};
    case NoiseKind::kUnplug:
      return Damage{kind, Between(kShortestUnplugMs, kLongestUnplugMs)};
    case NoiseKind::kDrop:
    case NoiseKind::kDouble:
      break;
  }
  return Damage{kind, 0};
}

}  // namespace sim
