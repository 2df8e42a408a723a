#include "tests/support/fake_device.h"

#include <algorithm>
#include <cstdio>
#include <utility>

namespace {

// A real handle that can be closed.
HANDLE OpenNothing() {
  return CreateFileW(L"NUL", GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, 0, nullptr);
}

BOOL Fail(DWORD error) {
  SetLastError(error);
  return FALSE;
}

}  // namespace

HANDLE FakeDevice::CreateFile(const wchar_t* path, DWORD access, DWORD share, DWORD flags) {
  calls.push_back("CreateFile");
  if (on_open) on_open();
  opened_path = path;
  opened_access = access;
  opened_share = share;
  opened_flags = flags;
  DWORD error = open_error;
  if (!open_errors.empty()) {
    error = open_errors.front();
    open_errors.pop_front();
  }
  const HANDLE handle = error == ERROR_SUCCESS ? OpenNothing() : INVALID_HANDLE_VALUE;
  openings.push_back({path, access, share, flags, handle});
  if (error != ERROR_SUCCESS) SetLastError(error);
  return handle;
}

BOOL FakeDevice::Answer(const std::string& call) {
  calls.push_back(call);
  return call == failing_call ? Fail(failure) : TRUE;
}

BOOL FakeDevice::Start(DWORD error, OVERLAPPED* block) const {
  constexpr ULONG_PTR kPending = 0x103;  // STATUS_PENDING
  if (error == ERROR_SUCCESS) return TRUE;
  if (error == ERROR_IO_PENDING && hangs) block->Internal = kPending;
  return Fail(error);
}

BOOL FakeDevice::StartTransfer(
    const std::string& call, HANDLE handle, DWORD size, DWORD* count, OVERLAPPED* block) {
  calls.push_back(call);
  transfer_calls.push_back({call, handle, size});
  TransferAnswer answer{transfer_error, transferred};
  if (!transfers.empty()) {
    answer = transfers.front();
    transfers.pop_front();
  }
  if (!Start(answer.error, block)) return FALSE;
  *count = answer.count;
  return TRUE;
}

BOOL FakeDevice::ReadFile(HANDLE handle, void*, DWORD size, DWORD* read, OVERLAPPED* block) {
  return StartTransfer("ReadFile", handle, size, read, block);
}

BOOL FakeDevice::WriteFile(
    HANDLE handle, const void*, DWORD size, DWORD* written, OVERLAPPED* block) {
  return StartTransfer("WriteFile", handle, size, written, block);
}

BOOL FakeDevice::GetOverlappedResult(HANDLE handle, OVERLAPPED*, DWORD* bytes) {
  calls.push_back("GetOverlappedResult");
  transfer_calls.push_back({"GetOverlappedResult", handle, 0});
  if (overlapped_error != ERROR_SUCCESS) return Fail(overlapped_error);
  *bytes = transferred;
  return TRUE;
}

BOOL FakeDevice::CancelIo(HANDLE handle) {
  transfer_calls.push_back({"CancelIo", handle, 0});
  return Answer("CancelIo");
}

BOOL FakeDevice::DeviceIoControl(HANDLE handle,
                                 DWORD code,
                                 void* input,
                                 DWORD input_size,
                                 void* output,
                                 DWORD output_size,
                                 DWORD* returned,
                                 OVERLAPPED* block) {
  char name[32] = {};
  std::snprintf(name, sizeof(name), "DeviceIoControl %08lX", code);
  calls.push_back(name);
  requests.push_back(
      {handle, code, std::string(static_cast<const char*>(input), input_size), output_size});
  if (on_request) on_request(requests.back());
  RequestAnswer answer;
  if (auto& answers = request_answers[code]; !answers.empty()) {
    answer = std::move(answers.front());
    answers.pop_front();
  }
  if (!Start(answer.error, block)) return FALSE;
  const size_t count = std::min<size_t>(answer.output.size(), output_size);
  std::copy_n(answer.output.begin(), count, static_cast<char*>(output));
  *returned = static_cast<DWORD>(count);
  return TRUE;
}

DWORD FakeDevice::WaitForSingleObject(HANDLE, DWORD timeout_ms) {
  calls.push_back("WaitForEnd");
  end_timeouts.push_back(timeout_ms);
  return hangs ? WAIT_TIMEOUT : WAIT_OBJECT_0;
}

DWORD FakeDevice::WaitForMultipleObjects(DWORD count, const HANDLE* handles, DWORD timeout_ms) {
  calls.push_back("Wait");
  wait_timeout = timeout_ms;
  if (on_wait) on_wait(count, handles);
  if (wait_answer == WAIT_FAILED) SetLastError(failure);
  return wait_answer == kDone ? WAIT_OBJECT_0 + count - 1 : wait_answer;
}

BOOL FakeDevice::SetCommMask(HANDLE, DWORD mask) {
  event_mask = mask;
  return Answer("SetCommMask");
}

BOOL FakeDevice::SetupComm(HANDLE, DWORD input, DWORD output) {
  input_queue = input;
  output_queue = output;
  return Answer("SetupComm");
}

BOOL FakeDevice::GetCommState(HANDLE, DCB* block) {
  if (failing_call != "GetCommState") *block = state;
  return Answer("GetCommState");
}

BOOL FakeDevice::SetCommState(HANDLE, DCB* block) {
  set_states.push_back(*block);
  const BOOL answer = Answer("SetCommState");
  if (answer) state = *block;
  return answer;
}

BOOL FakeDevice::SetCommTimeouts(HANDLE, COMMTIMEOUTS* block) {
  timeouts = *block;
  return Answer("SetCommTimeouts");
}

BOOL FakeDevice::ClearCommError(HANDLE, DWORD* errors, COMSTAT* status) {
  *status = COMSTAT{};
  if (on_clear) on_clear();
  if (!line.empty()) {
    *errors = line.front().errors;
    status->cbOutQue = line.front().queued;
    line.pop_front();
  }
  return Answer("ClearCommError");
}

BOOL FakeDevice::PurgeComm(HANDLE, DWORD flags) {
  purge_flags = flags;
  return Answer("PurgeComm");
}
