#include "simulator/usb/device.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <string>
#include <utility>

#include "simulator/usb/interface.h"

namespace sim {
namespace {

using usb_bus::Action;
using usb_bus::ActionKind;
using usb_bus::Reads;
using usb_bus::Request;
using usb_bus::RequestKind;

template <typename Number>
Number NumberAt(std::span<const uint8_t> bytes, size_t offset) {
  Number number = 0;
  for (size_t i = 0; i < sizeof(Number); ++i) {
    number = static_cast<Number>(number | Number{bytes[offset + i]} << 8 * i);
  }
  return number;
}

// 0x81
std::string Hex(uint32_t number, size_t digits) {
  constexpr std::string_view kDigits = "0123456789ABCDEF";
  constexpr uint32_t kDigitMask = 0xF;
  constexpr int kDigitBits = 4;
  std::string text(digits, '0');
  for (size_t i = digits; i > 0; --i) {
    text[i - 1] = kDigits[number & kDigitMask];
    number >>= kDigitBits;
  }
  return "0x" + text;
}

std::string HexAddress(uint8_t address) { return Hex(address, 2 * sizeof(address)); }
std::string HexCode(uint32_t code) { return Hex(code, 2 * sizeof(code)); }

std::optional<uint8_t> FirstBulk(const std::vector<Endpoint>& endpoints, bool to_host) {
  const auto found = std::ranges::find_if(endpoints, [to_host](const Endpoint& endpoint) {
    return endpoint.type == EndpointType::kBulk && endpoint.to_host() == to_host;
  });
  return found == endpoints.end() ? std::nullopt : std::optional(found->address);
}

}  // namespace

UsbDevice::UsbDevice(const UsbOptions& options, Receiver& receiver, Transcript& transcript)
    : options_(options),
      receiver_(receiver),
      transcript_(transcript),
      descriptor_(MakeConfigurationDescriptor(options.descriptor)),
      in_(FirstBulk(options.descriptor.endpoints, /*to_host=*/true)),
      out_(FirstBulk(options.descriptor.endpoints, /*to_host=*/false)),
      configured_(options.configured) {}

void UsbDevice::Take(const Request& request, std::span<const uint8_t> bytes, uint64_t now_ms) {
  switch (request.kind) {
    case RequestKind::kControl:
      TakeControl(request, bytes);
      break;
    case RequestKind::kRead:
      TakeRead(request);
      break;
    case RequestKind::kWrite:
      TakeWrite(request, bytes, now_ms);
      break;
    case RequestKind::kClosed:
      TakeClosed(request.handle);
      break;
  }
}

void UsbDevice::SendDue(uint64_t now_ms) {
  const std::optional<uint64_t> next = receiver_.NextSendTime();
  if (receiver_.gone() || !next || *next > now_ms) {
    return;
  }
  const Bytes sent = receiver_.Send(now_ms, /*host_speed=*/0);
  for (std::span<const uint8_t> rest = sent; !rest.empty();) {
    const auto transfer = rest.first(std::min(rest.size(), options_.transfer_length));
    Action action{};
    action.kind = ActionKind::kSend;
    Act(action, transfer);
    rest = rest.subspan(transfer.size());
  }
}

Bytes UsbDevice::TakeActions() { return std::exchange(actions_, {}); }

void UsbDevice::TakeControl(const Request& request, std::span<const uint8_t> bytes) {
  switch (request.control_code) {
    case usb::kGetDescriptor:
      GetDescriptor(request, bytes);
      break;
    case usb::kSetConfiguration:
      SetConfiguration(request, bytes);
      break;
    case usb::kBindPipe:
      BindPipe(request, bytes);
      break;
    case usb::kUnbindPipe:
      UnbindPipe(request);
      break;
    case usb::kResetPipe:
      ResetPipe(request);
      break;
    default:
      Refuse(request, usb::kInvalidDeviceRequest, "request " + HexCode(request.control_code));
      break;
  }
}

// Reads of the receiver's endpoint do not come here: the driver answers them itself.
void UsbDevice::TakeRead(const Request& request) {
  const std::optional<uint8_t> address = BoundTo(request.handle);
  if (!address) {
    Refuse(request, usb::kNotBound, "read");
  } else if (Endpoint{*address}.to_host()) {
    idle_reads_.push_back(request);
  } else {
    Refuse(request, usb::kInvalidDeviceRequest, "read " + HexAddress(*address));
  }
}

void UsbDevice::TakeWrite(const Request& request, std::span<const uint8_t> bytes, uint64_t now_ms) {
  const std::optional<uint8_t> address = BoundTo(request.handle);
  if (!address) {
    Refuse(request, usb::kNotBound, "write");
    return;
  }
  if (Endpoint{*address}.to_host()) {
    Refuse(request, usb::kInvalidDeviceRequest, "write " + HexAddress(*address));
    return;
  }
  if (address != out_) {
    transcript_.Remark(std::to_string(bytes.size()) + " bytes to " + HexAddress(*address));
    AnswerWrite(request);
    return;
  }
  if (const auto status = TakeWriteError(options_.faults.writes, writes_)) {
    transcript_.Remark("write error " + HexCode(*status));
    Answer(request, *status);
    return;
  }
  ++writes_;
  receiver_.Receive(bytes, /*host_speed=*/0, now_ms);
  AnswerWrite(request);
}

void UsbDevice::TakeClosed(uint32_t handle) {
  const std::optional<uint8_t> address = BoundTo(handle);
  bound_.erase(handle);
  std::erase_if(idle_reads_, [handle](const Request& read) { return read.handle == handle; });
  transcript_.Setting(address ? "close " + HexAddress(*address) : "close");
}

void UsbDevice::GetDescriptor(const Request& request, std::span<const uint8_t> bytes) {
  const bool understood =
      bytes.size() == usb::kDescriptorRequestLength &&
      NumberAt<uint32_t>(bytes, usb::kRecipientOffset) == usb::kRecipientDevice &&
      bytes[usb::kTypeOffset] == kConfigurationDescriptor && bytes[usb::kIndexOffset] == 0;
  const DescriptorPart part =
      request.room <= kConfigurationHeaderLength ? DescriptorPart::kHeader : DescriptorPart::kWhole;
  if (!understood || TakeRefusal(options_.faults.descriptors, part)) {
    Refuse(request, usb::kInvalidParameter, "descriptor");
    return;
  }
  size_t length = std::min<size_t>(descriptor_.size(), request.room);
  length = std::min(length, options_.faults.short_descriptor.value_or(length));
  transcript_.Remark("descriptor " + std::to_string(length));
  Answer(request, usb::kSuccess, std::span(descriptor_).first(length));
}

void UsbDevice::SetConfiguration(const Request& request, std::span<const uint8_t> bytes) {
  if (bytes.size() != usb::kConfigurationLength) {
    Refuse(request, usb::kInvalidParameter, "configuration");
    return;
  }
  const auto index = NumberAt<uint16_t>(bytes, 0);
  const auto count = NumberAt<uint16_t>(bytes, usb::kInterfaceCountOffset);
  const std::span<const uint8_t> interface_entry = bytes.subspan(usb::kInterfacesOffset);
  const auto number = NumberAt<uint16_t>(interface_entry, 0);
  const auto alternate = NumberAt<uint16_t>(interface_entry, usb::kAlternateOffset);
  if (index != 0 || count != 1 || number != 0 || alternate != 0) {
    Refuse(request, usb::kInvalidParameter, "configuration");
    return;
  }
  if (configured_) {
    Refuse(request, usb::kInvalidDeviceState, "configuration");
    return;
  }
  configured_ = true;
  const auto transfer = NumberAt<uint32_t>(interface_entry, usb::kTransferOffset);
  transcript_.Setting("configuration transfer=" + std::to_string(transfer));
  Answer(request, usb::kSuccess);
}

uint32_t UsbDevice::BindStatus(uint32_t handle, uint8_t address) {
  const auto has_address = [address](const auto& endpoint) { return endpoint.address == address; };
  const auto is_bound = [address](const auto& binding) { return binding.second == address; };
  if (!configured_ || BoundTo(handle) || std::ranges::any_of(bound_, is_bound)) {
    return usb::kInvalidDeviceState;
  }
  if (!std::ranges::any_of(options_.descriptor.endpoints, has_address) ||
      TakeRefusal(options_.faults.binds, address)) {
    return usb::kInvalidParameter;
  }
  return usb::kSuccess;
}

void UsbDevice::BindPipe(const Request& request, std::span<const uint8_t> bytes) {
  if (bytes.size() != 1) {
    Refuse(request, usb::kInvalidParameter, "bind");
    return;
  }
  const uint8_t address = bytes.front();
  const uint32_t status = BindStatus(request.handle, address);
  if (status != usb::kSuccess) {
    Refuse(request, status, "bind " + HexAddress(address));
    return;
  }
  bound_[request.handle] = address;
  transcript_.Setting("bind " + HexAddress(address));
  const bool gets_transfers = address == in_;
  Answer(request, usb::kSuccess, {}, gets_transfers ? Reads::kGetTransfers : Reads::kUnchanged);
}

void UsbDevice::UnbindPipe(const Request& request) {
  const std::optional<uint8_t> address = BoundTo(request.handle);
  if (!address) {
    Refuse(request, usb::kNotBound, "unbind");
    return;
  }
  bound_.erase(request.handle);
  CancelReads(request.handle);
  transcript_.Setting("unbind " + HexAddress(*address));
  Answer(request, usb::kSuccess, {}, Reads::kAreRequests);
}

void UsbDevice::ResetPipe(const Request& request) {
  const std::optional<uint8_t> address = BoundTo(request.handle);
  if (!address) {
    Refuse(request, usb::kNotBound, "reset");
    return;
  }
  if (TakeRefusal(options_.faults.resets, *address)) {
    Refuse(request, usb::kInvalidParameter, "reset " + HexAddress(*address));
    return;
  }
  transcript_.Setting("reset " + HexAddress(*address));
  Answer(request, usb::kSuccess);
}

std::optional<uint8_t> UsbDevice::BoundTo(uint32_t handle) const {
  const auto found = bound_.find(handle);
  return found == bound_.end() ? std::nullopt : std::optional(found->second);
}

void UsbDevice::CancelReads(uint32_t handle) {
  for (const Request& read : idle_reads_) {
    if (read.handle == handle) {
      Answer(read, usb::kCancelled);
    }
  }
  std::erase_if(idle_reads_, [handle](const Request& read) { return read.handle == handle; });
}

void UsbDevice::Answer(const Request& request,
                       uint32_t status,
                       std::span<const uint8_t> bytes,
                       Reads reads) {
  Action action{};
  action.id = request.id;
  action.kind = ActionKind::kAnswer;
  action.status = status;
  action.count = static_cast<uint32_t>(bytes.size());
  action.reads = reads;
  Act(action, bytes);
}

void UsbDevice::AnswerWrite(const Request& request) {
  Action action{};
  action.id = request.id;
  action.kind = ActionKind::kAnswer;
  action.count = request.length;
  Act(action, {});
}

void UsbDevice::Refuse(const Request& request, uint32_t status, std::string_view what) {
  transcript_.Remark("refused " + std::string(what));
  Answer(request, status);
}

void UsbDevice::Act(Action action, std::span<const uint8_t> bytes) {
  action.length = static_cast<uint32_t>(bytes.size());
  std::array<uint8_t, sizeof(Action)> header;
  std::memcpy(header.data(), &action, sizeof(action));
  actions_.insert(actions_.end(), header.begin(), header.end());
  actions_.insert(actions_.end(), bytes.begin(), bytes.end());
  actions_.resize(usb_bus::Aligned(actions_.size()));
}

}  // namespace sim
