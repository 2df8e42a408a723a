// The download of CQuorinProtocol: raises the speed of a serial link, asks for the file's size and
// for the file, runs the block transfer (block_download.h), and sets the old speed again.
#include <cstdint>
#include <string>

#include "platform/hresult.h"
#include "platform/text.h"
#include "quorin/block_download.h"
#include "quorin/commands.h"
#include "quorin/link_policy.h"
#include "quorin/protocol_flags.h"
#include "quorin/quorin_protocol.h"
#include "report/report_file.h"

using rcvlink::BlockDownload;
using rcvlink::CatchResult;
using rcvlink::kBlockPayload;
using rcvlink::kCommandFlags;
using rcvlink::kEndOfTransfer;
using rcvlink::kNak;
using rcvlink::kNotConnected;
using rcvlink::LinkPolicy;
using rcvlink::MutexGuard;
using rcvlink::SerialPolicy;
using rcvlink::ThrowIfFailed;
using rcvlink::ToNarrow;
using rcvlink::Trace;
using rcvlink::UsbPolicy;
using rcvlink::WriteControl;

using QuorinCommands::CChangeBaudRateCmd;
using QuorinCommands::CGetFileCmd;
using QuorinCommands::CGetFileSizeCmd;
using QuorinCommands::CGetPortCmd;
using QuorinCommands::CQuorinCommand;
using QuorinCommands::CSetBoudRateCmd;

HRESULT CQuorinProtocol::DownloadFile(const wchar_t* name, IStream* stream, CProgressCallback*) {
  if (!name || !stream) return E_INVALIDARG;
  if (!connection()) return kNotConnected;
  if (abort_.Take()) return S_FALSE;
  return CatchResult([&] {
    const MutexGuard guard(connection_lock_);
    Trace(L"CQuorinProtocol::DownloadFile - connection is locked [0x%p]\r\n",
          connection_lock_.handle());
    ThrowIfAborted();
    ReportProgress(0);
    EInstanceType link = eInstanceAny;
    ThrowIfFailed(connection()->GetInstanceType(&link));

    DWORD saved_speed = 0;
    if (link == eInstanceSerial) {
      DWORD speed = 0;
      ThrowIfFailed(connection()->GetSpeed(&speed));
      if (speed < kTransferSpeed && RaiseSpeed(speed)) saved_speed = speed;
    }
    const HRESULT result = CatchResult([&] { return Transfer(name, stream, link); });
    if (FAILED(result)) {
      Trace(L"CQuorinProtocol::DownloadFile - download [%s] is failed [0x%08X]\r\n", name, result);
    }
    RestoreSpeed(saved_speed);
    return abort_.Take() ? S_FALSE : result;
  });
}

// An abort that comes while the receiver is asked for its port ends that command. The receiver is
// then asked once more: without its port it cannot be set back, and would stay at another speed
// than the host.
void CQuorinProtocol::SetReceiverBack(DWORD speed) {
  constexpr int kTries = 2;
  for (int i = 0; i < kTries; ++i) {
    abort_.ClearCancel();
    CGetPortCmd get_port(kCommandFlags);
    ExecuteCommand(get_port);
    const int port_index = get_port.PortIndex();
    if (port_index >= 0) SendPortSetting(CChangeBaudRateCmd(port_index, speed, kCommandFlags));
    const bool cut_off = port_index < 0 && get_port.IsCancelled(nullptr);
    if (!cut_off) return;
  }
}

void CQuorinProtocol::RestoreSpeed(DWORD saved_speed) {
  if (saved_speed == 0 || saved_speed >= kTransferSpeed) return;
  // The abort that ended the transfer does not end this wait: the receiver changes its speed after
  // its answer, and the host must not change its own before.
  abort_.ClearCancel();
  CSetBoudRateCmd set_speed(saved_speed, kCommandFlags);
  ThrowIfFailed(ExecuteCommand(set_speed));
  ThrowIfFailed(connection()->SetSpeed(saved_speed));
}

HRESULT CQuorinProtocol::Transfer(const wchar_t* name, IStream* stream, EInstanceType link) {
  ThrowIfAborted();
  CQuorinCommand line_end("\n", kCommandFlags);
  ThrowIfFailed(ExecuteCommand(line_end));
  ThrowIfAborted();

  const std::string narrow_name = ToNarrow(name);
  CGetFileSizeCmd get_size(narrow_name, kCommandFlags);
  ThrowIfFailed(ExecuteCommand(get_size));
  ThrowIfAborted();
  const int size = get_size.Size();
  if (size == 0) {
    Trace(L"CQuorinProtocol::DownloadFile - file [%s] size is zero\r\n", name);
    return E_FAIL;
  }
  Trace(L"CQuorinProtocol::DownloadFile - file size [%s] is %i bytes\r\n", name, size);

  CGetFileCmd get_file(narrow_name, kBlockPayload, kCommandFlags);
  ThrowIfFailed(ExecuteCommand(get_file));
  if (abort_.Take()) {
    // The receiver has executed the command and waits for a control byte.
    WriteControl(connection(), kEndOfTransfer);
    return S_FALSE;
  }
  ReportProgress(1);
  connection()->Flush();
  ThrowIfFailed(WriteControl(connection(), kNak));

  HRESULT result = E_UNEXPECTED;
  if (link == eInstanceSerial) result = DownloadOverSerial(stream, size);
  if (link == eInstanceUSB) result = DownloadOverUSB(stream, size, kBlockPayload);
  if (FAILED(result)) WriteControl(connection(), kEndOfTransfer);
  return result;
}

HRESULT CQuorinProtocol::DownloadOverSerial(IStream* stream, int size) {
  SerialPolicy policy(connection());
  return TakeBlocks(stream, size, policy);
}

HRESULT CQuorinProtocol::DownloadOverUSB(IStream* stream, int size, DWORD block_length) {
  if (block_length != kBlockPayload) return E_INVALIDARG;
  UsbPolicy policy(connection(), abort_, download_read_timeout_ms_);
  return TakeBlocks(stream, size, policy);
}

HRESULT CQuorinProtocol::TakeBlocks(IStream* stream, int size, LinkPolicy& policy) {
  const auto tell = [this](uint8_t percent) { ReportProgress(percent); };
  return BlockDownload(connection(), abort_, tell, stream, size, policy).Run();
}
