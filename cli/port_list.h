// The ports of this computer on which a receiver may be.
#ifndef RCVLINK_CLI_PORT_LIST_H_
#define RCVLINK_CLI_PORT_LIST_H_

#include <string>
#include <vector>

#include "rcvlink.h"

namespace cli {

struct Port {
  std::wstring name{};  // "COM7", or the path of a USB device
  EInstanceType link = eInstanceSerial;
  std::wstring friendly_name{};  // Windows' name for it; empty when it has none
  std::string vendor{};          // of a USB device, "1234"; empty when it is not in its path
  std::string product{};         // the same
};

// The ports and devices that Windows knows.
class PortSource {
 public:
  struct NamedPort {
    std::wstring port;
    std::wstring friendly_name;
  };

  // An interface of a USB device.
  struct UsbInterface {
    std::wstring path;     // as `CreateFileW` takes it
    std::wstring service;  // the name of its driver
    std::wstring friendly_name;
  };

  virtual ~PortSource() = default;

  // The ports that the serial drivers registered.
  virtual std::vector<std::wstring> RegisteredPorts() const = 0;

  // All names of devices that can be opened: some virtual ports are not registered.
  virtual std::vector<std::wstring> DeviceNames() const = 0;

  // The ports that have a friendly name.
  virtual std::vector<NamedPort> NamedPorts() const = 0;

  virtual std::vector<UsbInterface> UsbInterfaces() const = 0;
};

// All COM ports in the order of their numbers, then the devices of the USBIO driver.
std::vector<Port> ListPorts(const PortSource& source);

// The ports of this computer, from Windows.
std::vector<Port> ListPorts();

// The ports of a link, as a hint: "This computer has COM3 (USB Serial Port) and COM7."
std::string PortsInWords(const std::vector<Port>& ports, EInstanceType link);

}  // namespace cli

#endif  // RCVLINK_CLI_PORT_LIST_H_
