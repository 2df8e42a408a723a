// Receivers opened through the library's exports.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_RECEIVER_H_
#define RCVLINK_TESTS_HOST_SUPPORT_RECEIVER_H_

#include <windows.h>

#include <functional>
#include <future>
#include <string>
#include <string_view>
#include <utility>

#include "rcvlink.h"
#include "tests/host/support/handle.h"
#include "tests/host/support/progress.h"
#include "tests/host/support/simulated_port.h"
#include "tests/host/support/simulated_usb.h"
#include "tests/host/support/wire.h"
#include "tests/support/memory_stream.h"

namespace host {

inline constexpr HRESULT kNotConnected = static_cast<HRESULT>(0x8007048FU);
inline constexpr HRESULT kTimedOut = static_cast<HRESULT>(0x800705B4U);
inline constexpr HRESULT kFileNotFound = static_cast<HRESULT>(0x80070002U);

// The same text in both widths, for ASCII.
std::string Narrow(const std::wstring& text);

// Eight data bits, no parity, one stop bit, no flow control.
DCB Settings(DWORD speed);

// A Win32 event that stays signalled once it is.
class Event {
 public:
  explicit Event(bool signalled = false)
      : handle_(CreateEventW(nullptr, TRUE, signalled, nullptr)) {}

  HANDLE get() const { return handle_.get(); }
  void Set() { SetEvent(get()); }

 private:
  bed::UniqueHandle handle_;
};

// A call that runs on a thread of its own.
template <typename Function>
auto OnThread(Function function) {
  return std::async(std::launch::async, std::move(function));
}

// What GetReceiverInfo says, its strings freed.
struct Identity {
  HRESULT result = S_OK;
  std::wstring id;
  std::wstring model;
};

// A receiver's handle, closed at the end.
class OpenReceiver {
 public:
  OpenReceiver() = default;
  OpenReceiver(const OpenReceiver&) = delete;
  OpenReceiver& operator=(const OpenReceiver&) = delete;
  ~OpenReceiver();

  void* get() const { return handle_; }
  void** out() { return &handle_; }
  // Gives up the ownership of the handle.
  void* Release() { return std::exchange(handle_, nullptr); }

  HRESULT Download(const std::wstring& name, IStream& stream, Progress* progress = nullptr) const;
  Identity Identify() const;
  // The answer of CheckConnection, or its result when that is not S_OK.
  long Check() const;

 private:
  void* handle_ = nullptr;
};

// The receiver on a simulated port.
class Receiver : public OpenReceiver {
 public:
  // Raises bed::Error when it does not answer. Returns when the handshake is complete.
  explicit Receiver(const bed::SimulatedPort& port, DWORD speed = CBR_9600);

  // The transcript since the handshake.
  Lines WireSince() const { return WireLines(port_.Transcript(), greeting_); }
  Lines SentSince() const { return SentByHost(port_.Transcript(), greeting_); }
  // Wait until the host has sent this many lines since the handshake, or this line last; raise
  // bed::Error when that does not happen.
  void WaitForSent(size_t count) const;
  void WaitForLastSent(std::string_view line) const;

 private:
  void WaitUntil(const std::function<bool(const Lines& sent)>& done) const;

  const bed::SimulatedPort& port_;
  size_t greeting_ = 0;  // how many lines of the transcript the handshake has
};

// The receiver on a simulated USB device.
class UsbReceiver : public OpenReceiver {
 public:
  // Raises bed::Error when it does not answer.
  explicit UsbReceiver(const bed::SimulatedUsb& usb);

  // The transcript since it was found.
  Lines WireSince() const { return WireLines(usb_.Transcript(), greeting_); }
  Lines SentSince() const { return SentByHost(usb_.Transcript(), greeting_); }

 private:
  const bed::SimulatedUsb& usb_;
  size_t greeting_ = 0;
};

}  // namespace host

#endif  // RCVLINK_TESTS_HOST_SUPPORT_RECEIVER_H_
