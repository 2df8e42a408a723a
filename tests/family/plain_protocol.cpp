#include "tests/family/plain_protocol.h"

#include <sstream>
#include <utility>

#include "platform/hresult.h"
#include "platform/text.h"
#include "tests/family/plain_command.h"
#include "transport/wait_scope.h"

#include <objidl.h>

using rcvlink::CatchResult;
using rcvlink::CopyBstr;
using rcvlink::MutexGuard;
using rcvlink::ThrowIfFailed;
using rcvlink::ToNarrow;
using rcvlink::ToWide;
using rcvlink::UniqueBstr;
using rcvlink::WaitScope;

namespace {

// A number of EProtocol that no other family has.
constexpr DWORD kPlain = 3;

}  // namespace

CPlainProtocol::CPlainProtocol(std::unique_ptr<CIConnection> connection)
    : CAbstractProtocol(L"CPlainProtocol", std::move(connection)) {}

bool CPlainProtocol::Probe(CIConnection* connection, HANDLE abort_event) {
  const WaitScope watching = WaitScope::Watching(connection, abort_event);
  CPlainCommand who("who");
  return who.Execute(connection, abort_event) == S_OK && who.Answer() == "plain\n";
}

std::string CPlainProtocol::Ask(const std::string& line) {
  ThrowIfAborted();
  CPlainCommand command(line);
  command.SendWhole();
  ThrowIfFailed(ExecuteAsCurrent(command));
  ThrowIfAborted();
  return std::string(command.Answer());
}

HRESULT CPlainProtocol::GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) {
  if (!info) return E_INVALIDARG;
  const HRESULT lock_result = LockConnection(abort_event);
  if (lock_result != S_OK) return lock_result;
  const HRESULT result = CatchResult([&] {
    UniqueBstr id = CopyBstr(ToWide(Ask("id")).c_str());
    UniqueBstr model = CopyBstr(L"Plain");
    info->dwProtocol = kPlain;
    info->bstrReceiverId = id.release();
    info->bstrModel = model.release();
    return S_OK;
  });
  UnlockConnection();
  return result;
}

// A line for each file: its size, a space, its name.
HRESULT CPlainProtocol::GetFiles(CFileList* files) {
  if (!files) return E_INVALIDARG;
  return CatchResult([&] {
    const MutexGuard guard(connection_lock_);
    ReportProgress(0);
    std::istringstream lines(Ask("list"));
    FileEntries entries;
    for (std::string line; std::getline(lines, line);) {
      std::istringstream fields(line);
      FileEntry entry;
      std::string name;
      if (fields >> entry.size >> name) {
        entry.name = ToWide(name);
        entries.push_back(entry);
      }
    }
    AppendEntries(entries, *files);
    return S_OK;
  });
}

// Files are text, and come in one answer.
HRESULT CPlainProtocol::DownloadFile(const wchar_t* name, IStream* stream, CProgressCallback*) {
  if (!name || !stream) return E_INVALIDARG;
  return CatchResult([&] {
    const MutexGuard guard(connection_lock_);
    ReportProgress(0);
    const std::string content = Ask("get " + ToNarrow(name));
    ULONG written = 0;
    ThrowIfFailed(stream->Write(content.data(), static_cast<ULONG>(content.size()), &written));
    ReportProgress(100);
    return S_OK;
  });
}
