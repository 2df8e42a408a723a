// The devices that Windows knows, with one that the test adds to the registry.
#include <windows.h>

#include <gtest/gtest.h>

#include <algorithm>

#include "port_list.h"

namespace cli {
namespace {

const std::wstring kClass = L"{6b7c1f20-1111-4222-8333-944455556666}";
const std::wstring kEnum = L"SYSTEM\\CurrentControlSet\\Enum\\USB\\VID_12AB&PID_5678";
const std::wstring kInstance = L"RCVLINK-TEST";
const std::wstring kClasses = L"SYSTEM\\CurrentControlSet\\Control\\DeviceClasses\\" + kClass;
const std::wstring kPath = LR"(\\?\usb#vid_12ab&pid_5678#rcvlink-test#)" + kClass;

// The registry entries of a USB device that is plugged in.
class ListedDevice {
 public:
  explicit ListedDevice(const std::wstring& service) {
    const std::wstring device = kEnum + L"\\" + kInstance;
    const std::wstring interface_key =
        kClasses + L"\\##?#USB#VID_12AB&PID_5678#RCVLINK-TEST#" + kClass;
    made_ = Set(device, L"Service", service) && Set(device, L"DeviceDesc", L"A GNSS receiver") &&
            Set(device, L"ClassGUID", kClass) &&
            Set(interface_key, L"DeviceInstance", L"USB\\VID_12AB&PID_5678\\RCVLINK-TEST") &&
            Set(interface_key + L"\\#", L"SymbolicLink", kPath);
    const DWORD linked = 1;
    SetValue(interface_key + L"\\#\\Control", L"Linked", REG_DWORD, &linked, sizeof(linked));
  }
  ~ListedDevice() {
    RegDeleteTreeW(HKEY_LOCAL_MACHINE, kClasses.c_str());
    RegDeleteTreeW(HKEY_LOCAL_MACHINE, kEnum.c_str());
  }
  ListedDevice(const ListedDevice&) = delete;
  ListedDevice& operator=(const ListedDevice&) = delete;

  bool made() const { return made_; }

 private:
  static bool Set(const std::wstring& key, const wchar_t* name, const std::wstring& text) {
    const auto size = static_cast<DWORD>((text.size() + 1) * sizeof(wchar_t));
    return SetValue(key, name, REG_SZ, text.c_str(), size);
  }
  static bool SetValue(
      const std::wstring& key, const wchar_t* name, DWORD type, const void* data, DWORD size) {
    return RegSetKeyValueW(HKEY_LOCAL_MACHINE, key.c_str(), name, type, data, size) ==
           ERROR_SUCCESS;
  }

  bool made_ = false;
};

std::vector<Port> TestDevices() {
  std::vector<Port> ports = ListPorts();
  std::erase_if(ports, [](const Port& port) { return port.vendor != "12ab"; });
  return ports;
}

TEST(WindowsPortsTest, ADeviceOfTheDriverIsListed) {
  const ListedDevice device(L"usbio");
  if (!device.made()) GTEST_SKIP() << "this user may not write to the computer's registry";
  const std::vector<Port> ports = TestDevices();
  ASSERT_EQ(ports.size(), 1U);
  EXPECT_EQ(ports[0].name, kPath);
  EXPECT_EQ(ports[0].link, eInstanceUSB);
  EXPECT_EQ(ports[0].product, "5678");
  EXPECT_EQ(ports[0].friendly_name, L"A GNSS receiver");
}

TEST(WindowsPortsTest, ADeviceOfAnotherDriverIsNot) {
  const ListedDevice device(L"HidUsb");
  if (!device.made()) GTEST_SKIP() << "this user may not write to the computer's registry";
  EXPECT_TRUE(TestDevices().empty());
}

}  // namespace
}  // namespace cli
