// The millisecond clock that time-outs and pauses are measured with.
#ifndef RCVLINK_PLATFORM_CLOCK_H_
#define RCVLINK_PLATFORM_CLOCK_H_

#include "platform/win32.h"

class Clock {
 public:
  virtual ~Clock() = default;
  // Milliseconds since some start; wraps as GetTickCount does, so only differences count.
  virtual DWORD Ticks() = 0;
  // Lets the thread rest.
  virtual void Pause(DWORD milliseconds) = 0;
};

// The clock in force: the system's, unless a test has put its own in place.
Clock& CurrentClock();

// Puts another clock in force for a scope; for tests, on one thread.
class ClockOverride {
 public:
  explicit ClockOverride(Clock& clock);
  ClockOverride(const ClockOverride&) = delete;
  ClockOverride& operator=(const ClockOverride&) = delete;
  ~ClockOverride();

 private:
  Clock* previous_;
};

#endif  // RCVLINK_PLATFORM_CLOCK_H_
