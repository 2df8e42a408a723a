/// @file faults.h
/// What a simulated USB device can be told to do wrong, and the command-line form of that.
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

// The two times that a host asks for the descriptor: with room for its header only, to learn its
// length, and for all of it.
enum class DescriptorPart { kHeader, kWhole };

struct DescriptorRefusal {
  DescriptorPart part = DescriptorPart::kHeader;
  uint32_t times = kAlways;
};

// An endpoint that something is refused for.
struct EndpointRefusal {
  uint8_t address = 0;
  uint32_t times = kAlways;
};

// Writes fail after so many that went well, and what was written is lost.
struct WriteError {
  uint32_t status = 0;
  uint32_t after = 0;
  uint32_t times = kOnce;
};

struct UsbFaults {
  // A descriptor is never told beyond this many bytes.
  std::optional<size_t> short_descriptor = std::nullopt;
  std::vector<DescriptorRefusal> descriptors = {};
  std::vector<EndpointRefusal> binds = {};
  std::vector<EndpointRefusal> resets = {};
  std::vector<WriteError> writes = {};
};

// Whether a fault is due; uses up one occurrence.
bool TakeRefusal(std::vector<DescriptorRefusal>& refusals, DescriptorPart part);
bool TakeRefusal(std::vector<EndpointRefusal>& refusals, uint8_t address);
// The status that a write ends with after `written` that went well.
std::optional<uint32_t> TakeWriteError(std::vector<WriteError>& errors, uint32_t written);

// The texts of a command line. They throw std::invalid_argument with a message for the user.

// A number up to 32 bits, in decimal or with 0x in front.
uint32_t ParseCode(std::string_view text, std::string_view what);
// "ADDRESS[:TYPE],..." with control, isochronous, bulk or interrupt; bulk unless told.
std::vector<Endpoint> ParseEndpoints(std::string_view text);
// "header[@TIMES]" or "whole[@TIMES]".
DescriptorRefusal ParseDescriptorRefusal(std::string_view text);
// "ADDRESS[@TIMES]".
EndpointRefusal ParseEndpointRefusal(std::string_view text);
// "NUMBER[:WRITES][@TIMES]".
WriteError ParseWriteError(std::string_view text);

}  // namespace sim

#endif  // SIMULATOR_USB_FAULTS_H_
