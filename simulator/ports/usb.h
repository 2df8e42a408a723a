// A receiver on the bus of simulated USB devices (Windows).
#ifndef SIMULATOR_PORTS_USB_H_
#define SIMULATOR_PORTS_USB_H_

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include "simulator/bytes.h"
#include "simulator/ports/handle.h"
#include "simulator/receiver.h"
#include "simulator/usb/device.h"

namespace sim {

// A call of the bus that may be pending for a while. One at a time.
class BusCall {
 public:
  // `bus` must outlive the object.
  explicit BusCall(HANDLE bus);
  BusCall(const BusCall&) = delete;
  BusCall& operator=(const BusCall&) = delete;
  // Cancels a call that is pending, and waits for its end.
  ~BusCall();

  // `input` is copied; `output` must live until the call has ended.
  void Start(uint32_t code, std::span<const uint8_t> input, std::span<uint8_t> output);
  bool on_its_way() const { return on_its_way_; }
  // Set when it has ended.
  HANDLE event() const { return event_.get(); }
  // Waits for the end; gives the length of the output. Throws std::system_error when the call
  // failed.
  size_t Finish();

 private:
  HANDLE bus_;
  UniqueHandle event_;
  OVERLAPPED overlapped_{};
  Bytes input_;
  bool on_its_way_ = false;
};

// A receiver on a simulated USB device, for as long as the object lives.
class UsbPort {
 public:
  // Starts the bus driver if need be, and plugs the device in: the host opens \\?\NAME. Throws
  // std::system_error when there is a device of that name, or no driver.
  explicit UsbPort(const std::wstring& name);

  // Carries bytes until the event `stop` is set or the receiver is gone; then the device is
  // unplugged.
  void Serve(UsbDevice& device, const Receiver& receiver, HANDLE stop);

 private:
  uint64_t NowMs() const;
  void TakeRequests(UsbDevice& device, size_t length);
  DWORD WaitTime(const Receiver& receiver) const;
  void Call(uint32_t code, std::span<const uint8_t> input);

  UniqueHandle bus_;
  Bytes requests_;
  // After what they use, so that they end first.
  BusCall waiting_call_;
  BusCall call_;
  std::chrono::steady_clock::time_point start_;
};

}  // namespace sim

#endif  // SIMULATOR_PORTS_USB_H_
