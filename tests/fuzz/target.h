// What a fuzz target is, and how it reads its input.
#ifndef RCVLINK_TESTS_FUZZ_TARGET_H_
#define RCVLINK_TESTS_FUZZ_TARGET_H_

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <utility>
#include <vector>

namespace fuzz {

// Each source of a target has one.
void Target(std::span<const uint8_t> input);

// The input, taken from its beginning; zeros and empty texts after its end.
class Input {
 public:
  explicit Input(std::span<const uint8_t> bytes) : bytes_(bytes) {}

  bool AtEnd() const { return bytes_.empty(); }
  uint8_t Byte() {
    if (AtEnd()) return 0;
    const uint8_t byte = bytes_.front();
    bytes_ = bytes_.subspan(1);
    return byte;
  }
  uint16_t Word() {
    const uint8_t low = Byte();
    return static_cast<uint16_t>(low | Byte() << 8);
  }
  std::string Text(size_t size) {
    const auto taken = bytes_.first(std::min(size, bytes_.size()));
    bytes_ = bytes_.subspan(taken.size());
    return {taken.begin(), taken.end()};
  }
  std::string Text() { return Text(Byte()); }
  std::string Rest() { return Text(bytes_.size()); }
  // In memory of their own length, so that the sanitizer sees a read beyond it: a text has its zero there.
  std::vector<char> RestAlone() {
    const auto rest = std::exchange(bytes_, {});
    return {rest.begin(), rest.end()};
  }

 private:
  std::span<const uint8_t> bytes_;
};

}  // namespace fuzz

#endif  // RCVLINK_TESTS_FUZZ_TARGET_H_
