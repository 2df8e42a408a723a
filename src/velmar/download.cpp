// The download of CVelmarProtocol: the link is raised to full speed, the file made current on the
// receiver, its size asked for, and its log taken chunk by chunk.
#include <algorithm>
#include <cstdint>
#include <string>

#include "platform/hresult.h"
#include "platform/text.h"
#include "report/report_file.h"
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
    EInstanceType link = eInstanceAny;
    ThrowIfFailed(connection()->GetInstanceType(&link));
    const DWORD saved_speed = link == eInstanceSerial ? RaiseSpeed() : 0;
    const HRESULT result = CatchResult([&] { return Transfer(name, stream); });
    if (saved_speed == 0 || saved_speed >= kTransferSpeed) return result;
    // What the put-back gives replaces what the transfer gave.
    return RestoreSpeed(saved_speed, result == S_OK);
  });
}

// Raises the receiver, then the host. Gives the speed to go back to, 0 when nothing was raised: the
// transfer then runs at the old speed.
DWORD CVelmarProtocol::RaiseSpeed() {
  DWORD speed = 0;
  ThrowIfFailed(connection()->GetSpeed(&speed));
  if (static_cast<int32_t>(speed) >= static_cast<int32_t>(kTransferSpeed)) return 0;

  // A receiver that refused, or did not say on which port it is, was not raised, and the host must not
  // be either.
  bool sent = false;
  HRESULT raised = ChangeReceiverSpeed(kTransferSpeed, &sent);
  if (SUCCEEDED(raised) && !sent) raised = S_FALSE;
  if (raised != S_OK) {
    Trace(L"CVelmarProtocol::DownloadFile - receiver speed up is failed [0x%08X]\r\n", raised);
    return 0;
  }
  const HRESULT followed = connection()->SetSpeed(kTransferSpeed);
  if (FAILED(followed)) {
    Trace(L"CVelmarProtocol::DownloadFile - host speed up is failed [0x%08X]\r\n", followed);
    ChangeReceiverSpeed(speed, &sent);
    return 0;
  }
  return speed;
}

HRESULT CVelmarProtocol::RestoreSpeed(DWORD saved_speed, bool transfer_ended) {
  // An abort of the transfer must not cut off the put-back; its flag stays for the next operation.
  if (IsAborted()) DropCancel();
  if (!transfer_ended) {
    // A receiver that still sends the file would answer the put-back behind it.
    CUnlogAllCommand stop_sending;
    ExecuteCommand(stop_sending);
  }
  bool sent = false;
  const HRESULT result = ChangeReceiverSpeed(saved_speed, &sent);
  return FAILED(result) ? result : connection()->SetSpeed(saved_speed);
}

HRESULT CVelmarProtocol::Transfer(const wchar_t* name, IStream* stream) {
  CSetCurrentFileCmd set_current(ToNarrow(name).c_str());
  HRESULT result = ExecuteCommand(set_current);
  ThrowIfFailed(result);
  if (set_current.Response() == RESPONSE_OK) {
    CGetFileHeaderCmd get_header;
    result = ExecuteCommand(get_header);
    ThrowIfFailed(result);
    if (get_header.Response() == RESPONSE_DATA) {
      const auto total = static_cast<uint32_t>(get_header.FileHeader().file_size);
      TransferContext context{this, nullptr, AddReference(stream), total, total, 0};
      CReadFileCmd read_file(this, &context);
      context.read_command = &read_file;
      result = ExecuteCommand(read_file);
      ThrowIfFailed(result);
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
