// The download of CVelmarProtocol: the link is raised to full speed, the file made current on the
// receiver, its size asked for, and its log taken chunk by chunk.
#include <algorithm>
#include <cstdint>
#include <memory>
#include <span>
#include <string_view>

#include "platform/clock.h"
#include "platform/hresult.h"
#include "platform/text.h"
#include "report/report_file.h"
#include "velmar/velmar_protocol.h"

#include <objidl.h>

using namespace VelmarCommands;

namespace {

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
    // An abort that came during the download ends no wait after it. Its flag stays for the next
    // operation that looks for it.
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

  // The abort that ended the transfer does not disturb what puts the link in order. One that comes
  // while that waits ends all its waits; what has to be sent is sent all the same.
  abort_.ClearCancel();
  bool is_aborted = false;
  if (is_sending) {
    CUnlogAllCommand stop_sending;
    is_aborted = ExecuteCommand(stop_sending) == S_FALSE;
  }
  if (saved_speed == 0 || saved_speed >= kTransferSpeed) return result;
  // What the put-back gives replaces what the transfer gave.
  return RestoreSpeed(saved_speed, is_aborted);
}

HRESULT CVelmarProtocol::RaiseReceiver(DWORD speed) {
  CLogConfigCommand get_config;
  const HRESULT question_result = ExecuteCommand(get_config);
  if (question_result == S_FALSE) throw HResultError(S_FALSE);
  if (FAILED(question_result)) return question_result;
  raised_port_ = get_config.Config();
  // A receiver that did not tell its port is not raised: raising the host alone would cut the link.
  if (raised_port_.port_name.empty()) return S_FALSE;
  PortConfigLog settings = raised_port_;
  settings.baud = static_cast<int>(speed);
  CSetPortParamsCmd set_port(settings);
  const HRESULT result = ExecuteUnstopped(set_port);
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

// Sends the receiver its port's settings with this speed. After an abort it is not asked what they
// are (they are those of before), and its answer is not waited for.
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
  const HRESULT result = ExecuteCommand(set_port);
  if (is_aborted || result == S_FALSE) {
    // The line must have left before the host changes its own speed; an answer would have shown that.
    connection()->Flush();
    cut_off_at_ = CurrentClock().Ticks();
  }
  return result;
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
      result = ExecuteCommand(read_file);
      // An aborted command went out whole, and the file comes although nothing has come yet.
      const bool has_begun = read_file.HasBegun() || result == S_FALSE;
      *is_sending = has_begun && read_file.Response() != RESPONSE_DATA;
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
