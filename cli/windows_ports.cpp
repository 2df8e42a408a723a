// The ports and devices that Windows knows, from the registry, the device names, and SetupAPI.
#include <windows.h>

#include <objbase.h>
#include <setupapi.h>

#include <algorithm>
#include <memory>
#include <type_traits>

#include "port_list.h"

namespace cli {
namespace {

// The interface that every driver of a serial port offers (GUID_DEVINTERFACE_COMPORT, whose
// definition needs a header of the driver kit).
constexpr GUID kComPortInterface = {
    0x86E0D1E0, 0x8089, 0x11D0, {0x9C, 0xE4, 0x08, 0x00, 0x3E, 0x30, 0x1F, 0x73}};

constexpr DWORD kLongestText = 1024;

struct KeyCloser {
  void operator()(HKEY key) const { RegCloseKey(key); }
};
using UniqueKey = std::unique_ptr<std::remove_pointer_t<HKEY>, KeyCloser>;

struct DeviceSetCloser {
  using pointer = HDEVINFO;
  void operator()(HDEVINFO set) const {
    if (set != INVALID_HANDLE_VALUE) SetupDiDestroyDeviceInfoList(set);
  }
};
using UniqueDeviceSet = std::unique_ptr<HDEVINFO, DeviceSetCloser>;

// A registry string: the size counts bytes, and the zero at the end may be missing.
std::wstring TextOf(const wchar_t* buffer, DWORD bytes) {
  std::wstring text(buffer, bytes / sizeof(wchar_t));
  return text.substr(0, text.find(L'\0'));
}

UniqueKey OpenMachineKey(const wchar_t* path, REGSAM access) {
  HKEY opened = nullptr;
  const LSTATUS status = RegOpenKeyExW(HKEY_LOCAL_MACHINE, path, 0, access, &opened);
  return UniqueKey(status == ERROR_SUCCESS ? opened : nullptr);
}

std::wstring PortOf(HDEVINFO devices, SP_DEVINFO_DATA& device) {
  const HKEY opened =
      SetupDiOpenDevRegKey(devices, &device, DICS_FLAG_GLOBAL, 0, DIREG_DEV, KEY_QUERY_VALUE);
  if (opened == INVALID_HANDLE_VALUE) return {};
  const UniqueKey key(opened);
  wchar_t value[kLongestText];
  DWORD size = sizeof(value);
  auto* const bytes = reinterpret_cast<BYTE*>(value);
  const LSTATUS read = RegQueryValueExW(key.get(), L"PortName", nullptr, nullptr, bytes, &size);
  return read == ERROR_SUCCESS ? TextOf(value, size) : std::wstring();
}

std::wstring PropertyOf(HDEVINFO devices, SP_DEVINFO_DATA& device, DWORD property) {
  wchar_t value[kLongestText];
  DWORD size = 0;
  auto* const bytes = reinterpret_cast<BYTE*>(value);
  const BOOL read = SetupDiGetDeviceRegistryPropertyW(
      devices, &device, property, nullptr, bytes, sizeof(value), &size);
  return read ? TextOf(value, size) : std::wstring();
}

// The name of a device: its own where it has one, otherwise that of its kind.
std::wstring WordsOf(HDEVINFO devices, SP_DEVINFO_DATA& device) {
  const std::wstring name = PropertyOf(devices, device, SPDRP_FRIENDLYNAME);
  return name.empty() ? PropertyOf(devices, device, SPDRP_DEVICEDESC) : name;
}

UniqueDeviceSet PresentDevices(const GUID& interface_class) {
  return UniqueDeviceSet(SetupDiGetClassDevsW(
      &interface_class, nullptr, nullptr, DIGCF_PRESENT | DIGCF_DEVICEINTERFACE));
}

// The path of an interface, and the device that it belongs to.
std::wstring PathOf(HDEVINFO devices,
                    SP_DEVICE_INTERFACE_DATA& interface_data,
                    SP_DEVINFO_DATA& device) {
  alignas(SP_DEVICE_INTERFACE_DETAIL_DATA_W)
      BYTE buffer[sizeof(SP_DEVICE_INTERFACE_DETAIL_DATA_W) + kLongestText * sizeof(wchar_t)];
  auto* const detail = reinterpret_cast<SP_DEVICE_INTERFACE_DETAIL_DATA_W*>(buffer);
  detail->cbSize = sizeof(*detail);
  const BOOL told = SetupDiGetDeviceInterfaceDetailW(
      devices, &interface_data, detail, sizeof(buffer), nullptr, &device);
  return told ? std::wstring(detail->DevicePath) : std::wstring();
}

// The interface classes that devices have registered.
std::vector<GUID> InterfaceClasses() {
  std::vector<GUID> classes;
  const UniqueKey key =
      OpenMachineKey(L"SYSTEM\\CurrentControlSet\\Control\\DeviceClasses", KEY_ENUMERATE_SUB_KEYS);
  wchar_t name[kLongestText];
  for (DWORD i = 0; key != nullptr; ++i) {
    DWORD size = kLongestText;
    if (RegEnumKeyExW(key.get(), i, name, &size, nullptr, nullptr, nullptr, nullptr) !=
        ERROR_SUCCESS) {
      break;
    }
    GUID id{};
    if (SUCCEEDED(CLSIDFromString(name, &id))) classes.push_back(id);
  }
  return classes;
}

class WindowsPorts : public PortSource {
 public:
  std::vector<std::wstring> RegisteredPorts() const override {
    std::vector<std::wstring> ports;
    const UniqueKey key = OpenMachineKey(L"HARDWARE\\DEVICEMAP\\SERIALCOMM", KEY_QUERY_VALUE);
    for (DWORD i = 0; key != nullptr; ++i) {
      wchar_t name[kLongestText];
      wchar_t value[kLongestText];
      DWORD name_size = kLongestText;
      DWORD value_size = sizeof(value);
      DWORD type = REG_NONE;
      auto* const bytes = reinterpret_cast<BYTE*>(value);
      const LSTATUS read =
          RegEnumValueW(key.get(), i, name, &name_size, nullptr, &type, bytes, &value_size);
      if (read != ERROR_SUCCESS) break;
      if (type == REG_SZ) ports.push_back(TextOf(value, value_size));
    }
    return ports;
  }

  std::vector<std::wstring> DeviceNames() const override {
    constexpr DWORD kFirstSize = 1 << 16;
    constexpr DWORD kLastSize = 1 << 22;
    std::wstring names;
    DWORD length = 0;
    for (DWORD size = kFirstSize; length == 0 && size <= kLastSize; size *= 2) {
      names.resize(size);
      length = QueryDosDeviceW(nullptr, names.data(), size);
      if (length == 0 && GetLastError() != ERROR_INSUFFICIENT_BUFFER) return {};
    }
    names.resize(length);
    std::vector<std::wstring> list;
    size_t begin = 0;
    while (begin < names.size()) {
      const size_t end = std::min(names.find(L'\0', begin), names.size());
      list.push_back(names.substr(begin, end - begin));
      begin = end + 1;
    }
    return list;
  }

  std::vector<NamedPort> NamedPorts() const override {
    std::vector<NamedPort> ports;
    const UniqueDeviceSet devices = PresentDevices(kComPortInterface);
    SP_DEVINFO_DATA device{};
    device.cbSize = sizeof(device);
    for (DWORD i = 0; SetupDiEnumDeviceInfo(devices.get(), i, &device); ++i) {
      ports.push_back(
          {PortOf(devices.get(), device), PropertyOf(devices.get(), device, SPDRP_FRIENDLYNAME)});
    }
    return ports;
  }

  // The USBIO driver is installed with an interface class of each maker's own, so all are looked at.
  std::vector<UsbInterface> UsbInterfaces() const override {
    std::vector<UsbInterface> interfaces;
    for (const GUID& interface_class : InterfaceClasses()) {
      const UniqueDeviceSet devices(PresentDevices(interface_class));
      SP_DEVICE_INTERFACE_DATA found{};
      found.cbSize = sizeof(found);
      for (DWORD i = 0;
           SetupDiEnumDeviceInterfaces(devices.get(), nullptr, &interface_class, i, &found);
           ++i) {
        SP_DEVINFO_DATA device{};
        device.cbSize = sizeof(device);
        const std::wstring path = PathOf(devices.get(), found, device);
        if (path.empty()) continue;
        interfaces.push_back({path,
                              PropertyOf(devices.get(), device, SPDRP_SERVICE),
                              WordsOf(devices.get(), device)});
      }
    }
    return interfaces;
  }
};

}  // namespace

std::vector<Port> ListPorts() { return ListPorts(WindowsPorts()); }

}  // namespace cli
