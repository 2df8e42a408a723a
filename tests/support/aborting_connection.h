// A connection to a simulated receiver with an abort at any of its calls. A cancel ends one wait,
// as with a device.
#ifndef RCVLINK_TESTS_SUPPORT_ABORTING_CONNECTION_H_
#define RCVLINK_TESTS_SUPPORT_ABORTING_CONNECTION_H_

#include <cstddef>
#include <cstdint>
#include <functional>
#include <utility>

#include "tests/support/simulated_connection.h"

// What a cancel makes of a write.
enum class CancelledWrite {
  kCompletes,        // it completed at once and did not wait
  kIsLost,           // it waited, and nothing was sent
  kIsSentAllTheSame  // it waited, and everything was already sent
};

class AbortingConnection : public CIConnection {
 public:
  AbortingConnection(sim::Receiver& receiver,
                     CancelledWrite cancelled_write,
                     DWORD host_speed = 9600)
      : inner_(receiver, host_speed), cancelled_write_(cancelled_write) {}

  // The abort comes at the beginning or at the end of the call with this number.
  std::function<void()> abort;
  size_t abort_at = SIZE_MAX;
  bool at_end = false;
  size_t calls = 0;

  HRESULT Disconnect() override { return inner_.Disconnect(); }
  HRESULT Read(void* buffer, DWORD size, DWORD* bytes_read, DWORD timeout_ms) override {
    *bytes_read = 0;
    return Call(
        [&] { return TakeCancel() ? S_FALSE : inner_.Read(buffer, size, bytes_read, timeout_ms); });
  }
  HRESULT Write(const void* buffer, DWORD size, DWORD timeout_ms) override {
    return Call([&] {
      const bool cancelled = cancelled_write_ != CancelledWrite::kCompletes && TakeCancel();
      if (!cancelled || cancelled_write_ == CancelledWrite::kIsSentAllTheSame) {
        inner_.Write(buffer, size, timeout_ms);
      }
      return cancelled ? S_FALSE : S_OK;
    });
  }
  HRESULT Flush() override {
    // Over USB it reads: a cancel ends that, and the wait of the next command as well.
    return Call([&] { return Speed() == 0 && cancelled_ ? S_OK : inner_.Flush(); });
  }
  void Cancel() override { cancelled_ = true; }
  HRESULT GetInstanceType(EInstanceType* type) override {
    return Call([&] { return inner_.GetInstanceType(type); });
  }
  HRESULT GetName(BSTR* name) override { return inner_.GetName(name); }
  HRESULT GetSpeed(DWORD* speed) override {
    return Call([&] { return inner_.GetSpeed(speed); });
  }
  void SetAbortEvent(HANDLE) override {}
  HRESULT SetSpeed(DWORD speed) override {
    return Call([&] { return inner_.SetSpeed(speed); });
  }
  void ClearCancel() override { cancelled_ = false; }
  rcvlink::WaitRule ExchangeWaitRule(const rcvlink::WaitRule& rule) override {
    return std::exchange(rule_, rule);
  }

  DWORD Speed() const { return inner_.Speed(); }

 private:
  template <typename Operation>
  HRESULT Call(Operation operation) {
    const bool due = calls++ == abort_at;
    if (due && !at_end) abort();
    const HRESULT result = operation();
    if (due && at_end) abort();
    return result;
  }
  bool TakeCancel() { return !rule_.shielded && std::exchange(cancelled_, false); }

  SimulatedConnection inner_;
  CancelledWrite cancelled_write_;
  bool cancelled_ = false;
  rcvlink::WaitRule rule_;
};

#endif  // RCVLINK_TESTS_SUPPORT_ABORTING_CONNECTION_H_
