// The configuration descriptor of a simulated USB device.
#ifndef SIMULATOR_USB_DESCRIPTOR_H_
#define SIMULATOR_USB_DESCRIPTOR_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

#include "simulator/bytes.h"

namespace sim {

inline constexpr uint8_t kConfigurationDescriptor = 2;
// A configuration descriptor without what belongs to it.
inline constexpr size_t kConfigurationHeaderLength = 9;
inline constexpr uint8_t kEndpointDescriptorLength = 7;
inline constexpr uint8_t kDefaultInEndpoint = 0x81;
inline constexpr uint8_t kDefaultOutEndpoint = 0x02;

// The values are those of a descriptor.
enum class EndpointType : uint8_t { kControl, kIsochronous, kBulk, kInterrupt };

struct Endpoint {
  uint8_t address = 0;
  EndpointType type = EndpointType::kBulk;

  bool to_host() const { return (address & kDirectionBit) != 0; }

  static constexpr uint8_t kDirectionBit = 0x80;
};

// How a device describes itself. It has one configuration with one interface.
struct DescriptorOptions {
  // The receiver is on the first bulk endpoint of each direction.
  std::vector<Endpoint> endpoints = {{kDefaultInEndpoint}, {kDefaultOutEndpoint}};
  // Class-specific descriptors stand between the interface and its endpoints.
  bool class_descriptor = false;
  // The length in an endpoint descriptor. A longer one is filled up with zeros.
  uint8_t endpoint_length = kEndpointDescriptorLength;
  // The total length that the descriptor gives, instead of the true one.
  std::optional<uint16_t> total_length = std::nullopt;
};

Bytes MakeConfigurationDescriptor(const DescriptorOptions& options);

}  // namespace sim

#endif  // SIMULATOR_USB_DESCRIPTOR_H_
