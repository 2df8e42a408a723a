// A function that is called periodically while the main thread is inside the library.
#ifndef RCVLINK_CLI_TICKER_H_
#define RCVLINK_CLI_TICKER_H_

#include <chrono>
#include <functional>
#include <thread>

#include "handle.h"

namespace cli {

// Calls a function on a thread of its own, after each interval, until it is destroyed.
class Ticker {
 public:
  Ticker(std::chrono::milliseconds interval, std::function<void()> tick);
  ~Ticker();
  Ticker(const Ticker&) = delete;
  Ticker& operator=(const Ticker&) = delete;

 private:
  UniqueHandle stop_;  // an event; without it the function is never called
  std::jthread thread_;
};

}  // namespace cli

#endif  // RCVLINK_CLI_TICKER_H_
