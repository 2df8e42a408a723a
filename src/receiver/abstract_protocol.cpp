#include "receiver/abstract_protocol.h"

#include <algorithm>
#include <array>
#include <mutex>
#include <utility>

#include "platform/hresult.h"
#include "platform/text.h"
#include "report/report_file.h"

using rcvlink::AbortSwitch;
using rcvlink::CatchResult;
using rcvlink::CopyBstr;
using rcvlink::HResultError;
using rcvlink::HResultFromError;
using rcvlink::kNotConnected;
using rcvlink::ToNarrow;
using rcvlink::Trace;
using rcvlink::UniqueBstr;

CAbstractProtocol::CAbstractProtocol(const wchar_t* class_name,
                                     std::unique_ptr<CIConnection> connection)
    : abort_(connection.get()), class_name_(class_name), connection_(std::move(connection)) {}

HRESULT CAbstractProtocol::CheckConnection(HANDLE abort_event, short* answer) {
  if (!answer) return E_INVALIDARG;
  if (!connection()) return kNotConnected;
  const HRESULT lock_result = LockConnection(abort_event);
  if (lock_result != S_OK) return lock_result;
  const HRESULT result = CatchResult([&] {
    *answer = IsAnswering(abort_event) ? VARIANT_TRUE : VARIANT_FALSE;
    return S_OK;
  });
  // The check has ended, so the abort ends no wait after it. Its flag stays: the abort may be meant
  // for an operation of another thread that waits for the lock.
  abort_.ClearCancel();
  UnlockConnection();
  return result;
}

HRESULT CAbstractProtocol::UploadFile(const CFileInfo*, IStream*) { return E_NOTIMPL; }
HRESULT CAbstractProtocol::DeleteFile(const wchar_t*) { return E_NOTIMPL; }
HRESULT CAbstractProtocol::RenameFile(const wchar_t*, const wchar_t*) { return E_NOTIMPL; }
HRESULT CAbstractProtocol::DCSetRcvBaudrate(DWORD) { return E_NOTIMPL; }
HRESULT CAbstractProtocol::DCSetRcvRTSControl(BYTE) { return E_NOTIMPL; }
HRESULT CAbstractProtocol::DCSetRcvParity(BYTE) { return E_NOTIMPL; }
HRESULT CAbstractProtocol::DCSetRcvStopbits(BYTE) { return E_NOTIMPL; }

void CAbstractProtocol::SetCallback(CIProtocolCallback* callback) {
  const std::scoped_lock lock(callback_lock_);
  callback_ = callback;
}

void CAbstractProtocol::Abort() { abort_.Abort(); }

HRESULT CAbstractProtocol::ExecuteAsCurrent(CReceiverCmd& command) {
  const AbortSwitch::CurrentCommand current(abort_, command);
  return command.Execute(connection(), nullptr);
}

void CAbstractProtocol::ThrowIfAborted() {
  if (abort_.Take()) throw HResultError(S_FALSE);
}

bool CAbstractProtocol::RaiseSpeed(DWORD speed) {
  const HRESULT receiver_result = RaiseReceiver(kTransferSpeed);
  if (receiver_result != S_OK) {
    Trace(L"%s::DownloadFile - receiver speed up is failed [0x%08X]\r\n",
          class_name_,
          receiver_result);
    return false;
  }
  const HRESULT host_result = connection()->SetSpeed(kTransferSpeed);
  if (FAILED(host_result)) {
    Trace(L"%s::DownloadFile - host speed up is failed [0x%08X]\r\n", class_name_, host_result);
    SetReceiverBack(speed);
    return false;
  }
  return true;
}

HRESULT CAbstractProtocol::LockConnection(HANDLE abort_event) {
  const HANDLE mutex = connection_lock_.handle();
  const std::array<HANDLE, 2> handles = {mutex, abort_event};
  const DWORD count = abort_event ? 2 : 1;
  const DWORD ended = WaitForMultipleObjects(count, handles.data(), FALSE, INFINITE);
  const DWORD error = GetLastError();
  if (ended == WAIT_OBJECT_0) {
    Trace(L"%s::LockConnection - connection is locked [0x%p]\r\n", class_name_, mutex);
    return S_OK;
  }
  if (ended == WAIT_OBJECT_0 + 1) {
    Trace(L"%s::LockConnection - is cancelled [0x%p]\r\n", class_name_, mutex);
    return S_FALSE;
  }
  Trace(L"%s::LockConnection - is failed [0x%p]\r\n", class_name_, mutex);
  return HResultFromError(error);
}

HRESULT CAbstractProtocol::UnlockConnection() {
  Trace(L"%s::UnlockConnection - connection is unlocked [0x%p]\r\n",
        class_name_,
        connection_lock_.handle());
  return connection_lock_.Unlock() ? TRUE : FALSE;
}

void CAbstractProtocol::AppendEntries(const FileEntries& entries, CFileList& files) {
  constexpr DWORD kListRead = 90;
  constexpr DWORD kListCopying = 10;
  ReportProgress(kListRead);
  const auto count = static_cast<DWORD>(entries.size());
  if (!files.Reserve(entries.size())) throw HResultError(E_OUTOFMEMORY);
  DWORD i = 0;
  for (const FileEntry& entry : entries) {
    if (!files.Append(CopyBstr(entry.name.c_str()), entry.size, entry.time)) {
      throw HResultError(E_OUTOFMEMORY);
    }
    ReportProgress(kListCopying * i++ / count + kListRead);
  }
}

void CAbstractProtocol::ReportProgress(DWORD percent) {
  constexpr DWORD kComplete = 100;
  const std::scoped_lock lock(callback_lock_);
  if (callback_) callback_->OnProgress(static_cast<BYTE>(std::min(percent, kComplete)));
}

std::wstring rcvlink::NameOf(CIConnection* connection) {
  BSTR name = nullptr;
  if (FAILED(connection->GetName(&name))) return {};
  const UniqueBstr owner(name);
  return owner ? owner.get() : L"";
}

std::string rcvlink::NarrowNameOf(CIConnection* connection) { return ToNarrow(NameOf(connection)); }
