#include "rate_meter.h"

#include "formats.h"

namespace cli {

void RateMeter::Add(uint64_t elapsed_ms, uint64_t done) {
  constexpr uint64_t kWindowMs = 5000;
  constexpr size_t kLeastSamples = 2;
  samples_.push_back({elapsed_ms, done});
  while (samples_.size() > kLeastSamples && samples_[1].elapsed_ms + kWindowMs <= elapsed_ms) {
    samples_.pop_front();
  }
}

uint64_t RateMeter::BytesPerSecond() const {
  if (samples_.empty()) return 0;
  const Sample& first = samples_.front();
  const Sample& last = samples_.back();
  if (last.elapsed_ms == first.elapsed_ms) return 0;
  return (last.done - first.done) * kMsPerSecond / (last.elapsed_ms - first.elapsed_ms);
}

}  // namespace cli
