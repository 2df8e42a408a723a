#include "velmar/velmar_protocol.h"

#include <mutex>
#include <string>
#include <utility>

#include "platform/clock.h"
#include "platform/event.h"
#include "platform/hresult.h"
#include "platform/text.h"
#include "report/report_file.h"
#include "transport/wait_scope.h"

using rcvlink::CatchResult;
using rcvlink::CopyBstr;
using rcvlink::CurrentClock;
using rcvlink::HResultError;
using rcvlink::IsReportOpen;
using rcvlink::IsSignalled;
using rcvlink::kNotConnected;
using rcvlink::MutexGuard;
using rcvlink::NarrowNameOf;
using rcvlink::ThrowIfFailed;
using rcvlink::ToNarrow;
using rcvlink::Trace;
using rcvlink::UniqueBstr;
using rcvlink::WaitScope;

using VelmarCommands::CDeleteFileCmd;
using VelmarCommands::CGetFileListCmd;
using VelmarCommands::CGetReceiverInfoCmd;
using VelmarCommands::CLogConfigCommand;
using VelmarCommands::CRenameFileCmd;
using VelmarCommands::CSetInterfacemodeCommand;
using VelmarCommands::CSetPortParamsCmd;
using VelmarCommands::CUnlogAllCommand;
using VelmarCommands::CVelmarCommand;
using VelmarCommands::PortConfigLog;
using VelmarCommands::RESPONSE_DATA;
using VelmarCommands::RESPONSE_OK;

namespace {

// What CReceiverInfo has for this family (rcvlink.h).
constexpr DWORD kFeatures = 13;
constexpr DWORD kVariant = 2;

// Writes the kept reply of a command that failed to the report.
void DumpInvalidResponse(HRESULT result, CIConnection* connection, const CVelmarCommand& command) {
  if (SUCCEEDED(result)) return;
  const uint8_t* const reply = command.GetReply();
  if (!reply && command.GetReplyLength() != 0) throw HResultError(E_INVALIDARG);
  if (!IsReportOpen()) return;
  const std::string name = connection ? NarrowNameOf(connection) : std::string();
  const std::string text(reply, reply + command.GetReplyLength());
  Trace("CVelmarProtocol::DumpInvalidResponse - [0x%08X] [%s] [%s]\r\n",
        result,
        text.c_str(),
        name.c_str());
}

}  // namespace

CVelmarProtocol::CVelmarProtocol(std::unique_ptr<CIConnection> connection)
    : CAbstractProtocol(L"CVelmarProtocol", std::move(connection)) {}

HRESULT CVelmarProtocol::ExecuteCommand(CVelmarCommand& command) {
  AwaitLateAnswer();
  return Conclude(ExecuteAsCurrent(command), command);
}

// An abort marks the current command, and a marked command is not sent. So this one is not made the
// current one.
HRESULT CVelmarProtocol::ExecuteForCertain(CVelmarCommand& command) {
  AwaitLateAnswer();
  return Conclude(command.Execute(connection(), nullptr), command);
}

HRESULT CVelmarProtocol::Conclude(HRESULT result, const CVelmarCommand& command) {
  if (result == S_FALSE) NoteCutOff();
  DumpInvalidResponse(result, connection(), command);
  return result;
}

void CVelmarProtocol::NoteCutOff() { cut_off_at_ = CurrentClock().Ticks(); }

void CVelmarProtocol::AwaitLateAnswer() {
  constexpr DWORD kLatestAnswerMs = 500;
  if (!cut_off_at_) return;
  const DWORD passed = CurrentClock().Ticks() - *std::exchange(cut_off_at_, std::nullopt);
  if (passed < kLatestAnswerMs) CurrentClock().Pause(kLatestAnswerMs - passed);
}

bool CVelmarProtocol::IsAnswering(HANDLE abort_event) {
  AwaitLateAnswer();
  const bool is_answering = Probe(connection(), abort_event);
  if (!is_answering) NoteCutOff();
  return is_answering;
}

bool CVelmarProtocol::Probe(CIConnection* connection, HANDLE abort_event) {
  if (!connection) return false;
  const WaitScope watching = WaitScope::Watching(connection, abort_event);
  const auto run = [&](CVelmarCommand& command) {
    const HRESULT result = command.Execute(connection, abort_event);
    DumpInvalidResponse(result, connection, command);
    return result == S_OK;
  };
  const HRESULT result = CatchResult([&] {
    CSetInterfacemodeCommand interface_mode;
    if (!run(interface_mode) || IsSignalled(abort_event)) return S_FALSE;
    CUnlogAllCommand unlog_all;
    if (!run(unlog_all)) return S_FALSE;
    return unlog_all.Response() == RESPONSE_OK ? S_OK : S_FALSE;
  });
  return result == S_OK;
}

HRESULT CVelmarProtocol::GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) {
  Trace(L"CVelmarProtocol::GetReceiverInfo\r\n");
  if (!info) return E_INVALIDARG;
  if (!connection()) return kNotConnected;
  info->bstrModel = nullptr;
  info->bstrReceiverId = nullptr;
  const HRESULT result = CatchResult([&] {
    ReadIdentity(abort_event, info);
    return S_OK;
  });
  // Also when the lock was not taken, so that the report has this line for every call. Windows
  // refuses to release a mutex that the thread does not hold.
  UnlockConnection();
  if (result != S_OK) return result;
  ReportProgress(100);
  Trace(L"CVelmarProtocol::GetReceiverInfo - OK\r\n");
  return S_OK;
}

void CVelmarProtocol::ReadIdentity(HANDLE abort_event, CReceiverInfo* info) {
  const HRESULT lock_result = LockConnection(abort_event);
  if (lock_result != S_OK) throw HResultError(lock_result);
  ReportProgress(0);
  CGetReceiverInfoCmd get_info;
  ThrowIfFailed(ExecuteCommand(get_info));
  ThrowIfAborted();
  if (get_info.Response() != RESPONSE_DATA) throw HResultError(S_FALSE);
  UniqueBstr model = CopyBstr(get_info.Version().model.c_str());
  UniqueBstr id = CopyBstr(get_info.Version().serial_number.c_str());
  info->bstrModel = model.release();
  info->bstrReceiverId = id.release();
  info->dwFeatures = kFeatures;
  info->dwProtocol = eProtocolVelmar;
  info->dwVariant = kVariant;
}

HRESULT CVelmarProtocol::GetFiles(CFileList* files) {
  if (!files) return E_INVALIDARG;
  if (!connection()) return kNotConnected;
  return CatchResult([&] {
    const MutexGuard guard(connection_lock_);
    ReportProgress(0);
    CGetFileListCmd get_list;
    ThrowIfFailed(ExecuteCommand(get_list));
    ThrowIfAborted();
    AppendEntries(get_list.Entries(), *files);
    return S_OK;
  });
}

template <typename MakeCommand>
HRESULT CVelmarProtocol::ChangeFile(MakeCommand make_command) {
  if (!connection()) return kNotConnected;
  return CatchResult([&] {
    const MutexGuard guard(connection_lock_);
    ReportProgress(0);
    auto command = make_command();
    ThrowIfFailed(ExecuteCommand(command));
    ThrowIfAborted();
    // A refusal is an answer as well, and only the exchange counts: hosts read the directory again.
    ReportProgress(100);
    return S_OK;
  });
}

HRESULT CVelmarProtocol::DeleteFile(const wchar_t* name) {
  if (!name) return E_INVALIDARG;
  return ChangeFile([&] { return CDeleteFileCmd(ToNarrow(name).c_str()); });
}

HRESULT CVelmarProtocol::RenameFile(const wchar_t* old_name, const wchar_t* new_name) {
  if (!old_name || !new_name) return E_INVALIDARG;
  return ChangeFile(
      [&] { return CRenameFileCmd(ToNarrow(old_name).c_str(), ToNarrow(new_name).c_str()); });
}

template <typename Change>
HRESULT CVelmarProtocol::ChangePort(Change change) {
  if (!connection()) return kNotConnected;
  return CatchResult([&] {
    const MutexGuard guard(connection_lock_);
    CLogConfigCommand get_config;
    ThrowIfFailed(ExecuteCommand(get_config));
    ThrowIfAborted();
    PortConfigLog settings = get_config.Config();
    if (settings.port_name.empty()) return S_OK;
    change(settings);
    CSetPortParamsCmd set_port(settings);
    ThrowIfFailed(ExecuteCommand(set_port));
    return S_OK;
  });
}

HRESULT CVelmarProtocol::DCSetRcvBaudrate(DWORD baud_rate) {
  return ChangePort([&](PortConfigLog& settings) { settings.baud = static_cast<int>(baud_rate); });
}

HRESULT CVelmarProtocol::DCSetRcvParity(BYTE parity) {
  return ChangePort([&](PortConfigLog& settings) { settings.parity = parity; });
}

HRESULT CVelmarProtocol::DCSetRcvStopbits(BYTE stop_bits) {
  return ChangePort([&](PortConfigLog& settings) { settings.stop_bits = stop_bits; });
}
