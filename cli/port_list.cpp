#include "port_list.h"

#include <map>
#include <string_view>
#include <utility>

#include "names.h"
#include "text.h"

namespace cli {
namespace {

// Port names in the order of their numbers.
struct ByNumber {
  bool operator()(const std::wstring& left, const std::wstring& right) const {
    if (left.size() != right.size()) return left.size() < right.size();
    return left < right;
  }
};
using FriendlyNames = std::map<std::wstring, std::wstring, ByNumber>;

// The driver that receivers on USB come with, under whatever name it was installed.
bool IsUsbioDriver(const std::wstring& service) {
  return Capitals(service).find(L"USBIO") != std::wstring::npos;
}

// Whether the path is an interface of the hub's driver, which has one for every device. The
// device's own driver has another one.
bool IsOfHub(const std::wstring& path) {
  constexpr std::wstring_view kHubsClass = L"#{A5DCBF10-6530-11D2-901F-00C04FB951ED}";
  return Capitals(path).ends_with(kHubsClass);
}

// The four digits after a mark such as "VID_" in a device's path; empty when there are none.
std::string IdAfter(std::wstring_view mark, const std::wstring& path) {
  constexpr size_t kDigits = 4;
  const size_t position = Capitals(path).find(mark);
  if (position == std::wstring::npos) return {};
  const std::wstring id = path.substr(position + mark.size(), kDigits);
  const bool is_number = id.find_first_not_of(L"0123456789abcdefABCDEF") == std::wstring::npos;
  return id.size() == kDigits && is_number ? Lowered(ToUtf8(id)) : std::string();
}

std::vector<Port> ListComPorts(const PortSource& source) {
  FriendlyNames names;
  for (const std::wstring& port : source.RegisteredPorts()) {
    if (IsComPort(port)) names.try_emplace(Capitals(port));
  }
  for (const std::wstring& port : source.DeviceNames()) {
    if (IsComPort(port)) names.try_emplace(Capitals(port));
  }
  for (const auto& [port, friendly_name] : source.NamedPorts()) {
    if (IsComPort(port)) names[Capitals(port)] = friendly_name;
  }
  std::vector<Port> ports;
  for (const auto& [name, friendly_name] : names) {
    ports.push_back({.name = name, .friendly_name = friendly_name});
  }
  return ports;
}

// In the order of their paths.
std::vector<Port> ListUsbDevices(const PortSource& source) {
  std::map<std::wstring, Port> devices;
  for (const PortSource::UsbInterface& device : source.UsbInterfaces()) {
    if (!IsUsbioDriver(device.service) || IsOfHub(device.path)) continue;
    devices.try_emplace(Capitals(device.path),
                        Port{.name = device.path,
                             .link = eInstanceUSB,
                             .friendly_name = device.friendly_name,
                             .vendor = IdAfter(L"VID_", device.path),
                             .product = IdAfter(L"PID_", device.path)});
  }
  std::vector<Port> ports;
  for (const auto& [key, port] : devices) ports.push_back(port);
  return ports;
}

}  // namespace

std::vector<Port> ListPorts(const PortSource& source) {
  std::vector<Port> ports = ListComPorts(source);
  for (Port& device : ListUsbDevices(source)) ports.push_back(std::move(device));
  return ports;
}

std::string PortsInWords(const std::vector<Port>& ports, EInstanceType link) {
  std::vector<std::string> words;
  for (const Port& port : ports) {
    if (link != eInstanceAny && port.link != link) continue;
    const std::string name = Printable(port.name);
    const std::string friendly_name = Printable(port.friendly_name);
    words.push_back(friendly_name.empty() ? name : name + " (" + friendly_name + ")");
  }
  if (words.empty()) {
    return link == eInstanceUSB ? "This computer has no USB device with the USBIO driver."
                                : "This computer has no COM ports.";
  }
  std::string text = "This computer has ";
  for (size_t i = 0; i < words.size(); ++i) {
    if (i > 0) text += i + 1 == words.size() ? " and " : ", ";
    text += words[i];
  }
  return text + ".";
}

}  // namespace cli
