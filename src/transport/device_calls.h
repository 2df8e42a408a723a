// The Win32 calls that connections make. Tests replace them, and so show what no simulated port
// shows: the DCB that was set, errors of the line, a read that ends empty.
#ifndef RCVLINK_TRANSPORT_DEVICE_CALLS_H_
#define RCVLINK_TRANSPORT_DEVICE_CALLS_H_

#include "platform/win32.h"

namespace rcvlink {

// Each operation is the Win32 function of its name; failures leave their reason in the thread's
// last error.
class DeviceCalls {
 public:
  virtual ~DeviceCalls() = default;

  virtual HANDLE CreateFile(const wchar_t* path, DWORD access, DWORD share, DWORD flags);
  virtual BOOL ReadFile(
      HANDLE device, void* buffer, DWORD size, DWORD* read, OVERLAPPED* overlapped);
  virtual BOOL WriteFile(
      HANDLE device, const void* buffer, DWORD size, DWORD* written, OVERLAPPED* overlapped);
  // Does not wait.
  virtual BOOL GetOverlappedResult(HANDLE device, OVERLAPPED* overlapped, DWORD* bytes);
  virtual BOOL CancelIo(HANDLE device);
  virtual BOOL DeviceIoControl(HANDLE device,
                               DWORD code,
                               void* input,
                               DWORD input_size,
                               void* output,
                               DWORD output_size,
                               DWORD* returned,
                               OVERLAPPED* overlapped);
  virtual DWORD WaitForSingleObject(HANDLE handle, DWORD timeout_ms);
  // Waits for any of `count` handles.
  virtual DWORD WaitForMultipleObjects(DWORD count, const HANDLE* handles, DWORD timeout_ms);

  virtual BOOL SetCommMask(HANDLE device, DWORD mask);
  virtual BOOL SetupComm(HANDLE device, DWORD input_queue, DWORD output_queue);
  virtual BOOL GetCommState(HANDLE device, DCB* settings);
  virtual BOOL SetCommState(HANDLE device, DCB* settings);
  virtual BOOL SetCommTimeouts(HANDLE device, COMMTIMEOUTS* timeouts);
  virtual BOOL ClearCommError(HANDLE device, DWORD* errors, COMSTAT* status);
  virtual BOOL PurgeComm(HANDLE device, DWORD flags);
};

// The system's calls, unless a test has replaced them.
DeviceCalls& SystemCalls();

// Replaces the system's calls for a scope; for tests, on one thread. A connection keeps the calls
// that it was made with.
class SystemCallsOverride {
 public:
  explicit SystemCallsOverride(DeviceCalls& calls);
  SystemCallsOverride(const SystemCallsOverride&) = delete;
  SystemCallsOverride& operator=(const SystemCallsOverride&) = delete;
  ~SystemCallsOverride();

 private:
  DeviceCalls* previous_;
};

}  // namespace rcvlink

#endif  // RCVLINK_TRANSPORT_DEVICE_CALLS_H_
