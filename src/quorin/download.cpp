// The download of CQuorinProtocol: the link is raised to full speed, the receiver is asked for the
// file, and its blocks are taken one by one (block.h).
#include <algorithm>
#include <cstdint>
#include <optional>
#include <span>
#include <string>

#include <objidl.h>

#include "platform/clock.h"
#include "platform/hresult.h"
#include "platform/text.h"
#include "quorin/block.h"
#include "quorin/commands.h"
#include "quorin/protocol_flags.h"
#include "quorin/quorin_protocol.h"
#include "report/report_file.h"
#include "transport/wait_scope.h"

using namespace QuorinCommands;

namespace {

constexpr DWORD kSerialReadTimeoutMs = 3000;
constexpr int kMaxTimeouts = 3;

// In 32-bit arithmetic, which wraps beyond 43383508 bytes, and cut to 8 bits.
uint8_t SerialPercent(uint32_t delivered, uint32_t size) {
  return static_cast<uint8_t>(delivered * 99 / size + 1);
}

// Cut to 8 bits; right for files of any size.
uint8_t UsbPercent(uint32_t delivered, uint32_t size) {
  return static_cast<uint8_t>(static_cast<uint64_t>(delivered * 99.0 / size + 1.0));
}

HRESULT WriteToStream(IStream* stream, std::span<const uint8_t> bytes) {
  ULONG written = 0;
  return stream->Write(bytes.data(), static_cast<ULONG>(bytes.size()), &written);
}

}  // namespace

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

// An abort while the receiver is asked for its port cuts that off: it is asked once more.
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
  CSetBoudRateCmd set_speed(saved_speed, kCommandFlags);
  set_speed.SendWhole();
  ThrowIfFailed(ExecuteCommand(set_speed));
  ThrowIfFailed(connection()->SetSpeed(saved_speed));
}

HRESULT CQuorinProtocol::Transfer(const wchar_t* name, IStream* stream, EInstanceType link) {
  ThrowIfAborted();
  // What is sent at the raised speed is sent whole: half a line in front of it would spoil the command
  // that puts the speed back.
  CQuorinCommand line_end("\n", kCommandFlags);
  line_end.SendWhole();
  ThrowIfFailed(ExecuteCommand(line_end));

  const std::string narrow_name = ToNarrow(name);
  CGetFileSizeCmd get_size(narrow_name, kCommandFlags);
  get_size.SendWhole();
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
  if (abort_.Take()) {
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

// No abort cuts it off: the host would not know whether the receiver has heard it.
HRESULT CQuorinProtocol::WriteControl(uint8_t control) {
  const WaitScope shield = WaitScope::Shielded(connection());
  return connection()->Write(&control, sizeof(control), kWriteTimeoutMs);
}

// Empties the line and asks for the current block again; a result only when that cannot be sent.
std::optional<HRESULT> CQuorinProtocol::AskAgain() {
  connection()->Flush();
  const HRESULT result = WriteControl(kNak);
  return FAILED(result) ? std::optional(result) : std::nullopt;
}

std::optional<HRESULT> CQuorinProtocol::AskAgain(const wchar_t* trace_line) {
  Trace(trace_line);
  return AskAgain();
}

HRESULT CQuorinProtocol::EndTransfer() { return WriteControl(kEndOfTransfer); }

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
  uint8_t percent = 0;    // the last that was counted
  DWORD reported_at = 0;  // over USB: ticks of the last report
  int timeouts = 0;       // on a serial port of this block, over USB of the whole download
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
  constexpr wchar_t kTimeout[] = L"CQuorinProtocol::DownloadOverSerial - read timeout\r\n";
  if (abort_.Take()) return EndCancelledDownload(kCancelled);

  Block block;
  DWORD count = 0;
  HRESULT read_result =
      connection()->Read(block.data(), kBlockHeader, &count, kSerialReadTimeoutMs);
  if (FAILED(read_result)) return AfterFailedRead(read_result, download, kTimeout);
  if (abort_.Take()) return EndCancelledDownload(kCancelled);

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
  read_result =
      connection()->Read(block.data() + kBlockHeader, kRest, &count, kSerialReadTimeoutMs);
  if (FAILED(read_result)) return AfterFailedRead(read_result, download, kTimeout);
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
  if (abort_.Take()) return EndCancelledDownload(kCancelled);
  const HRESULT write_result = WriteControl(kAck);
  if (FAILED(write_result)) return write_result;
  if (write_result != S_OK) return S_OK;
  ++download.expected_sequence;
  download.timeouts = 0;
  return std::nullopt;
}

HRESULT CQuorinProtocol::DownloadOverUSB(IStream* stream, int size, DWORD block_length) {
  if (!stream || size < 1 || block_length != kBlockPayload) return E_INVALIDARG;
  Download download;
  download.reported_at = CurrentClock().Ticks();
  for (;;) {
    if (const auto ended = TakeUsbBlock(download, stream, static_cast<uint32_t>(size))) {
      return *ended;
    }
  }
}

// One round of the transfer over USB. It differs from the serial one in that a block is read whole,
// all that is wrong with it is written to the report, the time-outs are counted over the whole
// download, progress is told in steps, and a failure of the host's stream is passed on.
std::optional<HRESULT> CQuorinProtocol::TakeUsbBlock(Download& download,
                                                     IStream* stream,
                                                     uint32_t size) {
  constexpr wchar_t kCancelled[] = L"CQuorinProtocol::DownloadOverUSB - download is cancelled\r\n";
  constexpr wchar_t kTimeout[] = L"CQuorinProtocol::DownloadOverUSB - read timeout.\r\n";
  if (abort_.Take()) return EndCancelledDownload(kCancelled);

  Block block;
  const HRESULT read_result = ReadWholeBlock(block);
  if (abort_.Take()) return EndCancelledDownload(kCancelled);
  if (FAILED(read_result)) return AfterFailedRead(read_result, download, kTimeout);

  switch (block.Type()) {
    case BlockType::kEnd:
      Trace(L"CQuorinProtocol::DownloadOverUSB - recognisable byte is 0x23\r\n");
      return S_FALSE;
    case BlockType::kData:
      if (block.Sequence() != download.expected_sequence) {
        return AskAgain(L"CQuorinProtocol::DownloadOverUSB - out of sequence\r\n");
      }
      break;
    case BlockType::kLast:
      break;
    default:
      return AskAgain(
          L"CQuorinProtocol::DownloadOverUSB - recognisable byte is not recognised\r\n");
  }
  const std::optional<size_t> payload_length = block.PayloadLength();
  if (!payload_length) return kNotConnected;
  // Another call on this receiver took the abort; the receiver must hear of it all the same.
  if (read_result == S_FALSE) EndTransfer();
  if (read_result != S_OK) return read_result;
  if (!block.HasEndByte()) {
    return AskAgain(L"CQuorinProtocol::DownloadOverUSB - eob character is missed\r\n");
  }
  if (!block.IsChainedTo(download.crc)) {
    return AskAgain(L"CQuorinProtocol::DownloadOverUSB - cheksum missmatch\r\n");
  }

  download.crc = block.Crc();
  const HRESULT store_result = WriteToStream(stream, block.Payload().first(*payload_length));
  if (FAILED(store_result)) {
    Trace(L"CQuorinProtocol::DownloadOverUSB - write to stream failed [0x%08X]\r\n", store_result);
    EndTransfer();
    return store_result;
  }
  download.delivered += static_cast<uint32_t>(*payload_length);
  ReportUsbProgress(download, size);

  if (block.Type() == BlockType::kLast) {
    EndTransfer();
    return store_result;
  }
  if (abort_.Take()) return EndCancelledDownload(kCancelled);
  const HRESULT write_result = WriteControl(kAck);
  if (FAILED(write_result)) return write_result;
  if (write_result != S_OK) return write_result;
  ++download.expected_sequence;
  return std::nullopt;
}

// In pieces of no more than a bulk packet, until all is there, a read does not succeed or an abort
// is seen.
HRESULT CQuorinProtocol::ReadWholeBlock(Block& block) {
  constexpr DWORD kMaxPiece = 512;
  DWORD held = 0;
  while (held < kBlockLength && !abort_.IsSet()) {
    const DWORD piece = std::min<DWORD>(kBlockLength - held, kMaxPiece);
    DWORD count = 0;
    const HRESULT read_result =
        connection()->Read(block.data() + held, piece, &count, download_read_timeout_ms_);
    if (read_result != S_OK) return read_result;
    held += std::min(count, piece);
  }
  return S_OK;
}

// Twice a second at most; a change in between is not made up for.
void CQuorinProtocol::ReportUsbProgress(Download& download, uint32_t size) {
  constexpr DWORD kReportIntervalMs = 500;
  const uint8_t percent = UsbPercent(download.delivered, size);
  if (percent == download.percent) return;
  download.percent = percent;
  const DWORD now = CurrentClock().Ticks();
  if (now - download.reported_at <= kReportIntervalMs) return;
  download.reported_at = now;
  ReportProgress(percent);
}

// A silence is answered by asking again, three times; any other failure ends the transfer.
std::optional<HRESULT> CQuorinProtocol::AfterFailedRead(HRESULT failure,
                                                        Download& download,
                                                        const wchar_t* trace_line) {
  if (failure != kTimedOut) return failure;
  Trace(trace_line);
  if (download.timeouts == kMaxTimeouts) return kTimedOut;
  ++download.timeouts;
  return AskAgain();
}
