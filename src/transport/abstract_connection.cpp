#include "transport/abstract_connection.h"

#include <array>
#include <utility>

#include "platform/event.h"
#include "platform/hresult.h"
#include "report/report_file.h"

using rcvlink::CatchResult;
using rcvlink::CopyBstr;
using rcvlink::HResultFromError;
using rcvlink::IsSignalled;
using rcvlink::KernelHandle;
using rcvlink::kNotConnected;
using rcvlink::kTimedOut;
using rcvlink::Trace;
using rcvlink::WaitRule;

namespace {

HRESULT CreateEventIfMissing(KernelHandle& event, BOOL manual_reset) {
  if (!event) event = KernelHandle(CreateEventW(nullptr, manual_reset, FALSE, nullptr));
  return event ? S_OK : HResultFromError(GetLastError());
}

}  // namespace

HRESULT CAbstractConnection::CreateEvents() {
  HRESULT result = CreateEventIfMissing(cancel_event_, FALSE);
  if (SUCCEEDED(result)) result = CreateEventIfMissing(write_event_, FALSE);
  if (SUCCEEDED(result)) result = CreateEventIfMissing(read_event_, TRUE);
  return result;
}

HRESULT CAbstractConnection::Disconnect() {
  Cancel();
  if (device_) {
    device_.Reset();
    Trace(L"CAbstractConnection::Disconnect - disconnected [%s]\r\n", name_.get());
  }
  ClearCancel();
  return S_OK;
}

HRESULT CAbstractConnection::Read(void* buffer, DWORD size, DWORD* bytes_read, DWORD timeout_ms) {
  *bytes_read = 0;
  if (!read_event_) return kNotConnected;
  if (!ResetEvent(read_event_.get())) return HResultFromError(GetLastError());

  const HANDLE handle = GetReadHandle();
  OVERLAPPED overlapped{};
  overlapped.hEvent = read_event_.get();
  if (calls_.ReadFile(handle, buffer, size, bytes_read, &overlapped)) return S_OK;
  if (const DWORD error = GetLastError(); error != ERROR_IO_PENDING) {
    Trace(L"CAbstractConnection::Read - read failed [%u] [%s]\r\n", error, name_.get());
    return HResultFromError(error);
  }

  const HRESULT result = WaitForTransfer(handle, overlapped, timeout_ms, wait_rule_.watched);
  if (result == kTimedOut) {
    Trace(L"CAbstractConnection::Read - wait timeout [%s]\r\n", name_.get());
  }
  if (result != S_OK) return result;
  if (!calls_.GetOverlappedResult(handle, &overlapped, bytes_read, FALSE)) {
    const DWORD error = GetLastError();
    Trace(L"CAbstractConnection::Read - GetOverlappedResult is failed [%u] [%s]\r\n",
          error,
          name_.get());
    return HResultFromError(error);
  }
  return S_OK;
}

HRESULT CAbstractConnection::Write(const void* buffer, DWORD size, DWORD timeout_ms) {
  if (!write_event_) return kNotConnected;
  if (!ResetEvent(write_event_.get())) return HResultFromError(GetLastError());

  const HANDLE handle = GetWriteHandle();
  OVERLAPPED overlapped{};
  overlapped.hEvent = write_event_.get();
  DWORD written = 0;
  if (calls_.WriteFile(handle, buffer, size, &written, &overlapped)) return S_OK;
  if (const DWORD error = GetLastError(); error != ERROR_IO_PENDING) {
    Trace(L"CAbstractConnection::Write - write failed [%u] [%s]\r\n", error, name_.get());
    return HResultFromError(error);
  }

  if (timeout_ms != 0) {
    // No watched event ends a write: the receiver would take half a line as the beginning of the
    // next command.
    const HRESULT result = WaitForTransfer(handle, overlapped, timeout_ms, nullptr);
    if (result == kTimedOut) {
      Trace(L"CAbstractConnection::Write - wait timeout [0x%08X] [%s]\r\n", result, name_.get());
    }
    if (result != S_OK) return result;
  }
  if (!calls_.GetOverlappedResult(handle, &overlapped, &written, FALSE)) {
    const DWORD error = GetLastError();
    // A write that was not waited for may still be running. It is ended here, since the caller
    // frees the buffer next.
    if (error == ERROR_IO_INCOMPLETE) CancelTransfer(handle, overlapped);
    Trace(L"CAbstractConnection::Write - GetOverlappedResult is failed [%u] [%s]\r\n",
          error,
          name_.get());
    return HResultFromError(error);
  }
  return S_OK;
}

HRESULT CAbstractConnection::WaitForTransfer(HANDLE handle,
                                             OVERLAPPED& overlapped,
                                             DWORD timeout_ms,
                                             HANDLE watched) {
  // What ends the wait early comes first: Windows reports the first signalled handle, and an abort
  // counts also when the transfer ends at the same moment.
  std::array<HANDLE, 3> events{};
  DWORD done = 0;
  if (!wait_rule_.shielded) events[done++] = GetAbortEvent();
  if (watched) events[done++] = watched;
  events[done] = overlapped.hEvent;
  const DWORD ended = calls_.WaitForMultipleObjects(done + 1, events.data(), timeout_ms);
  if (ended == WAIT_OBJECT_0 + done) return S_OK;

  HRESULT result = S_FALSE;
  if (ended == WAIT_TIMEOUT) {
    result = kTimedOut;
  } else if (ended > WAIT_OBJECT_0 + done) {
    result = HResultFromError(GetLastError());
  }
  CancelTransfer(handle, overlapped);
  return result;
}

void CAbstractConnection::CancelTransfer(HANDLE handle, OVERLAPPED& overlapped) {
  calls_.CancelIo(handle);
  // Waits until the transfer has ended: before, the device may still write to the record and to the
  // buffer.
  DWORD bytes = 0;
  calls_.GetOverlappedResult(handle, &overlapped, &bytes, TRUE);
}

HRESULT CAbstractConnection::Flush() { return S_FALSE; }

void CAbstractConnection::Cancel() {
  if (!cancel_event_) return;
  Trace(L"CAbstractConnection::Cancel [%s]\r\n", name_ ? name_.get() : L"");
  SetEvent(cancel_event_.get());
}

HRESULT CAbstractConnection::GetName(BSTR* name) {
  if (!name) return E_POINTER;
  *name = nullptr;
  return CatchResult([&] {
    *name = CopyBstr(name_.get()).release();
    return S_OK;
  });
}

void CAbstractConnection::SetAbortEvent(HANDLE event) { abort_event_ = event; }

void CAbstractConnection::ClearCancel() {
  if (cancel_event_) ResetEvent(cancel_event_.get());
}

WaitRule CAbstractConnection::ExchangeWaitRule(const WaitRule& rule) {
  return std::exchange(wait_rule_, rule);
}

bool CAbstractConnection::IsCancelPending() const {
  // The test clears an auto-reset event, so it is signalled again.
  return IsSignalled(cancel_event_.get()) && SetEvent(cancel_event_.get());
}

HANDLE CAbstractConnection::GetWriteHandle() { return device_.get(); }

HANDLE CAbstractConnection::GetReadHandle() { return device_.get(); }

HANDLE CAbstractConnection::GetAbortEvent() {
  return abort_event_ ? abort_event_ : cancel_event_.get();
}
