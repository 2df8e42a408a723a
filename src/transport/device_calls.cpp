#include "transport/device_calls.h"

#include <atomic>

namespace rcvlink {
namespace {

constinit DeviceCalls system_calls;
constinit std::atomic<DeviceCalls*> calls_override = nullptr;

}  // namespace

HANDLE DeviceCalls::CreateFile(const wchar_t* path, DWORD access, DWORD share, DWORD flags) {
  return CreateFileW(path, access, share, nullptr, OPEN_EXISTING, flags, nullptr);
}

BOOL DeviceCalls::ReadFile(
    HANDLE device, void* buffer, DWORD size, DWORD* read, OVERLAPPED* overlapped) {
  return ::ReadFile(device, buffer, size, read, overlapped);
}

BOOL DeviceCalls::WriteFile(
    HANDLE device, const void* buffer, DWORD size, DWORD* written, OVERLAPPED* overlapped) {
  return ::WriteFile(device, buffer, size, written, overlapped);
}

BOOL DeviceCalls::GetOverlappedResult(HANDLE device, OVERLAPPED* overlapped, DWORD* bytes) {
  return ::GetOverlappedResult(device, overlapped, bytes, FALSE);
}

BOOL DeviceCalls::CancelIo(HANDLE device) { return ::CancelIo(device); }

BOOL DeviceCalls::DeviceIoControl(HANDLE device,
                                  DWORD code,
                                  void* input,
                                  DWORD input_size,
                                  void* output,
                                  DWORD output_size,
                                  DWORD* returned,
                                  OVERLAPPED* overlapped) {
  return ::DeviceIoControl(
      device, code, input, input_size, output, output_size, returned, overlapped);
}

DWORD DeviceCalls::WaitForSingleObject(HANDLE handle, DWORD timeout_ms) {
  return ::WaitForSingleObject(handle, timeout_ms);
}

DWORD DeviceCalls::WaitForMultipleObjects(DWORD count, const HANDLE* handles, DWORD timeout_ms) {
  return ::WaitForMultipleObjects(count, handles, FALSE, timeout_ms);
}

BOOL DeviceCalls::SetCommMask(HANDLE device, DWORD mask) { return ::SetCommMask(device, mask); }

BOOL DeviceCalls::SetupComm(HANDLE device, DWORD input_queue, DWORD output_queue) {
  return ::SetupComm(device, input_queue, output_queue);
}

BOOL DeviceCalls::GetCommState(HANDLE device, DCB* settings) {
  return ::GetCommState(device, settings);
}

BOOL DeviceCalls::SetCommState(HANDLE device, DCB* settings) {
  return ::SetCommState(device, settings);
}

BOOL DeviceCalls::SetCommTimeouts(HANDLE device, COMMTIMEOUTS* timeouts) {
  return ::SetCommTimeouts(device, timeouts);
}

BOOL DeviceCalls::ClearCommError(HANDLE device, DWORD* errors, COMSTAT* status) {
  return ::ClearCommError(device, errors, status);
}

BOOL DeviceCalls::PurgeComm(HANDLE device, DWORD flags) { return ::PurgeComm(device, flags); }

DeviceCalls& SystemCalls() {
  DeviceCalls* const calls = calls_override;
  return calls ? *calls : system_calls;
}

SystemCallsOverride::SystemCallsOverride(DeviceCalls& calls)
    : previous_(calls_override.exchange(&calls)) {}

SystemCallsOverride::~SystemCallsOverride() { calls_override = previous_; }

}  // namespace rcvlink
