// The download of CQuorinProtocol: the link is raised to full speed, the receiver is asked for the
// file, and its blocks are taken one by one (block.h).
#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include <objidl.h>

#include "platform/hresult.h"
#include "platform/text.h"
#include "quorin/block.h"
#include "quorin/commands.h"
#include "quorin/protocol_flags.h"
#include "quorin/quorin_protocol.h"
#include "report/report_file.h"
#include "transport/abort_shield.h"

using namespace QuorinCommands;

namespace {

constexpr DWORD kTransferSpeed = 115200;
constexpr DWORD kSerialReadTimeoutMs = 3000;
constexpr int kMaxTimeouts = 3;

// In 32-bit arithmetic, which wraps beyond 43383508 bytes, and cut to 8 bits.
uint8_t SerialPercent(uint32_t delivered, uint32_t size) {
  return static_cast<uint8_t>(delivered * 99 / size + 1);
}

HRESULT WriteToStream(IStream* stream, std::span<const uint8_t> bytes) {
  if (bytes.empty()) return S_OK;
  ULONG written = 0;
  return stream->Write(bytes.data(), static_cast<ULONG>(bytes.size()), &written);
}

}  // namespace

HRESULT CQuorinProtocol::DownloadFile(const wchar_t* name, IStream* stream, CProgressCallback*) {
  if (!name || !stream) return E_INVALIDARG;
  if (!connection()) return kNotConnected;
  if (TakeAbort()) return S_FALSE;
  return CatchResult([&] {
    const MutexGuard guard(connection_lock_);
    Trace(L"CQuorinProtocol::DownloadFile - connection is locked [0x%p]\r\n",
          connection_lock_.handle());
    ThrowIfAborted();
    ReportProgress(0);
    EInstanceType link = eInstanceAny;
    ThrowIfFailed(connection()->GetInstanceType(&link));

    const DWORD saved_speed = link == eInstanceSerial ? RaiseSpeed() : 0;
    const HRESULT result = CatchResult([&] { return Transfer(name, stream, link); });
    if (FAILED(result)) {
      Trace(L"CQuorinProtocol::DownloadFile - download [%s] is failed [0x%08X]\r\n", name, result);
    }
    RestoreSpeed(saved_speed);
    return TakeAbort() ? S_FALSE : result;
  });
}

// Raises the receiver, then the host. Gives the speed to go back to, 0 when nothing was raised: the
// transfer then runs at the old speed.
DWORD CQuorinProtocol::RaiseSpeed() {
  DWORD speed = 0;
  ThrowIfFailed(connection()->GetSpeed(&speed));
  if (speed >= kTransferSpeed) return 0;

  // A receiver that did not name its port (S_FALSE) was not raised either.
  const HRESULT raised = ChangeReceiverSpeed(kTransferSpeed);
  if (raised != S_OK) {
    Trace(L"CQuorinProtocol::DownloadFile - receiver speed up is failed [0x%08X]\r\n", raised);
    return 0;
  }
  const HRESULT followed = connection()->SetSpeed(kTransferSpeed);
  if (FAILED(followed)) {
    Trace(L"CQuorinProtocol::DownloadFile - host speed up is failed [0x%08X]\r\n", followed);
    // Once more when an abort cut the first try off.
    if (ChangeReceiverSpeed(speed, OnAbort::kKeep) != S_OK) {
      ChangeReceiverSpeed(speed, OnAbort::kKeep);
    }
    return 0;
  }
  return speed;
}

void CQuorinProtocol::RestoreSpeed(DWORD saved_speed) {
  if (saved_speed == 0 || saved_speed >= kTransferSpeed) return;
  CSetBoudRateCmd set_speed(saved_speed, kCommandFlags);
  set_speed.SendWhole();
  ThrowIfFailed(ExecuteCommand(set_speed));
  ThrowIfFailed(connection()->SetSpeed(saved_speed));
}

HRESULT CQuorinProtocol::Transfer(const wchar_t* name, IStream* stream, EInstanceType link) {
  ThrowIfAborted();
  CQuorinCommand line_end("\n", kCommandFlags);
  ThrowIfFailed(ExecuteCommand(line_end));

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
  get_file.SendWhole();
  ThrowIfFailed(ExecuteCommand(get_file));
  if (TakeAbort()) {
    EndTransfer();  // the receiver has heard the command and waits for a control byte
    return S_FALSE;
  }
  ReportProgress(1);
  connection()->Flush();
  ThrowIfFailed(WriteControl(kNak));

  HRESULT result = E_UNEXPECTED;
  if (link == eInstanceSerial) result = DownloadOverSerial(stream, size);
  if (link == eInstanceUSB) result = DownloadOverUSB(stream, size, kBlockPayload);
  if (FAILED(result)) EndTransfer();
  return result;
}

HRESULT CQuorinProtocol::WriteControl(uint8_t control) {
  return connection()->Write(&control, sizeof(control), kWriteTimeoutMs);
}

// Empties the line and asks for the current block again; a result only when that cannot be sent.
std::optional<HRESULT> CQuorinProtocol::AskAgain() {
  connection()->Flush();
  const HRESULT result = WriteControl(kNak);
  return FAILED(result) ? std::optional(result) : std::nullopt;
}

// The receiver must hear that it is over, whatever cancels are on their way.
HRESULT CQuorinProtocol::EndTransfer() {
  const AbortShield shield(connection());
  return WriteControl(kEndOfTransfer);
}

HRESULT CQuorinProtocol::EndCancelledDownload(const wchar_t* trace_line) {
  Trace(trace_line);
  const HRESULT result = EndTransfer();
  return FAILED(result) ? result : S_FALSE;
}

// Where a download stands.
struct CQuorinProtocol::Download {
  uint16_t crc = 0;  // of the blocks accepted so far
  uint32_t expected_sequence = 0;
  uint32_t delivered = 0;
  uint8_t percent = 0;
  int timeouts = 0;
};

HRESULT CQuorinProtocol::DownloadOverSerial(IStream* stream, int size) {
  if (!stream || size < 1) return E_INVALIDARG;
  Download download;
  for (;;) {
    if (const auto ended = TakeSerialBlock(download, stream, static_cast<uint32_t>(size))) {
      return *ended;
    }
  }
}

// One round of the serial transfer; a result ends the download.
std::optional<HRESULT> CQuorinProtocol::TakeSerialBlock(Download& download,
                                                        IStream* stream,
                                                        uint32_t size) {
  constexpr wchar_t kCancelled[] =
      L"CQuorinProtocol::DownloadOverSerial - download is cancelled\r\n";
  if (TakeAbort()) return EndCancelledDownload(kCancelled);

  Block block;
  DWORD count = 0;
  HRESULT read = connection()->Read(block.data(), kBlockHeader, &count, kSerialReadTimeoutMs);
  if (FAILED(read)) return AfterFailedRead(read, download);
  if (TakeAbort()) return EndCancelledDownload(kCancelled);

  if (count < kBlockHeader) return AskAgain();
  switch (block.Type()) {
    case BlockType::kEnd:
      return S_FALSE;
    case BlockType::kData:
      if (block.Sequence() != download.expected_sequence) return AskAgain();
      break;
    case BlockType::kLast:
      break;
    default:
      return AskAgain();
  }
  const std::optional<size_t> payload_length = block.PayloadLength();
  if (!payload_length) return kNotConnected;

  constexpr DWORD kRest = kBlockLength - kBlockHeader;
  read = connection()->Read(block.data() + kBlockHeader, kRest, &count, kSerialReadTimeoutMs);
  if (FAILED(read)) return AfterFailedRead(read, download);
  if (count < kRest || !block.HasEndByte() || !block.IsChainedTo(download.crc)) return AskAgain();

  download.crc = block.Crc();
  if (FAILED(WriteToStream(stream, block.Payload().first(*payload_length)))) {
    // The serial transfer keeps a failure of the host's stream to itself; the host knows it.
    EndTransfer();
    return S_OK;
  }
  download.delivered += static_cast<uint32_t>(*payload_length);
  const uint8_t percent = SerialPercent(download.delivered, size);
  if (percent != download.percent) ReportProgress(download.percent = percent);

  if (block.Type() == BlockType::kLast) {
    EndTransfer();
    return S_OK;
  }
  if (TakeAbort()) return EndCancelledDownload(kCancelled);
  const HRESULT sent = WriteControl(kAck);
  if (FAILED(sent)) return sent;
  // Cut off by an abort: the receiver still waits for its answer, and must hear that it is over.
  if (sent != S_OK) return TakeAbort() ? EndCancelledDownload(kCancelled) : S_OK;
  ++download.expected_sequence;
  download.timeouts = 0;
  return std::nullopt;
}

// A silence is answered by asking again, three times for a block; any other failure ends it.
std::optional<HRESULT> CQuorinProtocol::AfterFailedRead(HRESULT failure, Download& download) {
  if (failure != kTimedOut) return failure;
  Trace(L"CQuorinProtocol::DownloadOverSerial - read timeout\r\n");
  if (download.timeouts == kMaxTimeouts) return kTimedOut;
  ++download.timeouts;
  return AskAgain();
}

// The USB transfer comes with the USB link.
HRESULT CQuorinProtocol::DownloadOverUSB(IStream*, int, DWORD) { return E_NOTIMPL; }
