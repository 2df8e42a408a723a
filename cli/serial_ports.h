/// @file serial_ports.h
/// This computer's COM ports.
#ifndef RCVLINK_CLI_SERIAL_PORTS_H_
#define RCVLINK_CLI_SERIAL_PORTS_H_

#include <string>
#include <vector>

namespace cli {

struct SerialPort {
  std::wstring port;           ///< "COM7"
  std::wstring friendly_name;  ///< Windows' words for it; empty when it has none
};

/// All COM ports, in the order of their numbers.
std::vector<SerialPort> ListSerialPorts();

}  // namespace cli

#endif  // RCVLINK_CLI_SERIAL_PORTS_H_
