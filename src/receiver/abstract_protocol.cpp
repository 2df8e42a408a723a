#include "receiver/abstract_protocol.h"

#include <algorithm>
#include <array>
#include <mutex>
#include <utility>

#include "platform/hresult.h"
#include "platform/text.h"
#include "report/report_file.h"

CAbstractProtocol::CAbstractProtocol(const wchar_t* class_name,
                                     std::unique_ptr<CIConnection> connection)
    : class_name_(class_name), connection_(std::move(connection)) {}

HRESULT CAbstractProtocol::UploadFile(const CFileInfo*, IStream*) { return E_NOTIMPL; }

void CAbstractProtocol::SetCurrentCommand(CReceiverCmd* command) {
  const std::scoped_lock lock(command_lock_);
  current_command_ = command;
}

HRESULT CAbstractProtocol::ExecuteAsCurrent(CReceiverCmd& command) {
  // Ends with the scope, also when the command raises a failure.
  struct CurrentScope {
    CAbstractProtocol& driver;
    ~CurrentScope() { driver.SetCurrentCommand(nullptr); }
  };
  if (connection()) UseUpCancel();
  SetCurrentCommand(&command);
  const CurrentScope scope{*this};
  return command.Execute(connection(), nullptr);
}

void CAbstractProtocol::Abort() {
  if (!connection()) return;
  // One step under the lock: whoever finds the abort finds its cancel signalled already.
  const std::scoped_lock lock(command_lock_);
  abort_ = true;
  if (current_command_) current_command_->Cancel();
  connection()->Cancel();
}

bool CAbstractProtocol::TakeAbort() {
  const std::scoped_lock lock(command_lock_);
  const bool aborted = std::exchange(abort_, false);
  if (aborted) cancel_left_over_ = true;
  return aborted;
}

bool CAbstractProtocol::IsAborted() {
  const std::scoped_lock lock(command_lock_);
  return abort_;
}

void CAbstractProtocol::UseUpCancel() {
  const std::scoped_lock lock(command_lock_);
  // The cancel of a new abort is not for us.
  if (std::exchange(cancel_left_over_, false) && !abort_) DropCancel();
}

void CAbstractProtocol::DropCancel() {
  const std::scoped_lock lock(command_lock_);
  // A read that finds nothing and does not wait takes the signal if it is still there. The bytes
  // ahead of it belonged to what was aborted; a receiver that talks on and on is left alone.
  constexpr int kMaxReads = 64;
  std::array<BYTE, 512> stray{};
  for (int i = 0; i < kMaxReads; ++i) {
    DWORD bytes_read = 0;
    const HRESULT result = connection()->Read(stray.data(), stray.size(), &bytes_read, 0);
    if (result != S_OK || bytes_read == 0) return;
  }
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

void CAbstractProtocol::AppendEntries(const std::vector<FileEntry>& entries, CFileList& files) {
  constexpr DWORD kListRead = 90;
  constexpr DWORD kListCopying = 10;
  ReportProgress(kListRead);
  const auto count = static_cast<DWORD>(entries.size());
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

std::wstring NameOf(CIConnection* connection) {
  BSTR name = nullptr;
  if (FAILED(connection->GetName(&name))) return {};
  const UniqueBstr owner(name);
  return owner ? owner.get() : L"";
}

std::string NarrowNameOf(CIConnection* connection) { return ToNarrow(NameOf(connection)); }
