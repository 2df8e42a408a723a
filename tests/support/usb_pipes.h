// A simulated receiver behind a path that is opened twice, once for each direction, as a USB device
// is: two ends of a named pipe. They do not understand requests to a driver.
#ifndef RCVLINK_TESTS_SUPPORT_USB_PIPES_H_
#define RCVLINK_TESTS_SUPPORT_USB_PIPES_H_

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <thread>

#include "platform/handle.h"
#include "simulator/receiver.h"

class UsbPipes {
 public:
  // `receiver` must outlive the pipes. Only they may use it while they are open.
  explicit UsbPipes(sim::Receiver& receiver);
  UsbPipes(const UsbPipes&) = delete;
  UsbPipes& operator=(const UsbPipes&) = delete;
  ~UsbPipes();

  std::wstring path() const { return path_; }
  void WaitUntilClosed();

 private:
  // The first write shows which pipe the host writes to.
  struct End {
    rcvlink::FileHandle pipe;
    rcvlink::KernelHandle event;
    OVERLAPPED block{};
    std::array<uint8_t, 4096> buffer{};
    bool connected = false;
    bool pending = false;  // the host's opening, or a read
  };

  void Serve();
  bool Advance(End& end, End& other);
  void Hear(const uint8_t* bytes, size_t size, End& other);

  sim::Receiver& receiver_;
  std::wstring path_;
  std::array<End, 2> ends_;
  rcvlink::KernelHandle stop_;
  uint64_t now_ms_ = 0;  // advances to the receiver's next bytes
  std::thread thread_;
};

#endif  // RCVLINK_TESTS_SUPPORT_USB_PIPES_H_
