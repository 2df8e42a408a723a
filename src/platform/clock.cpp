#include "platform/clock.h"

#include <atomic>

namespace rcvlink {
namespace {

class SystemClock : public Clock {
 public:
  DWORD Ticks() override { return GetTickCount(); }
  void Pause(DWORD milliseconds) override { Sleep(milliseconds); }
};

constinit SystemClock system_clock;
constinit std::atomic<Clock*> clock_override = nullptr;

}  // namespace

Clock& CurrentClock() {
  Clock* const clock = clock_override;
  return clock ? *clock : system_clock;
}

ClockOverride::ClockOverride(Clock& clock) : previous_(clock_override.exchange(&clock)) {}

ClockOverride::~ClockOverride() { clock_override = previous_; }

}  // namespace rcvlink
