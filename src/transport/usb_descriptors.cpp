#include "transport/usb_descriptors.h"

#include "platform/little_endian.h"

namespace rcvlink {
namespace {

// Offsets within descriptors and values of their fields, from the USB 2.0 standard, chapter 9.6.
constexpr size_t kLength = 0;  // of any descriptor: its own length
constexpr size_t kTotalLength = 2;
constexpr size_t kEndpointCount = 4;
constexpr size_t kEndpointAddress = 2;
constexpr size_t kEndpointAttributes = 3;

constexpr size_t kEndpointLength = 7;
constexpr size_t kFewestEndpoints = 2;

constexpr uint8_t kTransferTypeMask = 0x03;
constexpr uint8_t kBulk = 0x02;
constexpr uint8_t kDirectionIn = 0x80;

}  // namespace

size_t TotalLength(std::span<const uint8_t, kConfigurationDescriptorLength> configuration) {
  return rcvlink::ReadUint16(configuration, kTotalLength);
}

std::optional<BulkEndpoints> FindBulkEndpoints(std::span<const uint8_t> descriptors) {
  if (descriptors.empty()) return std::nullopt;
  const size_t interface_at = descriptors[kLength];
  if (interface_at + kEndpointCount >= descriptors.size()) return std::nullopt;
  const std::span<const uint8_t> from_interface = descriptors.subspan(interface_at);
  const size_t count = from_interface[kEndpointCount];
  const size_t interface_length = from_interface[kLength];
  if (count < kFewestEndpoints ||
      from_interface.size() != interface_length + count * kEndpointLength) {
    return std::nullopt;
  }

  BulkEndpoints found;
  bool has_out = false;
  bool has_in = false;
  std::span<const uint8_t> rest = from_interface.subspan(interface_length);
  for (; !rest.empty() && !(has_out && has_in); rest = rest.subspan(kEndpointLength)) {
    if (rest[kLength] != kEndpointLength) return std::nullopt;
    if ((rest[kEndpointAttributes] & kTransferTypeMask) != kBulk) continue;
    const uint8_t address = rest[kEndpointAddress];
    const bool is_in = (address & kDirectionIn) != 0;
    (is_in ? found.in : found.out) = address;
    (is_in ? has_in : has_out) = true;
  }
  // One bulk endpoint alone is no link, so its address is not mixed with a default one.
  return has_out && has_in ? found : BulkEndpoints{};
}

}  // namespace rcvlink
