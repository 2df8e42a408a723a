// Random damage of bytes on a line, the same for the same seed.
#ifndef SIMULATOR_NOISE_H_
#define SIMULATOR_NOISE_H_

#include <cstdint>
#include <optional>
#include <random>
#include <string_view>
#include <vector>

namespace sim {

enum class NoiseKind {
  kFlip,    // One bit of the byte is wrong.
  kDrop,    // The byte is lost.
  kInsert,  // Another byte comes before it.
  kDouble,  // The byte comes twice.
  kBurst,   // This byte and the next ones are wrong.
  kStall,   // Nothing comes from the receiver for a while.
  kUnplug,  // The byte is lost, and the line is dead for a while.
};

std::vector<NoiseKind> AllNoiseKinds();

// The word for a kind in a transcript and on a command line.
std::string_view NoiseName(NoiseKind kind);

// What happens to one byte. `amount` is the bits that are wrong for kFlip and kBurst, the byte for
// kInsert, and milliseconds for kStall and kUnplug.
struct Damage {
  NoiseKind kind = NoiseKind::kFlip;
  uint32_t amount = 0;
};

// Says what happens to each byte of one direction of a line. That depends only on the seed and on
// how many bytes came before.
class Noise {
 public:
  // `rate` is the chance of a byte to be damaged, from 0 to 1. All `kinds`, of which there must be
  // at least one, are equally likely.
  Noise(double rate, std::vector<NoiseKind> kinds, uint64_t seed);

  // What happens to the next byte; nothing as a rule.
  std::optional<Damage> Next();

 private:
  uint32_t Between(uint32_t least, uint32_t most);

  double rate_;
  std::vector<NoiseKind> kinds_;
  // Its numbers are the same everywhere; those of the library's distributions are not.
  std::mt19937_64 generator_;
  // How many bytes a burst still damages.
  uint32_t burst_left_ = 0;
};

}  // namespace sim

#endif  // SIMULATOR_NOISE_H_
