// The settings of a Quorin receiver's serial ports.
#ifndef SIMULATOR_QUORIN_SETTINGS_H_
#define SIMULATOR_QUORIN_SETTINGS_H_

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>

namespace sim {

inline constexpr char kFirstPortLetter = 'a';
inline constexpr char kLastPortLetter = 'd';

// What the host has set on one of the receiver's serial ports, by setting name ("parity", "rts",
// "stops", "rate", "echo").
using PortSettings = std::map<std::string, std::string, std::less<>>;

// The line speed that `text` names, if the receiver has it.
std::optional<uint32_t> ParseSpeed(std::string_view text);

// Whether a port has the setting and takes the value.
bool IsValidSetting(std::string_view setting, std::string_view value);

}  // namespace sim

#endif  // SIMULATOR_QUORIN_SETTINGS_H_
