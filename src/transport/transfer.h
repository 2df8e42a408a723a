// An overlapped transfer, with all that the driver uses until the transfer has ended.
#ifndef RCVLINK_TRANSPORT_TRANSFER_H_
#define RCVLINK_TRANSPORT_TRANSFER_H_

#include <cstddef>
#include <cstdint>
#include <memory>

#include "platform/handle.h"

namespace rcvlink {

// The bytes are its own, and not the caller's: a driver that does not end a transfer may write to
// them at any time.
class Transfer {
 public:
  // S_OK, E_OUTOFMEMORY or the Win32 error. `manual_reset` is the kind of the event.
  static HRESULT Create(BOOL manual_reset, std::unique_ptr<Transfer>& transfer);
  // Gives up a transfer that the driver does not end. It is never freed.
  static void Abandon(std::unique_ptr<Transfer> transfer) noexcept;

  // Makes it ready for the next transfer, of up to `size` bytes. S_OK, E_OUTOFMEMORY or the Win32
  // error.
  HRESULT Prepare(size_t size);

  uint8_t* bytes() { return bytes_.get(); }
  OVERLAPPED* record() { return &record_; }
  HANDLE event() const { return event_.get(); }
  // Whether the driver uses it no more.
  bool HasEnded() const { return HasOverlappedIoCompleted(&record_); }

 private:
  OVERLAPPED record_{};
  KernelHandle event_;
  std::unique_ptr<uint8_t[]> bytes_;
  size_t capacity_ = 0;
};

}  // namespace rcvlink

#endif  // RCVLINK_TRANSPORT_TRANSFER_H_
