#include "quorin/quorin_protocol.h"

#include <string>
#include <utility>

#include "platform/event.h"
#include "platform/hresult.h"
#include "platform/text.h"
#include "quorin/commands.h"
#include "quorin/protocol_flags.h"
#include "quorin/settings.h"
#include "report/report_file.h"
#include "transport/wait_scope.h"

using rcvlink::CatchResult;
using rcvlink::CopyBstr;
using rcvlink::HResultError;
using rcvlink::IsReportOpen;
using rcvlink::IsSignalled;
using rcvlink::kCommandFlags;
using rcvlink::kNotConnected;
using rcvlink::MutexGuard;
using rcvlink::NameOf;
using rcvlink::NarrowNameOf;
using rcvlink::ReadDownloadReadTimeout;
using rcvlink::ThrowIfFailed;
using rcvlink::ToNarrow;
using rcvlink::Trace;
using rcvlink::UniqueBstr;
using rcvlink::WaitScope;

using QuorinCommands::CChangeBaudRateCmd;
using QuorinCommands::CChangeParityCmd;
using QuorinCommands::CChangeRTSSignalCmd;
using QuorinCommands::CChangeStopbitsCmd;
using QuorinCommands::CDeleteFileCmd;
using QuorinCommands::CDisableEchoCmd;
using QuorinCommands::CEchoOffCmd;
using QuorinCommands::CGetFileListCmd;
using QuorinCommands::CGetPortCmd;
using QuorinCommands::CGetReceiverIDCmd;
using QuorinCommands::CGetReceiverModelCmd;
using QuorinCommands::CPingCmd;
using QuorinCommands::CQuorinCommand;
using QuorinCommands::kNoReply;
using QuorinCommands::ReplyKind;

namespace {

// What CReceiverInfo has for this family (rcvlink.h).
constexpr DWORD kFeatures = 9;
constexpr DWORD kVariantUsual = 1;
constexpr DWORD kVariantOfNewModels = 2;

// Writes the reply of a command that failed to the report.
void DumpInvalidResponse(CIConnection* connection, const CQuorinCommand& command) {
  const HRESULT result = command.Result();
  if (SUCCEEDED(result) || !IsReportOpen()) return;
  const std::string name = NarrowNameOf(connection);
  const uint8_t* const reply = command.GetReply();
  if (reply && command.GetReplyLength() != 0) {
    const std::string text(reply, reply + command.GetReplyLength());
    Trace("CQuorinProtocol::DumpInvalidResponse - [0x%08X] [%s] [%s]\r\n",
          result,
          text.c_str(),
          name.c_str());
  } else {
    Trace("CQuorinProtocol::DumpInvalidResponse - [0x%08X] [%s]\r\n", result, name.c_str());
  }
}

DWORD VariantOf(const std::wstring& model) {
  return model.starts_with(L"HVA3") || model.starts_with(L"HVB5") ? kVariantOfNewModels
                                                                  : kVariantUsual;
}

}  // namespace

CQuorinProtocol::CQuorinProtocol(std::unique_ptr<CIConnection> connection)
    : CAbstractProtocol(L"CQuorinProtocol", std::move(connection)),
      download_read_timeout_ms_(ReadDownloadReadTimeout()) {}

HRESULT CQuorinProtocol::ExecuteCommand(CQuorinCommand& command) {
  // The receiver would take half a line, or a tag alone, as the beginning of the next command.
  command.SendWhole();
  const HRESULT result = ExecuteAsCurrent(command);
  if (connection()) DumpInvalidResponse(connection(), command);
  return FAILED(result) ? result : command.Result();
}

bool CQuorinProtocol::Probe(CIConnection* connection, HANDLE abort_event) {
  const WaitScope watching = WaitScope::Watching(connection, abort_event);
  // False: the command failed or was cancelled, and no receiver is found.
  const auto run = [&](CQuorinCommand& command) {
    const HRESULT result = command.Execute(connection, abort_event);
    DumpInvalidResponse(connection, command);
    return result == S_OK;
  };
  const auto aborted = [&] { return IsSignalled(abort_event); };

  // The receiver may hold half a line, echo what it gets, and send messages without being asked.
  // All three are ended first, since they would stand before the answer to the ping.
  CQuorinCommand line_end("\n", kNoReply);
  if (!run(line_end)) return false;
  CEchoOffCmd echo_off(kCommandFlags);
  if (!run(echo_off) || aborted()) return false;
  CQuorinCommand stop_output("dm\r\n", kNoReply);
  if (!run(stop_output) || aborted()) return false;

  CPingCmd ping(kCommandFlags);
  if (!run(ping) || aborted()) return false;
  if (ping.Result() != S_OK) {
    Trace(L"CQuorinProtocol::CheckConnection - ping cmd failed [0x%08X] [%s]\r\n",
          ping.Result(),
          NameOf(connection).c_str());
    return false;
  }

  CGetPortCmd get_port(kCommandFlags);
  if (!run(get_port) || aborted() || get_port.PortIndex() < 0) return false;
  CDisableEchoCmd disable_echo(get_port.PortIndex(), kCommandFlags);
  return run(disable_echo);
}

HRESULT CQuorinProtocol::GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) {
  Trace(L"CQuorinProtocol::GetReceiverInfo\r\n");
  if (!info) return E_INVALIDARG;
  if (!connection()) return kNotConnected;
  info->bstrReceiverId = nullptr;
  info->bstrModel = nullptr;
  return CatchResult([&] {
    const HRESULT lock_result = LockConnection(abort_event);
    if (lock_result != S_OK) return lock_result;
    // A failure from here on leaves the connection locked. Hosts call UnlockConnection after it; if
    // it were released here too, a host that holds the lock itself would lose it by that call.
    ReadIdentity(info);
    Trace(L"CQuorinProtocol::GetReceiverInfo - OK\r\n");
    return S_OK;
  });
}

void CQuorinProtocol::ReadIdentity(CReceiverInfo* info) {
  const auto ask = [&](auto& command) {
    ThrowIfFailed(ExecuteCommand(command));
    ThrowIfAborted();
    if (command.Kind() != ReplyKind::kReply) throw HResultError(S_FALSE);
    return command.Text();
  };
  ReportProgress(0);
  CGetReceiverIDCmd get_id(kCommandFlags);
  UniqueBstr id = CopyBstr(ask(get_id).c_str());
  ReportProgress(50);
  CGetReceiverModelCmd get_model(kCommandFlags);
  const std::wstring model_text = ask(get_model);
  UniqueBstr model = CopyBstr(model_text.c_str());
  UnlockConnection();
  ReportProgress(100);

  info->dwFeatures = kFeatures;
  info->dwProtocol = eProtocolQuorin;
  info->dwVariant = VariantOf(model_text);
  info->bstrReceiverId = id.release();
  info->bstrModel = model.release();
}

HRESULT CQuorinProtocol::GetFiles(CFileList* files) {
  if (!files) return E_INVALIDARG;
  if (!connection()) return kNotConnected;
  return CatchResult([&] {
    CGetFileListCmd get_list(kCommandFlags);
    ReportProgress(0);
    {
      const MutexGuard guard(connection_lock_);
      Trace(L"CQuorinProtocol::GetFiles - connection is locked [0x%p]\r\n",
            connection_lock_.handle());
      ThrowIfAborted();
      ThrowIfFailed(ExecuteCommand(get_list));
      ThrowIfFailed(get_list.Result());
    }
    Trace(L"CQuorinProtocol::GetFiles - connection is unlocked [0x%p]\r\n",
          connection_lock_.handle());
    ThrowIfAborted();

    AppendEntries(get_list.Entries(), *files);
    Trace(L"CQuorinProtocol::GetFiles - OK\r\n");
    return S_OK;
  });
}

HRESULT CQuorinProtocol::DeleteFile(const wchar_t* name) {
  if (!name) return E_INVALIDARG;
  if (!connection()) return kNotConnected;
  return CatchResult([&] {
    const MutexGuard guard(connection_lock_);
    Trace(L"CQuorinProtocol::DeleteFile - connection is locked [0x%p]\r\n",
          connection_lock_.handle());
    ThrowIfAborted();
    ReportProgress(0);
    CDeleteFileCmd remove(ToNarrow(name), kCommandFlags);
    ThrowIfFailed(ExecuteCommand(remove));
    ThrowIfAborted();
    ReportProgress(100);
    Trace(L"CQuorinProtocol::DeleteFile - OK\r\n");
    return S_OK;
  });
}

// Called once, when the receiver object is constructed and no operation runs: it needs no lock.
void CQuorinProtocol::SetCallback(CIProtocolCallback* callback) { callback_ = callback; }

template <typename MakeCommand>
HRESULT CQuorinProtocol::ChangePort(MakeCommand make_command) {
  CGetPortCmd get_port(kCommandFlags);
  if (const HRESULT result = ExecuteCommand(get_port); FAILED(result)) return result;
  ThrowIfAborted();
  const int port_index = get_port.PortIndex();
  return port_index < 0 ? S_FALSE : SendPortSetting(make_command(port_index));
}

HRESULT CQuorinProtocol::SendPortSetting(CQuorinCommand&& command) {
  const HRESULT result = ExecuteCommand(command);
  return FAILED(result) ? result : S_OK;
}

HRESULT CQuorinProtocol::ChangeSpeed(DWORD speed) {
  return ChangePort([&](int port) { return CChangeBaudRateCmd(port, speed, kCommandFlags); });
}

HRESULT CQuorinProtocol::DCSetRcvBaudrate(DWORD baud_rate) {
  return CatchResult([&] { return ChangeSpeed(baud_rate); });
}

HRESULT CQuorinProtocol::DCSetRcvRTSControl(BYTE rts) {
  return CatchResult([&] {
    return ChangePort([&](int port) { return CChangeRTSSignalCmd(port, rts != 0, kCommandFlags); });
  });
}

HRESULT CQuorinProtocol::DCSetRcvParity(BYTE parity) {
  return CatchResult([&] {
    return ChangePort([&](int port) { return CChangeParityCmd(port, parity, kCommandFlags); });
  });
}

HRESULT CQuorinProtocol::DCSetRcvStopbits(BYTE stop_bits) {
  return CatchResult([&] {
    return ChangePort(
        [&](int port) { return CChangeStopbitsCmd(port, stop_bits != 0, kCommandFlags); });
  });
}
