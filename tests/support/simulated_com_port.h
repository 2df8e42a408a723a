// A COM port in memory with a simulated receiver at its other end. It replaces the Win32 calls, so
// the real connection and the real discovery run on it. Waits move the test's clock; nothing
// sleeps.
#ifndef RCVLINK_TESTS_SUPPORT_SIMULATED_COM_PORT_H_
#define RCVLINK_TESTS_SUPPORT_SIMULATED_COM_PORT_H_

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "simulator/ports/memory.h"
#include "tests/support/manual_clock.h"
#include "transport/device_calls.h"

class SimulatedComPort : public rcvlink::DeviceCalls {
 public:
  // Both must outlive the port.
  SimulatedComPort(sim::Receiver& receiver, ManualClock& clock);

  std::wstring path = L"\\\\.\\COM7";  // no other can be opened
  DCB state{};                         // as it was set last
  // Whether every opening starts with the port's first state, as after a reset. Other ports keep
  // the state of the previous opening.
  bool forgets = false;
  // Whether it is a USB device instead, whose reads end with the bytes that have come.
  bool is_usb = false;
  // Whether the line carries anything while the port is in this state; empty for always. Speeds are
  // the receiver's business.
  std::function<bool(const DCB&)> carries;

  std::vector<DCB> set_states;  // every block handed to SetCommState
  size_t openings = 0;

  HANDLE CreateFile(const wchar_t* path, DWORD access, DWORD share, DWORD flags) override;
  BOOL ReadFile(HANDLE, void* buffer, DWORD size, DWORD* read, OVERLAPPED* block) override;
  BOOL WriteFile(
      HANDLE, const void* buffer, DWORD size, DWORD* written, OVERLAPPED* block) override;
  BOOL GetOverlappedResult(HANDLE, OVERLAPPED* block, DWORD* bytes) override;
  BOOL CancelIo(HANDLE) override;
  DWORD WaitForSingleObject(HANDLE, DWORD timeout_ms) override;
  DWORD WaitForMultipleObjects(DWORD count, const HANDLE* handles, DWORD timeout_ms) override;
  BOOL SetCommMask(HANDLE, DWORD mask) override;
  BOOL SetupComm(HANDLE, DWORD input_queue, DWORD output_queue) override;
  BOOL GetCommState(HANDLE, DCB* block) override;
  BOOL SetCommState(HANDLE, DCB* block) override;
  BOOL SetCommTimeouts(HANDLE, COMMTIMEOUTS* block) override;
  BOOL ClearCommError(HANDLE, DWORD* errors, COMSTAT* status) override;
  BOOL PurgeComm(HANDLE, DWORD flags) override;

 private:
  bool Carries() const { return !carries || carries(state); }
  void Follow();  // the test's clock
  sim::Bytes Take(size_t max_bytes, uint64_t timeout_ms);

  // The read that is under way.
  struct Pending {
    uint8_t* buffer = nullptr;
    DWORD size = 0;
    DWORD received = 0;
    uint64_t end_ms = 0;  // by the port's own time-outs
  };

  sim::MemoryPort port_;
  ManualClock& clock_;
  COMMTIMEOUTS timeouts_{};
  DCB first_state_{};
  Pending pending_;
};

#endif  // RCVLINK_TESTS_SUPPORT_SIMULATED_COM_PORT_H_
