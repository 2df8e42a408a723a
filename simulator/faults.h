// Faults of a receiver, as far as all families share them: how often they happen.
#ifndef SIMULATOR_FAULTS_H_
#define SIMULATOR_FAULTS_H_

#include <cstdint>
#include <string>

namespace sim {

// How often a fault happens before the receiver behaves again.
inline constexpr uint32_t kOnce = 1;
inline constexpr uint32_t kAlways = UINT32_MAX;

// Counts one occurrence of a fault; false when none is left.
inline bool TakeOccurrence(uint32_t& times) {
  if (times == 0) {
    return false;
  }
  if (times != kAlways) {
    --times;
  }
  return true;
}

// The receiver gives the file this size, whatever it sends.
struct SizeLie {
  std::string file;
  uint64_t size = 0;
};

}  // namespace sim

#endif  // SIMULATOR_FAULTS_H_
