// Where the bulk pipes of a device are: a walk through its configuration descriptor (USB 2.0,
// chapter 9.6).
#ifndef RCVLINK_TRANSPORT_USB_DESCRIPTORS_H_
#define RCVLINK_TRANSPORT_USB_DESCRIPTORS_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>

namespace rcvlink {

constexpr size_t kConfigurationDescriptorLength = 9;

// The length of a configuration descriptor and all that follows it, as its first 9 bytes give it.
size_t TotalLength(std::span<const uint8_t, kConfigurationDescriptorLength> configuration);

// Endpoint addresses. The defaults are endpoint 1 of each direction.
struct BulkEndpoints {
  uint8_t out = 0x01;
  uint8_t in = 0x81;

  bool operator==(const BulkEndpoints&) const = default;
};

// Finds the bulk OUT and the bulk IN endpoint of a whole configuration descriptor. The endpoints
// are read in order until there is one of each direction; when two of one direction come first, the
// second one counts. Without both, the defaults are used.
//
// Receivers have one interface, and after its descriptor its endpoints (two at least) and nothing
// else. Any other layout gives none, so that no pipe of another kind of device is bound.
std::optional<BulkEndpoints> FindBulkEndpoints(std::span<const uint8_t> descriptors);

}  // namespace rcvlink

#endif  // RCVLINK_TRANSPORT_USB_DESCRIPTORS_H_
