// The walk through the descriptors of a USB device.
#include "transport/usb_descriptors.h"

#include "tests/fuzz/target.h"

void fuzz::Target(std::span<const uint8_t> bytes) {
  // Of their own length, so that the sanitizer sees a read beyond it.
  const std::vector<uint8_t> descriptors(bytes.begin(), bytes.end());
  if (descriptors.size() < rcvlink::kConfigurationDescriptorLength) return;
  rcvlink::FindBulkEndpoints(descriptors);
}
