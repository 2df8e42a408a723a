// The Win32 calls of a connection, answered by a script: what a real port would say, in order.
#ifndef RCVLINK_TESTS_SUPPORT_FAKE_DEVICE_H_
#define RCVLINK_TESTS_SUPPORT_FAKE_DEVICE_H_

#include <deque>
#include <functional>
#include <string>
#include <vector>

#include "transport/device_calls.h"

class FakeDevice : public DeviceCalls {
 public:
  FakeDevice() { state.DCBlength = sizeof(DCB); }

  // Names of the calls in order, with the arguments that matter.
  std::vector<std::string> calls;

  DWORD open_error = ERROR_SUCCESS;
  std::wstring opened_path;
  DWORD opened_access = 0;
  DWORD opened_share = 99;
  DWORD opened_flags = 0;

  // Transfers: 0 completes at once; ERROR_IO_PENDING is waited for; any other fails.
  DWORD transfer_error = ERROR_SUCCESS;
  DWORD transferred = 0;
  // What the wait gives (its index, WAIT_TIMEOUT, WAIT_FAILED), and runs first.
  DWORD wait_answer = WAIT_OBJECT_0 + 1;
  std::function<void(DWORD count, const HANDLE* handles)> on_wait;
  DWORD wait_timeout = 0;
  DWORD overlapped_error = ERROR_SUCCESS;  // of GetOverlappedResult without waiting

  // The serial port: which of the calls fail, and with what.
  DCB state{};
  std::vector<DCB> set_states;  // every block handed to SetCommState
  COMMTIMEOUTS timeouts{};
  std::string failing_call;  // the name of one call that fails
  DWORD failure = ERROR_INVALID_FUNCTION;
  struct LineStatus {
    DWORD errors;
    DWORD queued;
  };
  std::deque<LineStatus> line;  // what ClearCommError says, one after the other; then all clear
  std::function<void()> on_clear;
  DWORD purge_flags = 0;
  DWORD event_mask = 0;
  DWORD input_queue = 0;
  DWORD output_queue = 0;

  HANDLE CreateFile(const wchar_t* path, DWORD access, DWORD share, DWORD flags) override;
  BOOL ReadFile(HANDLE, void* buffer, DWORD size, DWORD* read, OVERLAPPED* block) override;
  BOOL WriteFile(
      HANDLE, const void* buffer, DWORD size, DWORD* written, OVERLAPPED* block) override;
  BOOL GetOverlappedResult(HANDLE, OVERLAPPED* block, DWORD* bytes, BOOL wait) override;
  BOOL CancelIo(HANDLE) override;
  DWORD WaitForMultipleObjects(DWORD count, const HANDLE* handles, DWORD timeout_ms) override;
  BOOL SetCommMask(HANDLE, DWORD mask) override;
  BOOL SetupComm(HANDLE, DWORD input_queue, DWORD output_queue) override;
  BOOL GetCommState(HANDLE, DCB* block) override;
  BOOL SetCommState(HANDLE, DCB* block) override;
  BOOL SetCommTimeouts(HANDLE, COMMTIMEOUTS* block) override;
  BOOL ClearCommError(HANDLE, DWORD* errors, COMSTAT* status) override;
  BOOL PurgeComm(HANDLE, DWORD flags) override;

 private:
  BOOL Answer(const std::string& call);
  BOOL StartTransfer(const std::string& call, DWORD* count);
};

#endif  // RCVLINK_TESTS_SUPPORT_FAKE_DEVICE_H_
