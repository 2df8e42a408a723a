// The Win32 calls of a simulated port: one may fail, and a test may act at each.
#ifndef RCVLINK_TESTS_TORTURE_FAULTY_CALLS_H_
#define RCVLINK_TESTS_TORTURE_FAULTY_CALLS_H_

#include <cstdint>
#include <functional>

#include "tests/support/allocations.h"
#include "transport/device_calls.h"

namespace torture {

class FaultyCalls : public rcvlink::DeviceCalls {
 public:
  explicit FaultyCalls(rcvlink::DeviceCalls& calls) : calls_(calls) {}

  static constexpr DWORD kError = ERROR_GEN_FAILURE;
  size_t failing = SIZE_MAX;      // the call of this number, from 0
  size_t count = 0;               // calls so far
  const char* failed = "";        // the name of the one that failed
  std::function<void()> on_call;  // comes before each call; may be empty

  HANDLE CreateFile(const wchar_t* path, DWORD access, DWORD share, DWORD flags) override {
    if (Fails("CreateFile")) return INVALID_HANDLE_VALUE;
    const UncountedAllocations own;
    return calls_.CreateFile(path, access, share, flags);
  }
  BOOL ReadFile(HANDLE device, void* buffer, DWORD size, DWORD* read, OVERLAPPED* block) override {
    return Call("ReadFile", [&] { return calls_.ReadFile(device, buffer, size, read, block); });
  }
  BOOL WriteFile(
      HANDLE device, const void* buffer, DWORD size, DWORD* written, OVERLAPPED* block) override {
    return Call("WriteFile",
                [&] { return calls_.WriteFile(device, buffer, size, written, block); });
  }
  BOOL GetOverlappedResult(HANDLE device, OVERLAPPED* block, DWORD* bytes) override {
    return Call("GetOverlappedResult",
                [&] { return calls_.GetOverlappedResult(device, block, bytes); });
  }
  BOOL CancelIo(HANDLE device) override {
    return Call("CancelIo", [&] { return calls_.CancelIo(device); });
  }
  BOOL DeviceIoControl(HANDLE device,
                       DWORD code,
                       void* input,
                       DWORD input_size,
                       void* output,
                       DWORD output_size,
                       DWORD* returned,
                       OVERLAPPED* block) override {
    return Call("DeviceIoControl", [&] {
      return calls_.DeviceIoControl(
          device, code, input, input_size, output, output_size, returned, block);
    });
  }
  DWORD WaitForSingleObject(HANDLE handle, DWORD timeout_ms) override {
    if (Fails("WaitForSingleObject")) return WAIT_FAILED;
    const UncountedAllocations own;
    return calls_.WaitForSingleObject(handle, timeout_ms);
  }
  DWORD WaitForMultipleObjects(DWORD handles, const HANDLE* events, DWORD timeout_ms) override {
    if (Fails("WaitForMultipleObjects")) return WAIT_FAILED;
    const UncountedAllocations own;
    return calls_.WaitForMultipleObjects(handles, events, timeout_ms);
  }
  BOOL SetCommMask(HANDLE device, DWORD mask) override {
    return Call("SetCommMask", [&] { return calls_.SetCommMask(device, mask); });
  }
  BOOL SetupComm(HANDLE device, DWORD input_queue, DWORD output_queue) override {
    return Call("SetupComm", [&] { return calls_.SetupComm(device, input_queue, output_queue); });
  }
  BOOL GetCommState(HANDLE device, DCB* settings) override {
    return Call("GetCommState", [&] { return calls_.GetCommState(device, settings); });
  }
  BOOL SetCommState(HANDLE device, DCB* settings) override {
    return Call("SetCommState", [&] { return calls_.SetCommState(device, settings); });
  }
  BOOL SetCommTimeouts(HANDLE device, COMMTIMEOUTS* timeouts) override {
    return Call("SetCommTimeouts", [&] { return calls_.SetCommTimeouts(device, timeouts); });
  }
  BOOL ClearCommError(HANDLE device, DWORD* errors, COMSTAT* status) override {
    return Call("ClearCommError", [&] { return calls_.ClearCommError(device, errors, status); });
  }
  BOOL PurgeComm(HANDLE device, DWORD flags) override {
    return Call("PurgeComm", [&] { return calls_.PurgeComm(device, flags); });
  }

 private:
  bool Fails(const char* name) {
    if (on_call) on_call();
    if (count++ != failing) return false;
    failed = name;
    SetLastError(kError);
    return true;
  }
  // What a call allocates is the simulated port's.
  template <typename Inner>
  BOOL Call(const char* name, Inner inner) {
    if (Fails(name)) return FALSE;
    const UncountedAllocations own;
    return inner();
  }

  rcvlink::DeviceCalls& calls_;
};

}  // namespace torture

#endif  // RCVLINK_TESTS_TORTURE_FAULTY_CALLS_H_
