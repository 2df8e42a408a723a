#include "velmar/commands.h"

#include <algorithm>
#include <new>
#include <string_view>
#include <utility>

#include "platform/text.h"
#include "report/report_file.h"

using rcvlink::FormatText;
using rcvlink::ToNarrow;
using rcvlink::Trace;

namespace VelmarCommands {
namespace {

constexpr uint32_t kPlain = 0;
// Shorter than that of other commands: a search of a silent port waits for it at 18 settings.
constexpr uint32_t kUnlogReadTimeoutMs = 8000;

// The numbers are this family's, in which 1 is even; Quorin receivers have 1 for odd. Hosts give
// each family its own number, so the two are not made equal.
const char* ParityWord(uint8_t parity) {
  constexpr uint8_t kEven = 1;
  constexpr uint8_t kOdd = 2;
  if (parity == kEven) return "E";
  if (parity == kOdd) return "O";
  return "N";
}

const char* HandshakeWord(uint8_t handshake) {
  constexpr uint8_t kXon = 1;
  constexpr uint8_t kCts = 2;
  if (handshake == kXon) return "XON";
  if (handshake == kCts) return "CTS";
  return "N";
}

}  // namespace

HRESULT CLogCommand::ParseReply(const char* bytes,
                                uint32_t length,
                                bool* done,
                                uint32_t* consumed) {
  return ParseAcknowledgedReply(bytes, length, done, consumed);
}

HRESULT CLogCommand::Conclude(Progress progress, bool* done) {
  *done = progress == Progress::kComplete;
  switch (progress) {
    case Progress::kNothing:
      return S_FALSE;
    case Progress::kMore:
      SetResponse(RESPONSE_DATA);
      return S_FALSE;
    case Progress::kMoreLogs:
    case Progress::kComplete:
      SetResponse(RESPONSE_DATA);
      return S_OK;
    case Progress::kContradiction:
      SetResponse(RESPONSE_ERROR);
      return S_FALSE;
    case Progress::kNoMemory:
      break;
  }
  return E_OUTOFMEMORY;
}

CGetReceiverInfoCmd::CGetReceiverInfoCmd() : CLogCommand("log versiona once\r", kPlain) {
  Trace(L"CGetReceiverInfoCmd::CGetReceiverInfoCmd\r\n");
}

HRESULT CGetReceiverInfoCmd::ParseLogBody(const char* bytes,
                                          uint32_t length,
                                          bool* done,
                                          uint32_t*) {
  return Conclude(DecodeVersion({bytes, length}, version_), done);
}

CGetFileListCmd::CGetFileListCmd() : CLogCommand("log direnta once\r", kPlain) {
  Trace(L"CGetFileListCmd::CGetFileListCmd\r\n");
}

HRESULT CGetFileListCmd::ParseAsciiLog(const char* bytes, uint32_t length, bool* done, uint32_t*) {
  return Conclude(DecodeDirectory({bytes, length}, entries_), done);
}

CGetFileHeaderCmd::CGetFileHeaderCmd() : CLogCommand("log filehdra\r", kPlain) {
  Trace(L"CGetFileHeaderCmd::CGetFileHeaderCmd\r\n");
}

HRESULT CGetFileHeaderCmd::ParseLogBody(const char* bytes, uint32_t length, bool* done, uint32_t*) {
  return Conclude(DecodeFileHeader({bytes, length}, file_header_), done);
}

CLogConfigCommand::CLogConfigCommand() : CLogCommand("log comconfiga once\r", kPlain) {
  Trace(L"CLogConfigCommand::CLogConfigCommand\r\n");
}

HRESULT CLogConfigCommand::ParseLogBody(const char* bytes, uint32_t length, bool* done, uint32_t*) {
  return Conclude(DecodePortConfig({bytes, length}, Port(), config_), done);
}

CReadFileCmd::CReadFileCmd(CReadFileCmdCallback* callback, void* context)
    : CLogCommand("log filetransferb\r", kStreamed), callback_(callback), context_(context) {
  Trace(L"CReadFileCmd::CReadFileCmd\r\n");
}

HRESULT CReadFileCmd::ParseReply(const char* bytes,
                                 uint32_t length,
                                 bool* done,
                                 uint32_t* consumed) {
  has_begun_ = !std::string_view(bytes, length).starts_with(kRefusal);
  // The prompt is consumed as soon as a byte has come after it. So a first log that comes in pieces
  // has no prompt before it from the second piece on, and is recognised by its first byte.
  const bool at_log = length != 0 && static_cast<uint8_t>(bytes[0]) == BinaryHeader::kSync;
  const bool acknowledged = Response() == RESPONSE_OK && at_log;
  if (!has_chunk_ && !acknowledged) return CLogCommand::ParseReply(bytes, length, done, consumed);
  const HRESULT result = ParseBinaryLog(bytes, length, done, consumed);
  if (Response() == RESPONSE_OK) *done = false;
  return result;
}

HRESULT CReadFileCmd::ParseLogBody(const char* bytes,
                                   uint32_t length,
                                   bool* done,
                                   uint32_t* consumed) {
  // The binary header holds these bytes: the chunk's offset in the file and its length. They are
  // not needed, as the chunks come in order. At least 8 bytes must follow them, the checksum
  // included: a last chunk of less than 4 bytes is never recognised, and the download ends by a
  // time-out.
  constexpr uint32_t kBodyBeforeData = 8;
  constexpr uint32_t kUsualChunk = 1024;
  *done = false;
  if (length < kBodyBeforeData) return S_FALSE;
  const uint32_t message_length = Binary().MessageLength();
  const bool says_its_chunk =
      message_length >= kBodyBeforeData && message_length <= kBodyBeforeData + kUsualChunk;
  const uint32_t chunk_length = says_its_chunk ? message_length - kBodyBeforeData : kUsualChunk;
  if (length < chunk_length) return S_FALSE;

  // The memory of the chunk before is used again.
  try {
    chunk_.assign(bytes, chunk_length);
  } catch (const std::bad_alloc&) {
    return E_OUTOFMEMORY;
  }
  has_chunk_ = true;
  if (callback_) {
    if (const HRESULT result = callback_->OnDataReceived(context_); FAILED(result)) return result;
  }
  if (Binary().Sequence() != 0) {
    *consumed += static_cast<uint32_t>(Binary().LogLength());
  } else {
    SetResponse(RESPONSE_DATA);
    *done = true;
  }
  return S_OK;
}

const uint8_t* CReadFileCmd::GetData() const {
  return has_chunk_ ? reinterpret_cast<const uint8_t*>(chunk_.data()) : nullptr;
}

CSetCurrentFileCmd::CSetCurrentFileCmd(const char* name)
    : CVelmarCommand(name ? FormatText("currentfile %s all\r", name).c_str() : "currentfile\r",
                     kPlain) {}

HRESULT CSetCurrentFileCmd::ParseReply(const char* bytes,
                                       uint32_t length,
                                       bool* done,
                                       uint32_t* consumed) {
  const HRESULT result = ParseAcknowledgedReply(bytes, length, done, consumed);
  if (FAILED(result)) return result;
  if (Response() == RESPONSE_OK || Response() == RESPONSE_DATA) *done = true;
  return S_OK;
}

CDeleteFileCmd::CDeleteFileCmd(const char* name)
    : CVelmarCommand(FormatText("del file %s\r", name).c_str(), kPlain) {
  Trace(L"CDeleteFileCmd::CDeleteFileCmd\r\n");
}

CRenameFileCmd::CRenameFileCmd(const char* old_name, const char* new_name)
    : CVelmarCommand(FormatText("rename %s %s\r", old_name, new_name).c_str(), kPlain) {
  Trace(L"CRenameFileCmd::CRenameFileCmd\r\n");
}

CSetPortParamsCmd::CSetPortParamsCmd(const char*,
                                     uint32_t baud,
                                     uint8_t parity,
                                     uint8_t data_bits,
                                     uint8_t stop_bits,
                                     uint8_t handshake)
    : CVelmarCommand(FormatText("COM %u %s %u %u %s\r",
                                baud,
                                ParityWord(parity),
                                data_bits,
                                stop_bits,
                                HandshakeWord(handshake))
                         .c_str(),
                     kPlain) {
  Trace(L"CSetPortParamsCmd::CSetPortParamsCmd\r\n");
}

CSetPortParamsCmd::CSetPortParamsCmd(const PortConfigLog& settings)
    : CSetPortParamsCmd(ToNarrow(settings.port_name).c_str(),
                        static_cast<uint32_t>(settings.baud),
                        settings.parity,
                        settings.data_bits,
                        settings.stop_bits,
                        settings.handshake) {}

CSetInterfacemodeCommand::CSetInterfacemodeCommand()
    : CVelmarCommand("interfacemode thisport novatel novatel on\r", kPlain) {
  Trace(L"CSetInterfacemodeCommand::CSetInterfacemodeCommand\r\n");
  SetFlags(kSendOnly);
}

CUnlogAllCommand::CUnlogAllCommand() : CVelmarCommand("unlogall thisport\r", kPlain) {
  SetReadTimeout(kUnlogReadTimeoutMs);
}

}  // namespace VelmarCommands
