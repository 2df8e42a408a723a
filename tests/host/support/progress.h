// Progress functions of a host.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_PROGRESS_H_
#define RCVLINK_TESTS_HOST_SUPPORT_PROGRESS_H_

#include <chrono>
#include <functional>
#include <future>
#include <utility>
#include <vector>

#include "rcvlink.h"

namespace host {

// Keeps the reported percents, and calls a function for each.
class Progress {
 public:
  using Hook = std::function<void(int percent)>;

  explicit Progress(Hook hook = {}) : hook_(std::move(hook)) {}
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  CProgressCallback* record() { return &record_; }
  const std::vector<int>& percents() const { return percents_; }

 private:
  static void Call(void* context, unsigned char percent) {
    auto& self = *static_cast<Progress*>(context);
    self.percents_.push_back(percent);
    if (self.hook_) self.hook_(percent);
  }

  CProgressCallback record_{Call, this};
  std::vector<int> percents_;
  Hook hook_;
};

// Stops one thread at a place until another thread opens the gate.
class Gate {
 public:
  Gate() : arrival_(arrived_.get_future()), permission_(opened_.get_future()) {}
  Gate(const Gate&) = delete;
  Gate& operator=(const Gate&) = delete;
  // A test that failed must not leave a thread waiting.
  ~Gate() { Open(); }

  // On the thread to be stopped; only the first time.
  void Pass() {
    if (std::exchange(passed_, true)) return;
    arrived_.set_value();
    permission_.wait();
  }
  // False when no thread comes for a long time.
  bool WaitForArrival() {
    return arrival_.wait_for(std::chrono::seconds(60)) == std::future_status::ready;
  }
  void Open() {
    if (!std::exchange(open_, true)) opened_.set_value();
  }

 private:
  std::promise<void> arrived_;
  std::promise<void> opened_;
  std::future<void> arrival_;
  std::future<void> permission_;
  bool passed_ = false;
  bool open_ = false;
};

// A progress function that stops at a percent until the gate is opened.
class GatedProgress {
 public:
  explicit GatedProgress(int percent)
      : progress([this, percent](int now) {
          if (now >= percent) gate.Pass();
        }) {}

  Gate gate;
  Progress progress;
};

}  // namespace host

#endif  // RCVLINK_TESTS_HOST_SUPPORT_PROGRESS_H_
