// A clock that a test moves by hand.
#ifndef RCVLINK_TESTS_SUPPORT_MANUAL_CLOCK_H_
#define RCVLINK_TESTS_SUPPORT_MANUAL_CLOCK_H_

#include "platform/clock.h"

class ManualClock : public rcvlink::Clock {
 public:
  DWORD Ticks() override { return now; }
  void Pause(DWORD milliseconds) override {
    now += milliseconds;
    paused += milliseconds;
  }

  DWORD now = 0;
  DWORD paused = 0;  // all pauses together

 private:
  rcvlink::ClockOverride override_{*this};  // used while this lives
};

#endif  // RCVLINK_TESTS_SUPPORT_MANUAL_CLOCK_H_
