// The opening of a USB device that answers what the input says.
#include "tests/fuzz/target.h"
#include "tests/support/fake_device.h"
#include "transport/usb_connection.h"
#include "transport/usbio.h"

void fuzz::Target(std::span<const uint8_t> bytes) {
  Input input(bytes);
  FakeDevice device;
  for (const uint32_t code :
       {usbio::kGetDescriptor, usbio::kGetDescriptor, usbio::kSetConfiguration, usbio::kBindPipe}) {
    const DWORD error = input.Byte();
    device.request_answers[code].push_back({.error = error, .output = input.Text()});
  }
  CUSBConnection connection(device);
  connection.Open(L"\\\\?\\device");
}
