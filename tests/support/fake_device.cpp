#include "tests/support/fake_device.h"

namespace {

// Something real to own and close.
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
  opened_path = path;
  opened_access = access;
  opened_share = share;
  opened_flags = flags;
  if (open_error == ERROR_SUCCESS) return OpenNothing();
  SetLastError(open_error);
  return INVALID_HANDLE_VALUE;
}

BOOL FakeDevice::Answer(const std::string& call) {
  calls.push_back(call);
  return call == failing_call ? Fail(failure) : TRUE;
}

BOOL FakeDevice::StartTransfer(const std::string& call, DWORD* count) {
  calls.push_back(call);
  if (transfer_error != ERROR_SUCCESS) return Fail(transfer_error);
  *count = transferred;
  return TRUE;
}

BOOL FakeDevice::ReadFile(HANDLE, void*, DWORD, DWORD* read, OVERLAPPED*) {
  return StartTransfer("ReadFile", read);
}

BOOL FakeDevice::WriteFile(HANDLE, const void*, DWORD, DWORD* written, OVERLAPPED*) {
  return StartTransfer("WriteFile", written);
}

BOOL FakeDevice::GetOverlappedResult(HANDLE, OVERLAPPED*, DWORD* bytes, BOOL wait) {
  calls.push_back(wait ? "GetOverlappedResult waiting" : "GetOverlappedResult");
  if (wait) return Fail(ERROR_OPERATION_ABORTED);
  if (overlapped_error != ERROR_SUCCESS) return Fail(overlapped_error);
  *bytes = transferred;
  return TRUE;
}

BOOL FakeDevice::CancelIo(HANDLE) { return Answer("CancelIo"); }

DWORD FakeDevice::WaitForMultipleObjects(DWORD count, const HANDLE* handles, DWORD timeout_ms) {
  calls.push_back("Wait");
  wait_timeout = timeout_ms;
  if (on_wait) on_wait(count, handles);
  if (wait_answer == WAIT_FAILED) SetLastError(failure);
  return wait_answer;
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
