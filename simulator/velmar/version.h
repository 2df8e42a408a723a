// A Velmar receiver's identity, and the log with it.
#ifndef SIMULATOR_VELMAR_VERSION_H_
#define SIMULATOR_VELMAR_VERSION_H_

#include <string>
#include <vector>

#include "simulator/velmar/log.h"

namespace sim {

// A part of the receiver that has a version. Without a model it gets a plausible one.
struct VelmarComponent {
  std::string type;
  std::string model = {};
};

// The part that stands for the receiver itself, whose model and serial number are the receiver's.
inline constexpr const char* kReceiverCard = "GPSCARD";

// What a receiver says about itself.
struct VelmarIdentity {
  // The serial number.
  std::string id = "VM00731";
  std::string model = "VR4-L1L2";
  // What the receiver calls the port that the host is on.
  std::string port_name = "COM1";
  // In the order in which they are listed.
  std::vector<VelmarComponent> components = {{kReceiverCard}, {"DB_HEIGHTMODEL"}};
};

// The log with the versions of all components.
AsciiLog VersionLog(const VelmarIdentity& identity);

}  // namespace sim

#endif  // SIMULATOR_VELMAR_VERSION_H_
