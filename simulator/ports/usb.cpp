#include "simulator/ports/usb.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <system_error>

#include "simulator/ports/driver_service.h"
#include "simulator/ports/overlapped.h"
#include "simulator/usb/driver/bus.h"

namespace sim {
namespace {

std::span<const uint8_t> BytesOf(const std::wstring& text) {
  return {reinterpret_cast<const uint8_t*>(text.data()), text.size() * sizeof(wchar_t)};
}

}  // namespace

BusCall::BusCall(HANDLE bus) : bus_(bus), event_(MakeEvent()) {}

BusCall::~BusCall() {
  if (on_its_way_) {
    CancelIoEx(bus_, &overlapped_);
    DWORD length = 0;
    GetOverlappedResult(bus_, &overlapped_, &length, /*bWait=*/TRUE);
  }
}

void BusCall::Start(uint32_t code, std::span<const uint8_t> input, std::span<uint8_t> output) {
  input_.assign(input.begin(), input.end());
  overlapped_ = {};
  overlapped_.hEvent = event_.get();
  const BOOL done = DeviceIoControl(bus_,
                                    code,
                                    input_.data(),
                                    static_cast<DWORD>(input_.size()),
                                    output.data(),
                                    static_cast<DWORD>(output.size()),
                                    nullptr,
                                    &overlapped_);
  if (!done && GetLastError() != ERROR_IO_PENDING) {
    ThrowLastError("the USB bus refuses");
  }
  on_its_way_ = true;
}

size_t BusCall::Finish() {
  DWORD length = 0;
  const BOOL done = GetOverlappedResult(bus_, &overlapped_, &length, /*bWait=*/TRUE);
  on_its_way_ = false;
  if (!done) {
    ThrowLastError("the USB bus has ended it");
  }
  return length;
}

UsbPort::UsbPort(const std::wstring& name)
    : bus_(OpenUsbBus()),
      requests_(usb_bus::kRequestBufferSize),
      waiting_call_(bus_.get()),
      call_(bus_.get()),
      start_(std::chrono::steady_clock::now()) {
  try {
    Call(usb_bus::kPlugIn, BytesOf(name));
  } catch (const std::system_error& error) {
    throw std::system_error(error.code(), "cannot plug in a device of this name");
  }
}

uint64_t UsbPort::NowMs() const {
  const auto elapsed = std::chrono::steady_clock::now() - start_;
  return static_cast<uint64_t>(
      std::chrono::duration_cast<std::chrono::milliseconds>(elapsed).count());
}

void UsbPort::Serve(UsbDevice& device, const Receiver& receiver, HANDLE stop) {
  for (;;) {
    const Bytes actions = device.TakeActions();
    if (receiver.gone()) {
      Call(usb_bus::kAct, actions);
      break;
    }
    if (!waiting_call_.on_its_way()) {
      waiting_call_.Start(usb_bus::kActAndWait, actions, requests_);
    } else if (!actions.empty()) {
      Call(usb_bus::kAct, actions);
    }
    // The stop is the first handle, so that it is seen even when others are set too.
    const std::array<HANDLE, 2> events = {stop, waiting_call_.event()};
    const DWORD happened = WaitForMultipleObjects(
        static_cast<DWORD>(events.size()), events.data(), /*bWaitAll=*/FALSE, WaitTime(receiver));
    if (happened == WAIT_OBJECT_0) {
      break;
    }
    if (happened == WAIT_OBJECT_0 + 1) {
      TakeRequests(device, waiting_call_.Finish());
    } else if (happened != WAIT_TIMEOUT) {
      ThrowLastError("cannot wait for the USB bus");
    }
    device.SendDue(NowMs());
  }
  Call(usb_bus::kUnplug, {});
}

void UsbPort::TakeRequests(UsbDevice& device, size_t length) {
  const auto requests = std::span<const uint8_t>(requests_).first(length);
  for (size_t at = 0; at < length;) {
    usb_bus::Request request;
    std::memcpy(&request, requests.subspan(at, sizeof(request)).data(), sizeof(request));
    device.Take(request, requests.subspan(at + sizeof(request), request.length), NowMs());
    at += usb_bus::Aligned(sizeof(request) + request.length);
  }
}

DWORD UsbPort::WaitTime(const Receiver& receiver) const {
  const std::optional<uint64_t> next = receiver.NextSendTime();
  if (!next) {
    return INFINITE;
  }
  const uint64_t now_ms = NowMs();
  return *next > now_ms ? static_cast<DWORD>(std::min<uint64_t>(*next - now_ms, INFINITE - 1)) : 0;
}

void UsbPort::Call(uint32_t code, std::span<const uint8_t> input) {
  call_.Start(code, input, {});
  call_.Finish();
}

}  // namespace sim
