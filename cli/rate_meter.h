// How fast a download is right now.
#ifndef RCVLINK_CLI_RATE_METER_H_
#define RCVLINK_CLI_RATE_METER_H_

#include <cstdint>
#include <deque>

namespace cli {

// The rate of the last seconds: a slow beginning does not count for ever.
class RateMeter {
 public:
  // `elapsed_ms`: time since the beginning; never less than before
  // `done`: bytes that have arrived until then.
  void Add(uint64_t elapsed_ms, uint64_t done);

  // Bytes per second; 0 while it is not known, or nothing arrives.
  uint64_t BytesPerSecond() const;

 private:
  struct Sample {
    uint64_t elapsed_ms;
    uint64_t done;
  };
  std::deque<Sample> samples_;  // the first is the beginning of the window
};

}  // namespace cli

#endif  // RCVLINK_CLI_RATE_METER_H_
