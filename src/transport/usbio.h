// The part of the USBIO kernel driver's interface that the library uses: control codes for
// DeviceIoControl and their records. All numbers are little-endian, as x64 stores them.
#ifndef RCVLINK_TRANSPORT_USBIO_H_
#define RCVLINK_TRANSPORT_USBIO_H_

#include <array>
#include <cstdint>

namespace usbio {

// USBIO control codes, made as by Windows' CTL_CODE: the device type 0x8094 in the upper 16 bits,
// function and buffer method in the lower ones.
constexpr uint32_t kGetDescriptor = 0x80942006;     // in: DescriptorRequest, out: the descriptor
constexpr uint32_t kSetConfiguration = 0x80942024;  // in: ConfigurationRequest
constexpr uint32_t kBindPipe = 0x80942078;          // in: an endpoint address, one byte
constexpr uint32_t kUnbindPipe = 0x8094207C;        // nothing in or out
constexpr uint32_t kResetPipe = 0x80942080;         // nothing in or out

struct DescriptorRequest {
  uint32_t recipient = 0;  // the device
  uint8_t type = 2;        // configuration
  uint8_t index = 0;
  uint16_t language = 0;
};
static_assert(sizeof(DescriptorRequest) == 8);

struct InterfaceSetting {
  uint16_t interface_index = 0;
  uint16_t alternate_setting = 0;
  uint32_t max_transfer_bytes = 0;
};

// Selects the first configuration with its one interface.
struct ConfigurationRequest {
  static constexpr uint32_t kMaxTransferBytes = 4096;

  uint16_t configuration_index = 0;
  uint16_t interface_count = 1;
  std::array<InterfaceSetting, 32> interfaces = {{{0, 0, kMaxTransferBytes}}};
};
static_assert(sizeof(ConfigurationRequest) == 260);

// The driver's own errors. They come as the Win32 last error. Being negative they are failing
// HRESULTs, and reach the host unchanged.
constexpr uint32_t kCrcError = 0xE0000001;
constexpr uint32_t kBitStuffError = 0xE0000002;
constexpr uint32_t kDataToggleError = 0xE0000003;
constexpr uint32_t kNotBoundError = 0xE0001009;

}  // namespace usbio

#endif  // RCVLINK_TRANSPORT_USBIO_H_
