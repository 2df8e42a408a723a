// A connection to a simulated receiver in memory: time is virtual, nothing waits.
#ifndef RCVLINK_TESTS_SUPPORT_SIMULATED_CONNECTION_H_
#define RCVLINK_TESTS_SUPPORT_SIMULATED_CONNECTION_H_

#include <functional>
#include <utility>

#include "platform/api_types.h"
#include "simulator/ports/memory.h"
#include "transport/connection.h"

// Behaves as a serial connection to the receiver: reads end when as many bytes came as were asked
// for, or once the line was quiet for a while, as a COM port's do. At a speed of 0 it is one over
// USB: reads end with the available bytes.
class SimulatedConnection : public CIConnection {
 public:
  explicit SimulatedConnection(sim::Receiver& receiver, DWORD host_speed = 9600)
      : port_(receiver), speed_(host_speed) {
    port_.SetHostSpeed(host_speed);
  }

  std::function<void()> before_read;  // may be empty; may call Cancel
  DWORD Speed() const { return speed_; }
  uint64_t Now() const { return port_.Now(); }

  HRESULT Disconnect() override { return S_OK; }
  HRESULT Read(void* buffer, DWORD size, DWORD* bytes_read, DWORD timeout_ms) override;
  HRESULT Write(const void* buffer, DWORD size, DWORD timeout_ms) override;
  HRESULT Flush() override;
  void Cancel() override { cancelled_ = true; }
  HRESULT GetInstanceType(EInstanceType* type) override;
  HRESULT GetName(BSTR* name) override;
  HRESULT GetSpeed(DWORD* speed) override;
  void SetAbortEvent(HANDLE) override {}
  HRESULT SetSpeed(DWORD speed) override;
  void ClearCancel() override { cancelled_ = false; }
  rcvlink::WaitRule ExchangeWaitRule(const rcvlink::WaitRule& rule) override {
    return std::exchange(rule_, rule);
  }

 private:
  bool IsUsb() const { return speed_ == 0; }

  sim::MemoryPort port_;
  DWORD speed_;
  bool cancelled_ = false;  // one cancel ends one read
  rcvlink::WaitRule rule_;
};

#endif  // RCVLINK_TESTS_SUPPORT_SIMULATED_CONNECTION_H_
