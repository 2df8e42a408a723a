#include "serial_ports.h"

#include <windows.h>

#include <setupapi.h>

#include <algorithm>
#include <map>
#include <memory>
#include <type_traits>

#include "names.h"

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

/// Port names in the order of their numbers.
struct ByNumber {
  bool operator()(const std::wstring& left, const std::wstring& right) const {
    if (left.size() != right.size()) return left.size() < right.size();
    return left < right;
  }
};
using Ports = std::map<std::wstring, std::wstring, ByNumber>;  // with their friendly names

/// A registry string: the size counts bytes, and the zero at the end may be missing.
std::wstring TextOf(const wchar_t* buffer, DWORD bytes) {
  std::wstring text(buffer, bytes / sizeof(wchar_t));
  return text.substr(0, text.find(L'\0'));
}

/// The ports that the serial drivers registered.
void AddRegistered(Ports& ports) {
  HKEY opened = nullptr;
  const LSTATUS status = RegOpenKeyExW(
      HKEY_LOCAL_MACHINE, L"HARDWARE\\DEVICEMAP\\SERIALCOMM", 0, KEY_QUERY_VALUE, &opened);
  if (status != ERROR_SUCCESS) return;
  const UniqueKey key(opened);
  for (DWORD i = 0;; ++i) {
    wchar_t name[kLongestText];
    wchar_t value[kLongestText];
    DWORD name_size = kLongestText;
    DWORD value_size = sizeof(value);
    DWORD type = REG_NONE;
    auto* const bytes = reinterpret_cast<BYTE*>(value);
    const LSTATUS read =
        RegEnumValueW(key.get(), i, name, &name_size, nullptr, &type, bytes, &value_size);
    if (read != ERROR_SUCCESS) return;
    const std::wstring port = TextOf(value, value_size);
    if (type == REG_SZ && IsComPort(port)) ports.try_emplace(port);
  }
}

/// The names that can be opened: some virtual ports are not registered.
void AddOpenable(Ports& ports) {
  std::wstring names;
  DWORD length = 0;
  for (DWORD size = 1 << 16; length == 0 && size <= 1 << 22; size *= 2) {
    names.resize(size);
    length = QueryDosDeviceW(nullptr, names.data(), size);
    if (length == 0 && GetLastError() != ERROR_INSUFFICIENT_BUFFER) return;
  }
  names.resize(length);
  std::size_t begin = 0;
  while (begin < names.size()) {
    const std::size_t end = std::min(names.find(L'\0', begin), names.size());
    const std::wstring name = names.substr(begin, end - begin);
    if (IsComPort(name)) ports.try_emplace(name);
    begin = end + 1;
  }
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

std::wstring FriendlyNameOf(HDEVINFO devices, SP_DEVINFO_DATA& device) {
  wchar_t value[kLongestText];
  DWORD size = 0;
  auto* const bytes = reinterpret_cast<BYTE*>(value);
  const BOOL read = SetupDiGetDeviceRegistryPropertyW(
      devices, &device, SPDRP_FRIENDLYNAME, nullptr, bytes, sizeof(value), &size);
  return read != FALSE ? TextOf(value, size) : std::wstring();
}

/// Windows' words for the ports, where it has some.
void AddFriendlyNames(Ports& ports) {
  const UniqueDeviceSet devices(SetupDiGetClassDevsW(
      &kComPortInterface, nullptr, nullptr, DIGCF_PRESENT | DIGCF_DEVICEINTERFACE));
  if (devices.get() == INVALID_HANDLE_VALUE) return;
  SP_DEVINFO_DATA device{};
  device.cbSize = sizeof(device);
  for (DWORD i = 0; SetupDiEnumDeviceInfo(devices.get(), i, &device) != FALSE; ++i) {
    const std::wstring port = PortOf(devices.get(), device);
    if (IsComPort(port)) ports[port] = FriendlyNameOf(devices.get(), device);
  }
}

}  // namespace

std::vector<SerialPort> ListSerialPorts() {
  Ports ports;
  AddRegistered(ports);
  AddOpenable(ports);
  AddFriendlyNames(ports);
  std::vector<SerialPort> list;
  for (const auto& [port, friendly_name] : ports) list.push_back({port, friendly_name});
  return list;
}

}  // namespace cli
