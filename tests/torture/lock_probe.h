// Asks from a thread of its own whether a receiver is locked: the thread that has the lock could take
// it again.
#ifndef RCVLINK_TESTS_TORTURE_LOCK_PROBE_H_
#define RCVLINK_TESTS_TORTURE_LOCK_PROBE_H_

#include <thread>

#include "platform/api_types.h"
#include "platform/handle.h"

namespace torture {

// One thread for all questions. It waits with Win32 locks: under Wine an event takes ten times as
// long.
class LockProbe {
 public:
  LockProbe() : thread_([this] { Answer(); }) {}
  LockProbe(const LockProbe&) = delete;
  LockProbe& operator=(const LockProbe&) = delete;
  ~LockProbe() {
    Ask(nullptr, State::kOver);
    thread_.join();
  }

  // S_OK: the lock is free. S_FALSE: another thread has it.
  long Try(void* receiver) {
    Ask(receiver, State::kAsked);
    AcquireSRWLockExclusive(&lock_);
    while (state_ != State::kAnswered) Wait();
    const long result = result_;
    ReleaseSRWLockExclusive(&lock_);
    return result;
  }

 private:
  enum class State { kAnswered, kAsked, kOver };

  void Ask(void* receiver, State state) {
    AcquireSRWLockExclusive(&lock_);
    receiver_ = receiver;
    Change(state);
    ReleaseSRWLockExclusive(&lock_);
  }

  void Answer() {
    AcquireSRWLockExclusive(&lock_);
    for (;;) {
      while (state_ == State::kAnswered) Wait();
      if (state_ == State::kOver) break;
      result_ = devapi::LockConnection(receiver_, signalled_.get());
      if (result_ == S_OK) devapi::UnlockConnection(receiver_);
      Change(State::kAnswered);
    }
    ReleaseSRWLockExclusive(&lock_);
  }

  void Change(State state) {
    state_ = state;
    WakeAllConditionVariable(&changed_);
  }
  void Wait() { SleepConditionVariableSRW(&changed_, &lock_, INFINITE, 0); }

  SRWLOCK lock_ = SRWLOCK_INIT;  // of the next four
  CONDITION_VARIABLE changed_ = CONDITION_VARIABLE_INIT;
  State state_ = State::kAnswered;
  void* receiver_ = nullptr;
  long result_ = E_FAIL;
  // A wait for the lock ends at once with it.
  const rcvlink::KernelHandle signalled_{CreateEventW(nullptr, TRUE, TRUE, nullptr)};
  std::thread thread_;
};

}  // namespace torture

#endif  // RCVLINK_TESTS_TORTURE_LOCK_PROBE_H_
