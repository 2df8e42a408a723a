// The host's end of a USB device: its requests, as bytes.
#ifndef RCVLINK_TESTS_USB_USB_HOST_H_
#define RCVLINK_TESTS_USB_USB_HOST_H_

#include <windows.h>

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "simulator/ports/handle.h"

namespace usb_host {

using Bytes = std::vector<uint8_t>;

inline constexpr DWORD kGetDescriptor = 0x80942006;
inline constexpr DWORD kSetConfiguration = 0x80942024;
inline constexpr DWORD kBindPipe = 0x80942078;
inline constexpr DWORD kUnbindPipe = 0x8094207C;
inline constexpr DWORD kResetPipe = 0x80942080;

inline constexpr DWORD kNotBound = 0xE0001009;

// How a request ended.
struct Result {
  DWORD error = ERROR_SUCCESS;
  Bytes bytes = {};

  std::string text() const { return std::string(bytes.begin(), bytes.end()); }
};

// A request on its way, with the buffer that it fills.
class Pending {
 public:
  Pending(HANDLE file, size_t room);
  Pending(Pending&&) = default;
  Pending& operator=(Pending&&) = delete;
  // Cancels it.
  ~Pending();

  // Waits for the end. A read that does not end fails the test after a while.
  Result Finish();
  bool Ended() const;

  // These make the request itself.
  OVERLAPPED* overlapped() { return &state_->overlapped; }
  uint8_t* buffer() { return state_->buffer.data(); }
  DWORD room() const { return static_cast<DWORD>(state_->buffer.size()); }
  // `result` is what the function that makes the request returned.
  void Made(BOOL result);

 private:
  // Must not move while the request is pending.
  struct State {
    OVERLAPPED overlapped{};
    Bytes buffer;
    sim::UniqueHandle event;
    DWORD error = ERROR_IO_PENDING;
  };

  HANDLE file_;
  std::unique_ptr<State> state_;
};

// A handle of a device, opened as hosts do.
class File {
 public:
  // It stays closed when that fails.
  File(const std::wstring& path, DWORD access);

  bool open() const { return handle_.get() != INVALID_HANDLE_VALUE; }
  HANDLE get() const { return handle_.get(); }
  // Why the device could not be opened.
  DWORD error() const { return error_; }
  void Close() { handle_.reset(INVALID_HANDLE_VALUE); }

  Pending StartControl(DWORD code, const Bytes& input = {}, size_t room = 0) const;
  Pending StartRead(size_t room) const;
  Pending StartWrite(std::string_view text) const;

  Result Control(DWORD code, const Bytes& input = {}, size_t room = 0) const;
  Result Read(size_t room) const;
  Result Write(std::string_view text) const;
  DWORD Bind(uint8_t address) const { return Control(kBindPipe, {address}).error; }
  DWORD Unbind() const { return Control(kUnbindPipe).error; }
  DWORD Reset() const { return Control(kResetPipe).error; }
  DWORD Configure(uint32_t transfer = 4096) const;
  // Reads until so many bytes have come.
  std::string ReadAll(size_t size) const;

 private:
  sim::UniqueHandle handle_;
  DWORD error_;
};

// The input of kGetDescriptor.
Bytes DescriptorRequest(uint8_t type = 2, uint8_t index = 0, uint32_t recipient = 0);
// The input of kSetConfiguration: interface 0, alternate setting 0.
Bytes Configuration(uint32_t transfer = 4096, uint16_t index = 0, uint16_t interfaces = 1);

// A device that is configured and bound, 0x81 in and 0x02 out.
struct Connected {
  explicit Connected(const std::wstring& path, uint8_t in = 0x81, uint8_t out = 0x02);

  File writer;
  File reader;
};

}  // namespace usb_host

#endif  // RCVLINK_TESTS_USB_USB_HOST_H_
