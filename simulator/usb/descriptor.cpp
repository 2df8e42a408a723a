#include "simulator/usb/descriptor.h"

#include <algorithm>

namespace sim {
namespace {

constexpr uint8_t kInterfaceDescriptor = 4;
constexpr uint8_t kEndpointDescriptor = 5;
constexpr uint8_t kClassDescriptor = 0x24;
constexpr uint8_t kVendorClass = 0xFF;
constexpr uint8_t kBusPowered = 0x80;
constexpr uint8_t kPower100mA = 50;
constexpr uint8_t kBulkPacket = 64;
constexpr uint8_t kOtherPacket = 16;
constexpr uint8_t kPollInterval = 10;
constexpr size_t kTotalLengthOffset = 2;

void Append(Bytes& bytes, const Bytes& more) {
  bytes.insert(bytes.end(), more.begin(), more.end());
}

Bytes MakeEndpoint(const Endpoint& endpoint, uint8_t length) {
  const bool bulk = endpoint.type == EndpointType::kBulk;
  Bytes bytes = {length,
                 kEndpointDescriptor,
                 endpoint.address,
                 static_cast<uint8_t>(endpoint.type),
                 bulk ? kBulkPacket : kOtherPacket,
                 0,
                 bulk ? uint8_t{0} : kPollInterval};
  bytes.resize(std::max<size_t>(bytes.size(), length));
  return bytes;
}

}  // namespace

Bytes MakeConfigurationDescriptor(const DescriptorOptions& options) {
  Bytes bytes = {kConfigurationHeaderLength,
                 kConfigurationDescriptor,
                 0,
                 0,
                 /*interfaces=*/1,
                 /*value=*/1,
                 /*name=*/0,
                 kBusPowered,
                 kPower100mA};
  Append(bytes,
         {9,
          kInterfaceDescriptor,
          /*number=*/0,
          /*alternate=*/0,
          static_cast<uint8_t>(options.endpoints.size()),
          kVendorClass,
          /*subclass=*/0,
          /*protocol=*/0,
          /*name=*/0});
  if (options.class_descriptor) {
    Append(bytes, {5, kClassDescriptor, 0x00, 0x10, 0x01});
    Append(bytes, {4, kClassDescriptor, 0x02, 0x02});
  }
  for (const Endpoint& endpoint : options.endpoints) {
    Append(bytes, MakeEndpoint(endpoint, options.endpoint_length));
  }
  const auto total = options.total_length.value_or(static_cast<uint16_t>(bytes.size()));
  bytes[kTotalLengthOffset] = static_cast<uint8_t>(total);
  bytes[kTotalLengthOffset + 1] = static_cast<uint8_t>(total >> 8);
  return bytes;
}

}  // namespace sim
