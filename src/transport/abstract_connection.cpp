#include "transport/abstract_connection.h"

#include <algorithm>
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
using rcvlink::Transfer;
using rcvlink::WaitRule;

namespace {

// From the request to end a transfer to its end. Drivers take milliseconds; one that takes longer
// than this hangs, as that of an adapter that was unplugged may do.
constexpr DWORD kCancelLimitMs = 5000;

}  // namespace

HRESULT CAbstractConnection::CreateEvents() {
  if (!cancel_event_) cancel_event_ = KernelHandle(CreateEventW(nullptr, FALSE, FALSE, nullptr));
  if (!cancel_event_) return HResultFromError(GetLastError());
  HRESULT result = S_OK;
  if (!writing_) result = Transfer::Create(/*manual_reset=*/FALSE, writing_);
  if (SUCCEEDED(result) && !reading_) result = Transfer::Create(/*manual_reset=*/TRUE, reading_);
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
  if (!reading_) return kNotConnected;
  if (const HRESULT result = reading_->Prepare(size); FAILED(result)) return result;

  const HANDLE handle = GetReadHandle();
  if (calls_.ReadFile(handle, reading_->bytes(), size, bytes_read, reading_->record())) {
    std::copy_n(reading_->bytes(), std::min(*bytes_read, size), static_cast<uint8_t*>(buffer));
    return S_OK;
  }
  if (const DWORD error = GetLastError(); error != ERROR_IO_PENDING) {
    Trace(L"CAbstractConnection::Read - read failed [%u] [%s]\r\n", error, name_.get());
    return HResultFromError(error);
  }

  const HRESULT result = WaitForTransfer(handle, reading_, timeout_ms, wait_rule_.watched);
  if (result == kTimedOut) {
    Trace(L"CAbstractConnection::Read - wait timeout [%s]\r\n", name_.get());
  }
  if (result != S_OK) return result;
  if (!calls_.GetOverlappedResult(handle, reading_->record(), bytes_read)) {
    const DWORD error = GetLastError();
    Trace(L"CAbstractConnection::Read - GetOverlappedResult is failed [%u] [%s]\r\n",
          error,
          name_.get());
    return HResultFromError(error);
  }
  std::copy_n(reading_->bytes(), std::min(*bytes_read, size), static_cast<uint8_t*>(buffer));
  return S_OK;
}

HRESULT CAbstractConnection::Write(const void* buffer, DWORD size, DWORD timeout_ms) {
  if (!writing_) return kNotConnected;
  if (const HRESULT result = writing_->Prepare(size); FAILED(result)) return result;
  std::copy_n(static_cast<const uint8_t*>(buffer), size, writing_->bytes());

  const HANDLE handle = GetWriteHandle();
  DWORD written = 0;
  if (calls_.WriteFile(handle, writing_->bytes(), size, &written, writing_->record())) return S_OK;
  if (const DWORD error = GetLastError(); error != ERROR_IO_PENDING) {
    Trace(L"CAbstractConnection::Write - write failed [%u] [%s]\r\n", error, name_.get());
    return HResultFromError(error);
  }

  if (timeout_ms != 0) {
    // No watched event ends a write: the receiver would take half a line as the beginning of the
    // next command.
    const HRESULT result = WaitForTransfer(handle, writing_, timeout_ms, nullptr);
    if (result == kTimedOut) {
      Trace(L"CAbstractConnection::Write - wait timeout [0x%08X] [%s]\r\n", result, name_.get());
    }
    if (result != S_OK) return result;
  }
  if (!calls_.GetOverlappedResult(handle, writing_->record(), &written)) {
    const DWORD error = GetLastError();
    // A write that was not waited for may still be running. It is ended here, since the next one
    // uses the same memory.
    if (error == ERROR_IO_INCOMPLETE) CancelTransfer(handle, writing_);
    Trace(L"CAbstractConnection::Write - GetOverlappedResult is failed [%u] [%s]\r\n",
          error,
          name_.get());
    return HResultFromError(error);
  }
  return S_OK;
}

HRESULT CAbstractConnection::WaitForTransfer(HANDLE handle,
                                             std::unique_ptr<Transfer>& transfer,
                                             DWORD timeout_ms,
                                             HANDLE watched) {
  // What ends the wait early comes first: Windows reports the first signalled handle, and an abort
  // counts also when the transfer ends at the same moment.
  std::array<HANDLE, 3> events{};
  DWORD done = 0;
  if (!wait_rule_.shielded) events[done++] = GetAbortEvent();
  if (watched) events[done++] = watched;
  events[done] = transfer->event();
  const DWORD ended = calls_.WaitForMultipleObjects(done + 1, events.data(), timeout_ms);
  if (ended == WAIT_OBJECT_0 + done) return S_OK;

  HRESULT result = S_FALSE;
  if (ended == WAIT_TIMEOUT) {
    result = kTimedOut;
  } else if (ended > WAIT_OBJECT_0 + done) {
    result = HResultFromError(GetLastError());
  }
  CancelTransfer(handle, transfer);
  return result;
}

void CAbstractConnection::CancelTransfer(HANDLE handle, std::unique_ptr<Transfer>& transfer) {
  calls_.CancelIo(handle);
  // Before its end the driver may still write to the record and to the bytes.
  calls_.WaitForSingleObject(transfer->event(), kCancelLimitMs);
  if (transfer->HasEnded()) return;
  Trace(L"CAbstractConnection::CancelTransfer - the driver does not end a transfer [%s]\r\n",
        name_ ? name_.get() : L"");
  Transfer::Abandon(std::move(transfer));
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
