// A simulated USB device with a receiver in it.
#ifndef SIMULATOR_USB_DEVICE_H_
#define SIMULATOR_USB_DEVICE_H_

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

#include "simulator/bytes.h"
#include "simulator/receiver.h"
#include "simulator/transcript.h"
#include "simulator/usb/descriptor.h"
#include "simulator/usb/driver/bus.h"
#include "simulator/usb/faults.h"

namespace sim {

inline constexpr size_t kDefaultTransferLength = 512;

struct UsbOptions {
  DescriptorOptions descriptor = {};
  UsbFaults faults = {};
  // The most bytes that go to the host in one transfer.
  size_t transfer_length = kDefaultTransferLength;
  // Configured from the start, so that the host cannot do it.
  bool configured = false;
};

// A USB device with a receiver in it. It takes requests of hosts, and gives the actions that the bus
// driver has to execute for them.
class UsbDevice {
 public:
  // `receiver` and `transcript` must outlive the device.
  UsbDevice(const UsbOptions& options, Receiver& receiver, Transcript& transcript);

  // Executes a host's request, with the bytes that came with it.
  void Take(const usb_bus::Request& request, std::span<const uint8_t> bytes, uint64_t now_ms);

  // Sends what is due to the host. One write at a time, so that a receiver with a lot to send still
  // listens.
  void SendDue(uint64_t now_ms);

  // The actions since the last call, in the form of kAct (bus.h).
  Bytes TakeActions();

 private:
  void TakeControl(const usb_bus::Request& request, std::span<const uint8_t> bytes);
  void TakeRead(const usb_bus::Request& request);
  void TakeWrite(const usb_bus::Request& request, std::span<const uint8_t> bytes, uint64_t now_ms);
  void TakeClosed(uint32_t handle);

  void GetDescriptor(const usb_bus::Request& request, std::span<const uint8_t> bytes);
  void SetConfiguration(const usb_bus::Request& request, std::span<const uint8_t> bytes);
  void BindPipe(const usb_bus::Request& request, std::span<const uint8_t> bytes);
  void UnbindPipe(const usb_bus::Request& request);
  void ResetPipe(const usb_bus::Request& request);

  std::optional<uint8_t> BoundTo(uint32_t handle) const;
  uint32_t BindStatus(uint32_t handle, uint8_t address);
  void CancelReads(uint32_t handle);

  void Answer(const usb_bus::Request& request,
              uint32_t status,
              std::span<const uint8_t> bytes = {},
              usb_bus::Reads reads = usb_bus::Reads::kUnchanged);
  void AnswerWrite(const usb_bus::Request& request);
  void Refuse(const usb_bus::Request& request, uint32_t status, std::string_view what);
  void Act(usb_bus::Action action, std::span<const uint8_t> bytes);

  UsbOptions options_;
  Receiver& receiver_;
  Transcript& transcript_;
  Bytes descriptor_;
  // The endpoints of the receiver, if the device has them.
  std::optional<uint8_t> in_;
  std::optional<uint8_t> out_;
  bool configured_;
  uint32_t writes_ = 0;
  // The endpoints that handles are bound to.
  std::map<uint32_t, uint8_t> bound_;
  // Reads of endpoints that never send anything.
  std::vector<usb_bus::Request> idle_reads_;
  Bytes actions_;
};

}  // namespace sim

#endif  // SIMULATOR_USB_DEVICE_H_
