#include "ticker.h"

#include <utility>

namespace cli {

// Waits on an event, not on a stop token: in this compiler's library a wait with one can hang when
// the request to stop comes at the moment it begins or ends.
Ticker::Ticker(std::chrono::milliseconds interval, std::function<void()> tick)
    : stop_(CreateEventW(nullptr, TRUE, FALSE, nullptr)),
      thread_([stop = stop_.get(), interval, tick = std::move(tick)] {
        const auto interval_ms = static_cast<DWORD>(interval.count());
        while (WaitForSingleObject(stop, interval_ms) == WAIT_TIMEOUT) tick();
      }) {}

Ticker::~Ticker() { SetEvent(stop_.get()); }

}  // namespace cli
