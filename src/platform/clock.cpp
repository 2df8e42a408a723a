#include "platform/clock.h"

#include <atomic>

namespace {

class SystemClock : public Clock {
 public:
  DWORD Ticks() override { return GetTickCount(); }
  void Pause(DWORD milliseconds) override { Sleep(milliseconds); }
};

std::atomic<Clock*>& Override() {
  static std::atomic<Clock*> clock{nullptr};
  return clock;
}

}  // namespace

Clock& CurrentClock() {
  static SystemClock system_clock;
  Clock* const clock = Override();
  return clock ? *clock : system_clock;
}

ClockOverride::ClockOverride(Clock& clock) : previous_(Override().exchange(&clock)) {}

ClockOverride::~ClockOverride() { Override() = previous_; }
