#include "quorin/commands.h"

#include <array>
#include <cstdlib>
#include <new>
#include <string_view>
#include <utility>

#include "platform/hresult.h"
#include "platform/text.h"
#include "quorin/directory_message.h"
#include "report/report_file.h"

using rcvlink::FormatText;
using rcvlink::kNotConnected;
using rcvlink::ToNarrow;
using rcvlink::ToWide;
using rcvlink::Trace;

namespace QuorinCommands {
namespace {

// Shorter than that of other commands: a search of a silent port waits for it at 18 settings.
constexpr uint32_t kPingReadTimeoutMs = 8000;

int PortLetter(int port_index) { return 'a' + port_index; }

// Receivers take words for odd and even parity, but the letter N for none.
std::string ParityWord(uint8_t parity) {
  constexpr uint8_t kOdd = 1;
  constexpr uint8_t kEven = 2;
  if (parity == kOdd) return ToNarrow(L"odd");
  if (parity == kEven) return ToNarrow(L"even");
  return ToNarrow(L"N");
}

std::wstring TextWithoutLeadingSpace(std::string_view text) {
  text = text.substr(0, text.find('\0'));
  const size_t start = text.find_first_not_of(" \t\n\v\f\r");
  return start == std::string_view::npos ? std::wstring() : ToWide(text.substr(start));
}

}  // namespace

CEchoOffCmd::CEchoOffCmd(uint32_t) : CQuorinCommand("#OFF#\r\n", kNoReply) {
  Trace(L"CEchoOffCmd::CEchoOffCmd\r\n");
}

CDisableEchoCmd::CDisableEchoCmd(int port_index, uint32_t)
    : CQuorinCommand(
          FormatText("set,/par/dev/ser/%c/echo,/dev/null\r\n", PortLetter(port_index)).c_str(),
          kNoReply) {
  Trace(L"CDisableEchoCmd::CDisableEchoCmd\r\n");
}

CPingCmd::CPingCmd(uint32_t flags) : CQuorinCommand("\r\n", flags | kTagged) {
  SetReadTimeout(kPingReadTimeoutMs);
  Trace(L"CPingCmd::CPingCmd\r\n");
}

HRESULT CPingCmd::ParseReply(const char* body, uint32_t length, ReplyKind kind, bool* done) {
  // Stricter than other commands, which accept an answer of blanks: only "RE" proves that a
  // receiver of this family answers, and not noise.
  const HRESULT result = CQuorinCommand::ParseReply(body, length, kind, done);
  SetResult(SUCCEEDED(result) && kind == ReplyKind::kReply ? S_OK : kNotConnected);
  return Result();
}

CGetPortCmd::CGetPortCmd(uint32_t flags) : CQuorinCommand("print,/cur/term\r\n", flags) {
  Trace(L"CGetPortCmd::CGetPortCmd\r\n");
}

// "/d" is also a part of "/dev", so it is looked for last. A terminal under "/dev" with another
// letter counts as port d therefore, and its receiver is found.
int CGetPortCmd::PortIndex() const {
  constexpr std::array<std::string_view, 4> kPorts = {"/a", "/b", "/c", "/d"};
  const std::string reply = ReplyText();
  for (size_t i = 0; i < kPorts.size(); ++i) {
    if (reply.find(kPorts[i]) != std::string::npos) return static_cast<int>(i);
  }
  return -1;
}

CChangeBaudRateCmd::CChangeBaudRateCmd(int port_index, uint32_t rate, uint32_t)
    : CQuorinCommand(
          FormatText("set,/par/dev/ser/%c/rate,%i\r\n", PortLetter(port_index), rate).c_str(),
          kNoReply) {}

CChangeParityCmd::CChangeParityCmd(int port_index, uint8_t parity, uint32_t)
    : CQuorinCommand(FormatText("set,/par/dev/ser/%c/parity,%s\r\n",
                                PortLetter(port_index),
                                ParityWord(parity).c_str())
                         .c_str(),
                     kNoReply) {}

CChangeRTSSignalCmd::CChangeRTSSignalCmd(int port_index, bool on, uint32_t)
    : CQuorinCommand(
          FormatText("set,/par/dev/ser/%c/rts,%s\r\n", PortLetter(port_index), on ? "on" : "off")
              .c_str(),
          kNoReply) {}

CChangeStopbitsCmd::CChangeStopbitsCmd(int port_index, bool two, uint32_t)
    : CQuorinCommand(
          FormatText("set,/par/dev/ser/%c/stops,%i\r\n", PortLetter(port_index), two ? 2 : 1)
              .c_str(),
          kNoReply) {}

CGetFileListCmd::CGetFileListCmd(uint32_t flags)
    : CQuorinCommand("print,/log/&[name,size,time]\r\n", flags) {
  Trace(L"CGetFileListCmd::CGetFileListCmd\r\n");
}

HRESULT CGetFileListCmd::ParseReply(const char* body, uint32_t length, ReplyKind kind, bool* done) {
  const HRESULT result = CQuorinCommand::ParseReply(body, length, kind, done);
  if (kind != ReplyKind::kReply || FAILED(result)) return result;

  DirectoryMessage message = ParseDirectoryMessage({body, length});
  switch (message.kind) {
    case DirectoryMessage::Kind::kNothing:
      return S_FALSE;
    case DirectoryMessage::Kind::kEnd:
      return S_OK;
    case DirectoryMessage::Kind::kEntry:
      break;
  }
  if (!Append(std::move(message.entry))) return E_OUTOFMEMORY;
  *done = message.last;
  return S_OK;
}

bool CGetFileListCmd::Append(FileEntry entry) {
  // Far more than a reply holds. It keeps the bytes of the list within 32 bits.
  constexpr size_t kMaxEntries = 0x3FFFFFF;
  if (entries_.size() >= kMaxEntries) return false;
  try {
    entries_.push_back(std::move(entry));
  } catch (const std::bad_alloc&) {
    return false;
  }
  return true;
}

CDeleteFileCmd::CDeleteFileCmd(const std::string& name, uint32_t flags)
    : CQuorinCommand(FormatText("remove,%s\r\n", name.c_str()).c_str(), flags) {
  Trace(L"CDeleteFileCmd::CDeleteFileCmd\r\n");
}

// The protocol does not say what the first number means. Receivers send blocks with 500, so nothing
// else is sent.
CGetFileCmd::CGetFileCmd(const std::string& name, uint32_t block_length, uint32_t flags)
    : CQuorinCommand(FormatText("get,\"%s\":{500,%u}\r\n", name.c_str(), block_length).c_str(),
                     flags) {
  Trace(L"CGetFileCmd::CGetFileCmd\r\n");
}

CGetFileSizeCmd::CGetFileSizeCmd(const std::string& name, uint32_t flags)
    : CQuorinCommand(FormatText("print,/log/%s&size\r\n", name.c_str()).c_str(), flags) {
  Trace(L"CGetFileSizeCmd::CGetFileSizeCmd\r\n");
}

int CGetFileSizeCmd::Size() const { return std::atoi(ReplyText().c_str()); }

CGetReceiverIDCmd::CGetReceiverIDCmd(uint32_t flags)
    : CQuorinCommand("print,/par/rcvid\r\n", flags) {
  Trace(L"CGetReceiverIDCmd::CGetReceiverIDCmd\r\n");
}

std::wstring CGetReceiverIDCmd::Text() const { return TextWithoutLeadingSpace(ReplyText()); }

CGetReceiverModelCmd::CGetReceiverModelCmd(uint32_t flags)
    : CQuorinCommand("print,/par/rcv/model\r\n", flags) {
  Trace(L"CGetReceiverModelCmd::CGetReceiverModelCmd\r\n");
}

std::wstring CGetReceiverModelCmd::Text() const { return TextWithoutLeadingSpace(ReplyText()); }

// In this command receivers take the path of the current terminal without a leading slash.
CSetBoudRateCmd::CSetBoudRateCmd(uint32_t rate, uint32_t flags)
    : CQuorinCommand(FormatText("set,cur/term/rate,%u\r\n", rate).c_str(), flags) {
  Trace(L"CSetBoudRateCmd::CSetBoudRateCmd\r\n");
}

}  // namespace QuorinCommands
