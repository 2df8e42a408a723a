#include "simulator/usb/faults.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <limits>
#include <stdexcept>
#include <string>
#include <utility>

#include "simulator/fault_text.h"

namespace sim {
namespace {

constexpr std::string_view kHexPrefix = "0x";
constexpr int kHexBase = 16;
constexpr int kDecimalBase = 10;
constexpr uint32_t kErrorBits = 0xC0000000;
constexpr std::array<std::pair<std::string_view, EndpointType>, 4> kTypes = {{
    {"control", EndpointType::kControl},
    {"isochronous", EndpointType::kIsochronous},
    {"bulk", EndpointType::kBulk},
    {"interrupt", EndpointType::kInterrupt},
}};

[[noreturn]] void Refuse(std::string_view text, std::string_view what) {
  throw std::invalid_argument("'" + std::string(text) + "' is no " + std::string(what));
}

uint8_t ParseAddress(std::string_view text) {
  const uint32_t address = ParseCode(text, "endpoint address");
  if (address > std::numeric_limits<uint8_t>::max()) {
    Refuse(text, "endpoint address");
  }
  return static_cast<uint8_t>(address);
}

Endpoint ParseEndpoint(std::string_view text) {
  const auto [address, type] = SplitAt(text, ':');
  Endpoint endpoint{ParseAddress(address)};
  if (!type.empty()) {
    const auto* const found =
        std::ranges::find(kTypes, type, &std::pair<std::string_view, EndpointType>::first);
    if (found == kTypes.end()) {
      Refuse(type, "type of endpoint");
    }
    endpoint.type = found->second;
  }
  return endpoint;
}

}  // namespace

bool TakeRefusal(std::vector<DescriptorRefusal>& refusals, DescriptorPart part) {
  return std::ranges::any_of(refusals, [part](DescriptorRefusal& refusal) {
    return refusal.part == part && TakeOccurrence(refusal.times);
  });
}

bool TakeRefusal(std::vector<EndpointRefusal>& refusals, uint8_t address) {
  return std::ranges::any_of(refusals, [address](EndpointRefusal& refusal) {
    return refusal.address == address && TakeOccurrence(refusal.times);
  });
}

std::optional<uint32_t> TakeWriteError(std::vector<WriteError>& errors, uint32_t written) {
  for (WriteError& error : errors) {
    if (written >= error.after && TakeOccurrence(error.times)) {
      return error.status;
    }
  }
  return std::nullopt;
}

uint32_t ParseCode(std::string_view text, std::string_view what) {
  const bool hex = text.starts_with(kHexPrefix);
  const std::string_view digits = hex ? text.substr(kHexPrefix.size()) : text;
  const char* const end = digits.data() + digits.size();
  uint32_t number = 0;
  const auto [stop, error] =
      std::from_chars(digits.data(), end, number, hex ? kHexBase : kDecimalBase);
  if (error != std::errc() || stop != end) {
    Refuse(text, what);
  }
  return number;
}

std::vector<Endpoint> ParseEndpoints(std::string_view text) {
  std::vector<Endpoint> endpoints;
  for (std::string_view rest = text; !rest.empty();) {
    const auto [first, others] = SplitAt(rest, ',');
    endpoints.push_back(ParseEndpoint(first));
    rest = others;
  }
  return endpoints;
}

DescriptorRefusal ParseDescriptorRefusal(std::string_view text) {
  DescriptorRefusal refusal;
  refusal.times = CutTimes(text, kAlways);
  if (text != "header" && text != "whole") {
    Refuse(text, "part of a descriptor (header or whole)");
  }
  refusal.part = text == "header" ? DescriptorPart::kHeader : DescriptorPart::kWhole;
  return refusal;
}

EndpointRefusal ParseEndpointRefusal(std::string_view text) {
  EndpointRefusal refusal;
  refusal.times = CutTimes(text, kAlways);
  refusal.address = ParseAddress(text);
  return refusal;
}

WriteError ParseWriteError(std::string_view text) {
  WriteError error;
  error.times = CutTimes(text, kOnce);
  const auto [status, after] = SplitAt(text, ':');
  error.status = ParseCode(status, "error number");
  if ((error.status & kErrorBits) != kErrorBits) {
    throw std::invalid_argument("'" + std::string(status) + "' is no error: 0xC0000000 at least");
  }
  if (!after.empty()) {
    error.after = ParseNumber<uint32_t>(after, "number of writes");
  }
  return error;
}

}  // namespace sim
