// The download of CVelmarProtocol: the link is raised to full speed, the file made current on the
// receiver, its size asked for, and its log taken chunk by chunk.
#include <algorithm>
#include <cstdint>
#include <memory>
#include <span>
#include <string_view>

#include "platform/hresult.h"
#include "platform/text.h"
#include "report/report_file.h"
#include "transport/abort_shield.h"
#include "velmar/velmar_protocol.h"

#include <objidl.h>

using namespace VelmarCommands;

namespace {

constexpr DWORD kTransferSpeed = 115200;

struct StreamDeleter {
  void operator()(IStream* stream) const { stream->Release(); }
};
// A counted reference to the host's stream.
using StreamReference = std::unique_ptr<IStream, StreamDeleter>;

StreamReference AddReference(IStream* stream) {
  stream->AddRef();
  return StreamReference(stream);
}

// In 32-bit arithmetic, as hosts have always seen it: it wraps for files beyond 42949672 bytes. A
// file that was said to be empty is complete with whatever comes of it.
uint8_t Percent(uint32_t total, uint32_t remaining) {
  constexpr uint32_t kComplete = 100;
  if (total == 0) return kComplete;
  return static_cast<uint8_t>((total - remaining) * kComplete / total);
}

// Whether the receiver refused, with an error text or without: the response type tells only the
// second. A reply that came in pieces is kept with its beginning repeated, and stands whole at its
// end.
bool IsRefusal(const CVelmarCommand& command) {
  constexpr std::string_view kRefusal = "\r\n<ERROR:";
  const uint8_t* const reply = command.GetReply();
  if (!reply) return false;
  return !std::ranges::search(std::span(reply, command.GetReplyLength()), kRefusal).empty();
}

}  // namespace

struct CVelmarProtocol::TransferContext {
  CVelmarProtocol* driver;
  const CReadFileCmd* read_command;
  StreamReference stream;
  uint32_t total;
  uint32_t remaining;
  uint8_t last_percent;
};

HRESULT CVelmarProtocol::DownloadFile(const wchar_t* name, IStream* stream, CProgressCallback*) {
  if (!name || !stream) return E_INVALIDARG;
  return CatchResult([&] {
    const MutexGuard guard(connection_lock_);
    Trace(L"CVelmarProtocol::DownloadFile - connection is locked [0x%p]\r\n",
          connection_lock_.handle());
    ReportProgress(0);
    const HRESULT result = CatchResult([&] { return DownloadLocked(name, stream); });
    // An abort of this download ends no wait of the next operation; its flag stays for it.
    if (IsAborted()) DropCancel();
    return result;
  });
}

HRESULT CVelmarProtocol::DownloadLocked(const wchar_t* name, IStream* stream) {
  EInstanceType link = eInstanceAny;
  ThrowIfFailed(connection()->GetInstanceType(&link));
  const DWORD saved_speed = link == eInstanceSerial ? RaiseSpeed() : 0;
  bool is_sending = false;
  const HRESULT result = CatchResult([&] { return Transfer(name, stream, &is_sending); });
  if (saved_speed == 0 || saved_speed >= kTransferSpeed) return result;
  // What the put-back gives replaces what the transfer gave.
  return RestoreSpeed(saved_speed, result == S_OK && !is_sending);
}

// Raises the receiver, then the host. Gives the speed to go back to, 0 when nothing was raised: the
// transfer then runs at the old speed. An abort ahead of the change raises S_FALSE.
DWORD CVelmarProtocol::RaiseSpeed() {
  DWORD speed = 0;
  ThrowIfFailed(connection()->GetSpeed(&speed));
  if (static_cast<int32_t>(speed) >= static_cast<int32_t>(kTransferSpeed)) return 0;

  bool changed = false;
  const HRESULT raised = ChangeReceiverSpeed(kTransferSpeed, OnAbort::kEnd, &changed);
  if (raised == S_FALSE) throw HResultError(S_FALSE);
  // A receiver that refused, or did not say on which port it is, was not raised: raising the host
  // would cut the link.
  if (!changed) {
    const HRESULT failure = FAILED(raised) ? raised : S_FALSE;
    Trace(L"CVelmarProtocol::DownloadFile - receiver speed up is failed [0x%08X]\r\n", failure);
    return 0;
  }
  const HRESULT followed = connection()->SetSpeed(kTransferSpeed);
  if (FAILED(followed)) {
    Trace(L"CVelmarProtocol::DownloadFile - host speed up is failed [0x%08X]\r\n", followed);
    ChangeReceiverSpeed(speed, OnAbort::kKeep, &changed);
    return 0;
  }
  return speed;
}

HRESULT CVelmarProtocol::RestoreSpeed(DWORD saved_speed, bool transfer_ended) {
  if (!transfer_ended) {
    // A receiver that still sends the file would answer the put-back behind it.
    CUnlogAllCommand stop_sending;
    ExecuteUndisturbed(stop_sending);
  }
  bool changed = false;
  const HRESULT result = ChangeReceiverSpeed(saved_speed, OnAbort::kKeep, &changed);
  return FAILED(result) ? result : connection()->SetSpeed(saved_speed);
}

HRESULT CVelmarProtocol::ChangeReceiverSpeed(DWORD speed, OnAbort on_abort, bool* changed) {
  *changed = false;
  return CatchResult([&] {
    CLogConfigCommand get_config;
    const HRESULT asked =
        on_abort == OnAbort::kEnd ? ExecuteCommand(get_config) : ExecuteUndisturbed(get_config);
    PortConfigLog settings = get_config.Config();
    if (asked != S_OK || settings.port_name.empty()) return asked;
    settings.baud = static_cast<int>(speed);
    CSetPortParamsCmd set_port(settings);
    const HRESULT result = ExecuteUndisturbed(set_port);
    *changed = result == S_OK && !IsRefusal(set_port);
    return result;
  });
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
      const auto total = static_cast<uint32_t>(get_header.FileHeader().file_size);
      TransferContext context{.driver = this,
                              .read_command = nullptr,
                              .stream = AddReference(stream),
                              .total = total,
                              .remaining = total,
                              .last_percent = 0};
      CReadFileCmd read_file(this, &context);
      context.read_command = &read_file;
      *is_sending = true;
      result = ExecuteCommand(read_file);
      ThrowIfFailed(result);
      *is_sending = read_file.Response() != RESPONSE_DATA;
    }
  }
  // Also for a file that the receiver does not know: the stream stays empty, and that is no
  // failure.
  ReportProgress(100);
  return result;
}

HRESULT CVelmarProtocol::OnDataReceived(void* context) {
  if (!context) return E_INVALIDARG;
  auto& transfer = *static_cast<TransferContext*>(context);
  const CReadFileCmd& command = *transfer.read_command;
  ULONG written = 0;
  const HRESULT result = transfer.stream->Write(command.GetData(), command.GetDataSize(), &written);
  if (FAILED(result)) return result;
  transfer.remaining -= command.GetDataSize();
  const uint8_t percent = Percent(transfer.total, transfer.remaining);
  if (percent == transfer.last_percent) return S_OK;
  transfer.last_percent = percent;
  ReportProgress(percent);
  return S_OK;
}
