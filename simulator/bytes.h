// Bytes as the simulator handles them, and their way to and from text.
#ifndef SIMULATOR_BYTES_H_
#define SIMULATOR_BYTES_H_

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace sim {

using Bytes = std::vector<uint8_t>;

inline Bytes ToBytes(std::string_view text) { return Bytes(text.begin(), text.end()); }

inline std::string ToText(const Bytes& bytes) { return std::string(bytes.begin(), bytes.end()); }

}  // namespace sim

#endif  // SIMULATOR_BYTES_H_
