// The millisecond clock of time-outs and pauses. Unit tests replace it, so that they never wait.
#ifndef RCVLINK_PLATFORM_CLOCK_H_
#define RCVLINK_PLATFORM_CLOCK_H_

#include "platform/win32.h"

namespace rcvlink {

class Clock {
 public:
  virtual ~Clock() = default;
  // Milliseconds since an unknown start. The number wraps as that of GetTickCount does: only the
  // difference of two of them means something.
  virtual DWORD Ticks() = 0;
  // Blocks the calling thread.
  virtual void Pause(DWORD milliseconds) = 0;
};

// The system's clock, unless a test has replaced it.
Clock& CurrentClock();

// Replaces the clock for a scope; for tests, on one thread.
class ClockOverride {
 public:
  explicit ClockOverride(Clock& clock);
  ClockOverride(const ClockOverride&) = delete;
  ClockOverride& operator=(const ClockOverride&) = delete;
  ~ClockOverride();

 private:
  Clock* previous_;
};

}  // namespace rcvlink

#endif  // RCVLINK_PLATFORM_CLOCK_H_
