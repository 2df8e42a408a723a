// What a host says to the driver of real receivers on USB.
#ifndef SIMULATOR_USB_INTERFACE_H_
#define SIMULATOR_USB_INTERFACE_H_

#include <cstddef>
#include <cstdint>

namespace sim::usb {

// Control codes.
inline constexpr uint32_t kGetDescriptor = 0x80942006;
inline constexpr uint32_t kSetConfiguration = 0x80942024;
inline constexpr uint32_t kBindPipe = 0x80942078;
inline constexpr uint32_t kUnbindPipe = 0x8094207C;
inline constexpr uint32_t kResetPipe = 0x80942080;

// The input of kGetDescriptor: recipient (32 bits), type, index, language (16 bits).
inline constexpr size_t kDescriptorRequestLength = 8;
inline constexpr size_t kRecipientOffset = 0;
inline constexpr size_t kTypeOffset = 4;
inline constexpr size_t kIndexOffset = 5;
inline constexpr uint32_t kRecipientDevice = 0;

// The input of kSetConfiguration: the configuration's index and the number of interfaces, 16 bits
// each, and 32 entries: interface and alternate setting, 16 bits each, and the largest transfer,
// 32 bits.
inline constexpr size_t kConfigurationLength = 260;
inline constexpr size_t kInterfaceCountOffset = 2;
inline constexpr size_t kInterfacesOffset = 4;
inline constexpr size_t kInterfaceLength = 8;
inline constexpr size_t kAlternateOffset = 2;
inline constexpr size_t kTransferOffset = 4;
inline constexpr size_t kMaxInterfaces = 32;

// Results of requests: NTSTATUS values, and the driver's own numbers, which the host gets from
// GetLastError unchanged.
inline constexpr uint32_t kSuccess = 0;
inline constexpr uint32_t kInvalidParameter = 0xC000000D;
inline constexpr uint32_t kInvalidDeviceRequest = 0xC0000010;
inline constexpr uint32_t kCancelled = 0xC0000120;
inline constexpr uint32_t kInvalidDeviceState = 0xC0000184;
inline constexpr uint32_t kNotBound = 0xE0001009;

}  // namespace sim::usb

#endif  // SIMULATOR_USB_INTERFACE_H_
