// Where the bulk pipes of a device are: a walk through its configuration descriptor (USB 2.0,
// chapter 9.6).
#ifndef RCVLINK_TRANSPORT_USB_DESCRIPTORS_H_
#define RCVLINK_TRANSPORT_USB_DESCRIPTORS_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

constexpr size_t kConfigurationDescriptorLength = 9;

// How long a configuration descriptor is with all that belongs to it, told in its first 9 bytes.
size_t TotalLength(std::span<const uint8_t, kConfigurationDescriptorLength> configuration);

// Endpoint addresses; these stay where a device does not tell its own.
struct BulkEndpoints {
  uint8_t out = 0x01;
  uint8_t in = 0x81;

  bool operator==(const BulkEndpoints&) const = default;
};

// The bulk OUT and bulk IN endpoint of a whole configuration descriptor, which is read until both
// are there; of several of one direction ahead of the other's first, the last. Devices of these
// receivers have one interface, and behind it its endpoints (two at least) and nothing else; any
// other layout gives none.
std::optional<BulkEndpoints> FindBulkEndpoints(std::span<const uint8_t> descriptors);

#endif  // RCVLINK_TRANSPORT_USB_DESCRIPTORS_H_
