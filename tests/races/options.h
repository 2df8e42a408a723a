// How long the tests of this folder run. `./test --soak` sets both.
#ifndef RCVLINK_TESTS_RACES_OPTIONS_H_
#define RCVLINK_TESTS_RACES_OPTIONS_H_

#include <cstdint>
#include <cstdlib>

namespace races {

inline uint64_t NumberFromEnvironment(const char* name, uint64_t otherwise) {
  const char* const text = std::getenv(name);
  return text ? std::strtoull(text, nullptr, 10) : otherwise;
}

// Of every random number. The same seed makes the same rounds; the threads that run freely meet in
// them at other moments.
inline uint64_t Seed() { return NumberFromEnvironment("RCVLINK_SEED", 1); }

// How many times as long as in a usual run.
inline uint64_t Times() { return NumberFromEnvironment("RCVLINK_TIMES", 1); }

}  // namespace races

#endif  // RCVLINK_TESTS_RACES_OPTIONS_H_
