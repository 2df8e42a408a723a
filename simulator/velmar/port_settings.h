// The settings of a Velmar receiver's serial ports.
#ifndef SIMULATOR_VELMAR_PORT_SETTINGS_H_
#define SIMULATOR_VELMAR_PORT_SETTINGS_H_

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "simulator/line.h"
#include "simulator/velmar/log.h"

namespace sim {

// What a serial port is set to, in the receiver's words.
struct VelmarPortSettings {
  uint32_t speed = kDefaultSpeed;
  std::string parity = "N";
  std::string data_bits = "8";
  std::string stop_bits = "1";
  std::string handshake = "N";
};

// Reads "SPEED [PARITY [DATABITS [STOPBITS [HANDSHAKE]]]]"; what is missing becomes N, 8, 1, N.
// Nothing if the receiver does not have one of the values.
std::optional<VelmarPortSettings> ParsePortSettings(std::string_view arguments);

// The log with the settings of all serial ports. The port that the host is on has `settings`, the
// others have those of a new receiver. A port that is not serial is not listed.
AsciiLog PortConfigLog(std::string_view own_port, const VelmarPortSettings& settings);

}  // namespace sim

#endif  // SIMULATOR_VELMAR_PORT_SETTINGS_H_
