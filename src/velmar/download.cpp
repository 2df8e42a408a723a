// The download of CVelmarProtocol: raises the speed of a serial link, makes the file current on the
// receiver, asks for its size, runs the transfer (file_download.h), and sets the old speed again.
#include <algorithm>
#include <cstdint>

#include "platform/hresult.h"
#include "platform/text.h"
#include "report/report_file.h"
#include "velmar/file_download.h"
#include "velmar/velmar_protocol.h"

using rcvlink::CatchResult;
using rcvlink::FileDownload;
using rcvlink::HResultError;
using rcvlink::MutexGuard;
using rcvlink::ThrowIfFailed;
using rcvlink::ToNarrow;
using rcvlink::Trace;

using VelmarCommands::CGetFileHeaderCmd;
using VelmarCommands::CLogConfigCommand;
using VelmarCommands::CSetCurrentFileCmd;
using VelmarCommands::CSetPortParamsCmd;
using VelmarCommands::CUnlogAllCommand;
using VelmarCommands::CVelmarCommand;
using VelmarCommands::kRefusal;
using VelmarCommands::kSendOnly;
using VelmarCommands::PortConfigLog;
using VelmarCommands::RESPONSE_DATA;
using VelmarCommands::RESPONSE_OK;

namespace {

// Whether the receiver refused, with an error text or without; the response type is RESPONSE_ERROR
// only without one. A reply that came in pieces is kept with its beginning repeated, and its last
// part is the whole reply, so the refusal is searched for everywhere.
bool IsRefusal(const CVelmarCommand& command) {
  const uint8_t* const reply = command.GetReply();
  if (!reply) return false;
  const uint8_t* const end = reply + command.GetReplyLength();
  return std::search(reply, end, kRefusal.begin(), kRefusal.end()) != end;
}

}  // namespace

HRESULT CVelmarProtocol::DownloadFile(const wchar_t* name, IStream* stream, CProgressCallback*) {
  if (!name || !stream) return E_INVALIDARG;
  return CatchResult([&] {
    const MutexGuard guard(connection_lock_);
    Trace(L"CVelmarProtocol::DownloadFile - connection is locked [0x%p]\r\n",
          connection_lock_.handle());
    ReportProgress(0);
    const HRESULT result = CatchResult([&] { return DownloadLocked(name, stream); });
    // The download has ended, so the abort ends no wait after it. Its flag stays: the abort may be
    // meant for an operation of another thread that waits for the lock.
    abort_.ClearCancel();
    return result;
  });
}

HRESULT CVelmarProtocol::DownloadLocked(const wchar_t* name, IStream* stream) {
  EInstanceType link = eInstanceAny;
  ThrowIfFailed(connection()->GetInstanceType(&link));
  DWORD saved_speed = 0;
  if (link == eInstanceSerial) {
    DWORD speed = 0;
    ThrowIfFailed(connection()->GetSpeed(&speed));
    const bool is_slow = static_cast<int32_t>(speed) < static_cast<int32_t>(kTransferSpeed);
    if (is_slow && RaiseSpeed(speed)) saved_speed = speed;
  }
  bool is_sending = false;
  const HRESULT result = CatchResult([&] { return Transfer(name, stream, &is_sending); });

  // The abort that ended the transfer does not end the waits of the steps that follow, which stop
  // the receiver and set its old speed. A further abort ends them; the commands are sent all the
  // same, or the link would stay cut.
  abort_.ClearCancel();
  bool is_aborted = false;
  if (is_sending) {
    CUnlogAllCommand stop_sending;
    is_aborted = ExecuteForCertain(stop_sending) == S_FALSE;
  }
  if (saved_speed == 0 || saved_speed >= kTransferSpeed) return result;
  // The result is that of setting the old speed, not that of the transfer: a link that is cut
  // matters more to what the host does next, and the host can compare the byte count with the size
  // listed.
  return RestoreSpeed(saved_speed, is_aborted);
}

HRESULT CVelmarProtocol::Transfer(const wchar_t* name, IStream* stream, bool* is_sending) {
  CSetCurrentFileCmd set_current(ToNarrow(name).c_str());
  HRESULT result = ExecuteCommand(set_current);
  ThrowIfFailed(result);
  if (set_current.Response() == RESPONSE_OK) {
    CGetFileHeaderCmd get_header;
    result = ExecuteCommand(get_header);
    ThrowIfFailed(result);
    if (get_header.Response() == RESPONSE_DATA) {
      const auto size = static_cast<uint32_t>(get_header.FileHeader().file_size);
      const auto tell = [this](uint8_t percent) { ReportProgress(percent); };
      FileDownload download(*this, tell, stream, size);
      result = download.Run();
      *is_sending = download.IsSending();
      ThrowIfFailed(result);
    }
  }
  // Also for a file that the receiver refused: it has answered, which is what the result says. The
  // stream is empty then.
  ReportProgress(100);
  return result;
}

HRESULT CVelmarProtocol::OnDataReceived(void* context) {
  return context ? static_cast<FileDownload*>(context)->TakeChunk() : E_INVALIDARG;
}

HRESULT CVelmarProtocol::RaiseReceiver(DWORD speed) {
  CLogConfigCommand get_config;
  const HRESULT question_result = ExecuteCommand(get_config);
  if (question_result == S_FALSE) throw HResultError(S_FALSE);
  if (FAILED(question_result)) return question_result;
  raised_port_ = get_config.Config();
  // A receiver that does not name its port cannot be raised, and raising the host alone would cut
  // the link.
  if (raised_port_.port_name.empty()) return S_FALSE;
  PortConfigLog settings = raised_port_;
  settings.baud = static_cast<int>(speed);
  CSetPortParamsCmd set_port(settings);
  const HRESULT result = ExecuteForCertain(set_port);
  if (result == S_FALSE) {
    // It may have changed its speed already, or may do so now. So it is sent the old speed, at the
    // new one.
    DWORD old_speed = 0;
    ThrowIfFailed(connection()->GetSpeed(&old_speed));
    ThrowIfFailed(connection()->SetSpeed(speed));
    ThrowIfFailed(RestoreSpeed(old_speed, /*is_aborted=*/true));
    throw HResultError(S_FALSE);
  }
  return result == S_OK && IsRefusal(set_port) ? S_FALSE : result;
}

void CVelmarProtocol::SetReceiverBack(DWORD speed) {
  abort_.ClearCancel();
  TellSpeed(speed, /*is_aborted=*/false);
}

HRESULT CVelmarProtocol::RestoreSpeed(DWORD speed, bool is_aborted) {
  const HRESULT result = TellSpeed(speed, is_aborted);
  return FAILED(result) ? result : connection()->SetSpeed(speed);
}

// Sends the receiver its port's settings with this speed. After an abort it is not asked for them
// (those from before are sent), and its answer is not waited for: the host wants no more waits.
HRESULT CVelmarProtocol::TellSpeed(DWORD speed, bool is_aborted) {
  PortConfigLog settings = raised_port_;
  if (!is_aborted) {
    CLogConfigCommand get_config;
    const HRESULT result = ExecuteCommand(get_config);
    if (FAILED(result)) return result;
    is_aborted = result == S_FALSE;
    if (!is_aborted) settings = get_config.Config();
  }
  if (settings.port_name.empty()) return S_OK;
  settings.baud = static_cast<int>(speed);
  CSetPortParamsCmd set_port(settings);
  if (is_aborted) set_port.SetFlags(kSendOnly);
  const HRESULT result = ExecuteForCertain(set_port);
  if (is_aborted || result == S_FALSE) {
    // The whole line must have been sent before the host changes its own speed. There is no answer
    // that shows it, so the flush waits for the output queue.
    connection()->Flush();
    NoteCutOff();
  }
  return result;
}
