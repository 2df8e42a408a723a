// The Win32 calls of a connection, answered by a script: what a real device would say, in order.
#ifndef RCVLINK_TESTS_SUPPORT_FAKE_DEVICE_H_
#define RCVLINK_TESTS_SUPPORT_FAKE_DEVICE_H_

#include <deque>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "transport/device_calls.h"

class FakeDevice : public rcvlink::DeviceCalls {
 public:
  FakeDevice() { state.DCBlength = sizeof(DCB); }

  // The names of the calls in order, with the relevant arguments.
  std::vector<std::string> calls;

  DWORD open_error = ERROR_SUCCESS;
  std::wstring opened_path;
  DWORD opened_access = 0;
  DWORD opened_share = 99;
  DWORD opened_flags = 0;
  // Every opening, for devices that are opened more than once.
  struct Opening {
    std::wstring path;
    DWORD access;
    DWORD share;
    DWORD flags;
    HANDLE handle;
  };
  std::vector<Opening> openings;
  std::function<void()> on_open;
  std::deque<DWORD> open_errors;  // of the next openings, used before open_error

  // Transfers: 0 completes at once; ERROR_IO_PENDING is waited for; any other fails.
  DWORD transfer_error = ERROR_SUCCESS;
  DWORD transferred = 0;
  struct TransferAnswer {
    DWORD error;
    DWORD count;
  };
  std::deque<TransferAnswer> transfers;  // how the next ones start, used before the two above
  struct Transfer {
    std::string call;
    HANDLE device;
    DWORD size;  // 0 for a call that has none
  };
  std::vector<Transfer> transfer_calls;  // all calls of transfers, with their handles
  // What the wait returns: an index, WAIT_TIMEOUT, WAIT_FAILED, or kDone for the transfer's own
  // event, which is the last of the handles. `on_wait` runs first.
  static constexpr DWORD kDone = MAXIMUM_WAIT_OBJECTS;
  DWORD wait_answer = kDone;
  std::function<void(DWORD count, const HANDLE* handles)> on_wait;
  DWORD wait_timeout = 0;
  DWORD overlapped_error = ERROR_SUCCESS;  // of GetOverlappedResult
  // Whether pending transfers and requests do not end, not even when they are cancelled.
  bool hangs = false;
  std::vector<DWORD> end_timeouts;  // of all waits for the end of one

  // Requests to the driver: its answers to each code, in order; after that, success without output.
  // ERROR_IO_PENDING is waited for. The names in `calls` contain the code.
  struct RequestAnswer {
    DWORD error = ERROR_SUCCESS;
    std::string output = {};
  };
  std::map<DWORD, std::deque<RequestAnswer>> request_answers;
  struct Request {
    HANDLE device;
    DWORD code;
    std::string input;
    DWORD output_size;
  };
  std::vector<Request> requests;
  std::function<void(const Request&)> on_request;

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
  // What ClearCommError returns, in order; after that, no errors and an empty queue.
  std::deque<LineStatus> line;
  std::function<void()> on_clear;
  DWORD purge_flags = 0;
  DWORD event_mask = 0;
  DWORD input_queue = 0;
  DWORD output_queue = 0;

  HANDLE CreateFile(const wchar_t* path, DWORD access, DWORD share, DWORD flags) override;
  BOOL ReadFile(HANDLE, void* buffer, DWORD size, DWORD* read, OVERLAPPED* block) override;
  BOOL WriteFile(
      HANDLE, const void* buffer, DWORD size, DWORD* written, OVERLAPPED* block) override;
  BOOL GetOverlappedResult(HANDLE, OVERLAPPED* block, DWORD* bytes) override;
  BOOL CancelIo(HANDLE) override;
  BOOL DeviceIoControl(HANDLE device,
                       DWORD code,
                       void* input,
                       DWORD input_size,
                       void* output,
                       DWORD output_size,
                       DWORD* returned,
                       OVERLAPPED* block) override;
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
  BOOL Answer(const std::string& call);
  BOOL StartTransfer(
      const std::string& call, HANDLE handle, DWORD size, DWORD* count, OVERLAPPED* block);
  BOOL Start(DWORD error, OVERLAPPED* block) const;
};

#endif  // RCVLINK_TESTS_SUPPORT_FAKE_DEVICE_H_
