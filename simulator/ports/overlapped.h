// Overlapped transfers of a port (Windows).
#ifndef SIMULATOR_PORTS_OVERLAPPED_H_
#define SIMULATOR_PORTS_OVERLAPPED_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <vector>

#include "simulator/bytes.h"
#include "simulator/ports/handle.h"

namespace sim {

// Throws std::system_error with what GetLastError says.
[[noreturn]] void ThrowLastError(const char* what);

// An event that stays set until it is reset. Throws std::system_error.
UniqueHandle MakeEvent();

// Waits until one of the events is set or the time is over, without end if there is none. Throws
// std::system_error.
void WaitForEvents(const std::vector<HANDLE>& events, std::optional<uint64_t> wait_ms);

bool IsSet(HANDLE event);

// One transfer at a time on a handle. What it does may be pending for a while.
class OverlappedTransfer {
 public:
  // `file` must outlive the object.
  explicit OverlappedTransfer(HANDLE file) : file_(file), event_(MakeEvent()) {}
  OverlappedTransfer(const OverlappedTransfer&) = delete;
  OverlappedTransfer& operator=(const OverlappedTransfer&) = delete;
  ~OverlappedTransfer() { Cancel(); }

  bool on_its_way() const { return on_its_way_; }
  // Set when it has ended.
  HANDLE event() const { return event_.get(); }

  // These give false when the transfer fails at once. A transfer that succeeds at once is on its
  // way too, and its event is set.
  bool StartConnect();
  bool StartRead(size_t count);
  bool StartWrite(Bytes bytes);

  // The number of bytes, once it has ended; nothing when it failed.
  std::optional<size_t> Finish();
  // Ends what is pending, if anything is.
  void Cancel();
  // What a read has brought.
  std::span<const uint8_t> bytes() const { return bytes_; }

 private:
  OVERLAPPED* Prepare();
  bool Started(BOOL done);

  HANDLE file_;
  UniqueHandle event_;
  OVERLAPPED overlapped_{};
  Bytes bytes_;
  bool on_its_way_ = false;
};

}  // namespace sim

#endif  // SIMULATOR_PORTS_OVERLAPPED_H_
