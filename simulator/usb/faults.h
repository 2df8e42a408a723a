// What a simulated USB device can be told to do wrong, and the command-line form of that.
#ifndef SIMULATOR_USB_FAULTS_H_
#define SIMULATOR_USB_FAULTS_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "simulator/faults.h"
#include "simulator/usb/descriptor.h"

namespace sim {

// A host asks for the descriptor twice: first for its header, to learn the length, then for all of
// it.
enum class DescriptorPart { kHeader, kWhole };

struct DescriptorRefusal {
  DescriptorPart part = DescriptorPart::kHeader;
  uint32_t times = kAlways;
};

// An endpoint for which requests are refused.
struct EndpointRefusal {
  uint8_t address = 0;
  uint32_t times = kAlways;
};

// Writes fail after `after` good ones, and their bytes are lost.
struct WriteError {
  uint32_t status = 0;
  uint32_t after = 0;
  uint32_t times = kOnce;
};

struct UsbFaults {
  // No more bytes than this are given of a descriptor.
  std::optional<size_t> short_descriptor = std::nullopt;
  std::vector<DescriptorRefusal> descriptors = {};
  std::vector<EndpointRefusal> binds = {};
  std::vector<EndpointRefusal> resets = {};
  std::vector<WriteError> writes = {};
};

// Whether a fault is due. Counts one occurrence.
bool TakeRefusal(std::vector<DescriptorRefusal>& refusals, DescriptorPart part);
bool TakeRefusal(std::vector<EndpointRefusal>& refusals, uint8_t address);
// The status of a write after `written` good ones, if it fails.
std::optional<uint32_t> TakeWriteError(std::vector<WriteError>& errors, uint32_t written);

// The texts of a command line. They throw std::invalid_argument with a message for the user.

// A number of up to 32 bits, decimal or with 0x before it.
uint32_t ParseCode(std::string_view text, std::string_view what);
// "ADDRESS[:TYPE],..." with control, isochronous, bulk or interrupt; bulk by default.
std::vector<Endpoint> ParseEndpoints(std::string_view text);
// "header[@TIMES]" or "whole[@TIMES]".
DescriptorRefusal ParseDescriptorRefusal(std::string_view text);
// "ADDRESS[@TIMES]".
EndpointRefusal ParseEndpointRefusal(std::string_view text);
// "NUMBER[:WRITES][@TIMES]".
WriteError ParseWriteError(std::string_view text);

}  // namespace sim

#endif  // SIMULATOR_USB_FAULTS_H_
