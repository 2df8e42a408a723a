#include "port_list.h"

#include <gtest/gtest.h>

namespace cli {
namespace {

// A computer with just these ports.
class FakeSource : public PortSource {
 public:
  std::vector<std::wstring> RegisteredPorts() const override { return registered; }
  std::vector<std::wstring> DeviceNames() const override { return devices; }
  std::vector<NamedPort> NamedPorts() const override { return named; }
  std::vector<UsbInterface> UsbInterfaces() const override { return usb; }

  std::vector<std::wstring> registered;
  std::vector<std::wstring> devices;
  std::vector<NamedPort> named;
  std::vector<UsbInterface> usb;
};

std::vector<std::wstring> NamesOf(const FakeSource& source) {
  std::vector<std::wstring> names;
  for (const Port& port : ListPorts(source)) names.push_back(port.name);
  return names;
}

using Names = std::vector<std::wstring>;

TEST(PortListTest, ComPortsAreInTheOrderOfTheirNumbers) {
  FakeSource source;
  source.registered = {L"COM10", L"COM9"};
  source.devices = {L"C:", L"COM2", L"NUL", L"COM10", L"COMPANY"};
  source.named = {{L"com9", L"USB Serial Port (COM9)"}, {L"LPT1", L"Printer Port"}};
  EXPECT_EQ(NamesOf(source), (Names{L"COM2", L"COM9", L"COM10"}));
  const std::vector<Port> ports = ListPorts(source);
  EXPECT_EQ(ports[0].friendly_name, L"");
  EXPECT_EQ(ports[1].friendly_name, L"USB Serial Port (COM9)");
  EXPECT_EQ(ports[1].link, eInstanceSerial);
}

constexpr wchar_t kDevice[] =
    LR"(\\?\usb#vid_12Ab&pid_5678#0001#{11111111-2222-3333-4444-555555555555})";

TEST(PortListTest, DevicesOfTheDriverFollowWithTheirIds) {
  FakeSource source;
  source.registered = {L"COM1"};
  source.usb = {{kDevice, L"usbio", L"GNSS receiver"}};
  EXPECT_EQ(NamesOf(source), (Names{L"COM1", kDevice}));
  const Port device = ListPorts(source)[1];
  EXPECT_EQ(device.link, eInstanceUSB);
  EXPECT_EQ(device.friendly_name, L"GNSS receiver");
  EXPECT_EQ(device.vendor, "12ab");
  EXPECT_EQ(device.product, "5678");
}

TEST(PortListTest, DevicesOfOtherDriversAreNotListed) {
  FakeSource source;
  source.usb = {{kDevice, L"HidUsb", L"Mouse"}, {LR"(\\?\usb#other#{1})", L"", L""}};
  EXPECT_TRUE(ListPorts(source).empty());
  source.usb = {{kDevice, L"QR_USBIO2", L""}};
  EXPECT_EQ(NamesOf(source), Names{kDevice});
}

// The hub's driver and the device's own both offer an interface of the same device.
TEST(PortListTest, ADeviceIsListedOnce) {
  FakeSource source;
  source.usb = {
      {LR"(\\?\usb#vid_12ab&pid_5678#0001#{a5dcbf10-6530-11d2-901f-00c04fb951ed})", L"usbio", L""},
      {kDevice, L"usbio", L""},
      {kDevice, L"usbio", L""}};
  EXPECT_EQ(NamesOf(source), Names{kDevice});
}

TEST(PortListTest, APathWithoutIdsHasNone) {
  FakeSource source;
  for (const wchar_t* const path : {LR"(\\?\receiver)",
                                    LR"(\\?\usb#vid_12&pid_)",
                                    LR"(\\?\usb#pid_12)",
                                    LR"(\\?\usb#vid_12xy&pid_zzzz)"}) {
    source.usb = {{path, L"usbio", L""}};
    const std::vector<Port> ports = ListPorts(source);
    ASSERT_EQ(ports.size(), 1U);
    EXPECT_EQ(ports[0].vendor, "");
    EXPECT_EQ(ports[0].product, "");
  }
}

TEST(PortListTest, TheHintNamesThePortsOfTheLink) {
  FakeSource source;
  EXPECT_EQ(PortsInWords(ListPorts(source), eInstanceSerial), "This computer has no COM ports.");
  EXPECT_EQ(PortsInWords(ListPorts(source), eInstanceUSB),
            "This computer has no USB device with the USBIO driver.");
  source.registered = {L"COM1", L"COM2", L"COM3"};
  source.named = {{L"COM2", L"Modem"}};
  source.usb = {{LR"(\\?\receiver)", L"usbio", L""}};
  const std::vector<Port> ports = ListPorts(source);
  EXPECT_EQ(PortsInWords(ports, eInstanceSerial), "This computer has COM1, COM2 (Modem) and COM3.");
  EXPECT_EQ(PortsInWords(ports, eInstanceUSB), R"(This computer has \\?\receiver.)");
}

}  // namespace
}  // namespace cli
