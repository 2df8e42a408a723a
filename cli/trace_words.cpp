#include "trace_words.h"

#include <algorithm>
#include <array>
#include <vector>

#include "results.h"
#include "text.h"
#include "troubleshooting.h"

namespace cli {
namespace {

struct Pattern {
  std::string_view line;  // a * stands for any text
  TraceKind kind;
  std::string_view meaning;  // %1 is the text of the first *
};

// The first one that matches counts.
constexpr std::array kPatterns = {
    Pattern{"rcvlink-cli *, rcvlink.dll *", TraceKind::kNote, "rcvlink-cli %1, rcvlink.dll %2"},
    Pattern{"command line: *", TraceKind::kNote, "command line: %1"},
    Pattern{"Module is loaded [*] [*]", TraceKind::kNote, "the library is loaded, version %2"},
    Pattern{"Bye!", TraceKind::kNote, "the library is unloaded"},

    Pattern{"OpenReceiver - ref [*] [*]",
            TraceKind::kHost,
            "opens the receiver on %2 again (%1 users)"},
    Pattern{"CloseReceiver - removed [*]", TraceKind::kHost, "closes the receiver on %1"},
    Pattern{"CloseReceiver - ref [*] [*]",
            TraceKind::kHost,
            "closes the receiver on %2, which still has %1 users"},
    Pattern{"CloseReceiver - receiver not found [*]",
            TraceKind::kFailure,
            "closes a receiver that is not open"},
    Pattern{"DestroyReceiver - removed [*]", TraceKind::kHost, "removes the receiver on %1"},
    Pattern{"SearchReceiver - receiver already exists [*]",
            TraceKind::kHost,
            "searches on %1, where a receiver is already open"},
    Pattern{"SearchReceiver - *failed[*] [0x*]", TraceKind::kFailure, "the search on %2 failed"},
    Pattern{"CreateReceiverOnSerial - opening serial port [*]",
            TraceKind::kHost,
            "opens %1 to look for a receiver"},
    Pattern{"CreateReceiverOnUSB - opening USB [*]",
            TraceKind::kHost,
            "opens the USB device %1 to look for a receiver"},
    Pattern{"GetFileInfo - [*] [*]", TraceKind::kHost, "reads from the list: %1, %2 bytes"},
    Pattern{"CAbstractReceiver::CheckConnection",
            TraceKind::kHost,
            "checks whether the receiver answers"},
    Pattern{"CAbstractReceiver::GetReceiverInfo", TraceKind::kHost, "reads model and id"},
    Pattern{"CAbstractReceiver::GetFiles", TraceKind::kHost, "reads the list of files"},
    Pattern{"CAbstractReceiver::DownloadFile", TraceKind::kHost, "downloads a file"},
    Pattern{"CAbstractReceiver::UploadFile", TraceKind::kHost, "uploads a file"},
    Pattern{"CAbstractReceiver::DeleteFile", TraceKind::kHost, "deletes a file"},
    Pattern{"CAbstractReceiver::RenameFile", TraceKind::kHost, "renames a file"},
    Pattern{"CAbstractReceiver::Abort",
            TraceKind::kCancel,
            "aborts the running operation (closing does so too)"},
    Pattern{"CAbstractReceiver::DCSetRcvBaudrate", TraceKind::kHost, "sets the receiver's speed"},
    Pattern{"CAbstractReceiver::DCSetRcvRTSControl", TraceKind::kHost, "sets the receiver's RTS"},
    Pattern{"CAbstractReceiver::DCSetRcvParity", TraceKind::kHost, "sets the receiver's parity"},
    Pattern{
        "CAbstractReceiver::DCSetRcvStopbits", TraceKind::kHost, "sets the receiver's stop bits"},

    Pattern{"SearchReceiverOnSerial - try current port speed [*]",
            TraceKind::kLink,
            "tries %1 at its current speed"},
    Pattern{"SearchReceiverOnSerial - try speed [*] [*]", TraceKind::kLink, "tries %2 at %1 bit/s"},
    Pattern{"*try RTS control is * [*]", TraceKind::kLink, "tries %3 with RTS: %2"},
    Pattern{
        "CSerialConnection::Connect - try speed [*] [*]", TraceKind::kLink, "tries %2 at %1 bit/s"},
    Pattern{"CSerialConnection::Connect - OK [*]", TraceKind::kLink, "%1 is open"},
    Pattern{"CSerialConnection::Connect", TraceKind::kLink, "searches for the speed"},
    Pattern{"CSerialConnection::Open - OK [*]", TraceKind::kLink, "%1 is open"},
    Pattern{"CSerialConnection::SetSpeed - changing of baudrate [* -> *]",
            TraceKind::kLink,
            "this computer's port changes from %1 to %2 bit/s"},
    Pattern{"CSerialConnection::Flush - error detected [*] [*]",
            TraceKind::kFailure,
            "the line of %2 has an error: %1"},
    Pattern{"CSerialConnection::*failed [*] [*]", TraceKind::kFailure, "%1failed on %3"},
    Pattern{"CUSBConnection::Create - OK [*]", TraceKind::kLink, "%1 is open"},
    Pattern{"CUSBConnection::Create - DeviceIoControl(*) is failed [*] [*",
            TraceKind::kFailure,
            "the USB device could not be configured; it is used anyway"},
    Pattern{"CUSBConnection::DumpDriveErrorDesc - * [*]",
            TraceKind::kFailure,
            "the USB driver failed: %1"},
    Pattern{"CUSBConnection::Create", TraceKind::kLink, "opens the USB device"},
    Pattern{"CUSBConnection::Disconnect", TraceKind::kLink, "closes the USB device"},
    Pattern{"CAbstractConnection::Disconnect - disconnected [*]", TraceKind::kLink, "%1 is closed"},
    Pattern{"CAbstractConnection::Cancel []", TraceKind::kCancel, "nothing is waiting"},
    Pattern{"CAbstractConnection::Cancel [*]", TraceKind::kCancel, "ends the wait on %1"},
    Pattern{"C*Connection::Flush", TraceKind::kSend, "discards what came before"},
    Pattern{
        "Create*- looking for * receiver [*]", TraceKind::kLink, "looks for a %2 receiver on %3"},
    Pattern{"Create*- * receiver found [*]", TraceKind::kDone, "a %2 receiver answers on %3"},
    Pattern{"Create*- OK [*]", TraceKind::kDone, "the receiver on %2 is ready"},

    Pattern{"*- connection is locked [*]", TraceKind::kLock, "the receiver is locked"},
    Pattern{"*- connection is unlocked [*]", TraceKind::kLock, "the receiver is unlocked"},
    Pattern{"*LockConnection - is cancelled [*]",
            TraceKind::kCancel,
            "the wait for the receiver's lock was cancelled"},
    Pattern{
        "*LockConnection - is failed [*]", TraceKind::kFailure, "the receiver could not be locked"},

    Pattern{"CQuorinCommand::Execute - start reading. Timeout is [* msec]",
            TraceKind::kRead,
            "waits %1 ms at most"},
    Pattern{"CAbstractConnection::Read - wait timeout [*]",
            TraceKind::kTimeout,
            "no data on %1 in time"},
    Pattern{"CAbstractConnection::Read - GetOverlappedResult is failed [1460] [*]",
            TraceKind::kTimeout,
            "no data on %1 in time"},
    Pattern{"CAbstractConnection::Write - wait timeout [*] [*]",
            TraceKind::kTimeout,
            "%2 did not take the data in time"},
    Pattern{"CAbstractConnection::Read - *failed [*] [*]",
            TraceKind::kFailure,
            "reading from %3 failed"},
    Pattern{"CAbstractConnection::Write - *failed [*] [*]",
            TraceKind::kFailure,
            "writing to %3 failed"},
    Pattern{"*::DumpInvalidResponse - [*] [*] [*]",
            TraceKind::kFailure,
            "refused or incomplete. The receiver sent: %3"},
    Pattern{"*::DumpInvalidResponse - [*] [*]", TraceKind::kFailure, "the command failed on %3"},
    Pattern{"*::CheckConnection - ping cmd failed [*] [*]",
            TraceKind::kFailure,
            "no receiver answers on %3"},
    Pattern{"CVelmarCommand::Execute - read failed [*]",
            TraceKind::kFailure,
            "the reply is incomplete"},
    Pattern{"CVelmarCommand::Execute - unknown response type",
            TraceKind::kFailure,
            "the reply is of an unknown kind"},
    Pattern{"*::DownloadFile - receiver speed up is failed [*]",
            TraceKind::kFailure,
            "the receiver's speed could not be raised; the download continues at the old speed"},
    Pattern{"*::DownloadFile - host speed up is failed [*]",
            TraceKind::kFailure,
            "this computer's speed could not be raised; the download continues at the old speed"},
    Pattern{"*::DownloadFile - download [*] is failed [0x*]",
            TraceKind::kFailure,
            "the download of %2 failed"},
    Pattern{"*::DownloadFile - file [*] size is zero",
            TraceKind::kFailure,
            "the receiver reports size 0 or no size for %2"},
    Pattern{"*::DownloadFile - file size [*] is * bytes", TraceKind::kReply, "%2 has %3 bytes"},
    Pattern{"*::DownloadOver* - read timeout*", TraceKind::kBlocks, "a block is missing"},
    Pattern{
        "*::DownloadOver* - download is cancelled", TraceKind::kCancel, "the transfer was aborted"},
    Pattern{"*::DownloadOver* - recognisable byte is 0x23",
            TraceKind::kFailure,
            "the receiver ended the transfer"},
    Pattern{"*::DownloadOver* - recognisable byte is not recognised",
            TraceKind::kFailure,
            "a block of an unknown type"},
    Pattern{"*::DownloadOver* - out of sequence", TraceKind::kFailure, "a block out of sequence"},
    Pattern{"*::DownloadOver* - eob character is missed",
            TraceKind::kFailure,
            "a block without an end byte"},
    Pattern{"*::DownloadOver* - cheksum missmatch",
            TraceKind::kFailure,
            "a block with a wrong checksum"},
    Pattern{"*::DownloadOver* - write to stream failed [*]",
            TraceKind::kFailure,
            "the file on this computer could not be written"},
    Pattern{"*file download read timeout /DownloadReadTimeout/ - *",
            TraceKind::kNote,
            "the registry sets the time-out of downloads over USB: %2 ms"},
    Pattern{"C*Protocol::GetReceiverInfo - OK", TraceKind::kDone, "model and id are read"},
    Pattern{"C*Protocol::GetReceiverInfo", TraceKind::kNote, "the driver reads model and id"},
    Pattern{"C*Protocol::GetFiles - OK", TraceKind::kDone, "the list is read"},
    Pattern{"C*Protocol::DeleteFile - OK", TraceKind::kDone, "the file is deleted"},
};

struct CommandText {
  std::string_view class_name;
  EProtocol family;
  std::string_view meaning;
};

constexpr std::array kCommands = {
    CommandText{"CEchoOffCmd", eProtocolAny, "turn the echo off: #OFF#"},
    CommandText{"CDisableEchoCmd", eProtocolAny, "turn the port's echo off: set,...echo"},
    CommandText{"CPingCmd", eProtocolAny, "ping (an empty line)"},
    CommandText{"CGetPortCmd", eProtocolAny, "read the port: print,/cur/term"},
    CommandText{"CGetFileListCmd", eProtocolQuorin, "list the files: print,/log/&[name,size,time]"},
    CommandText{"CGetFileListCmd", eProtocolVelmar, "list the files: log direnta once"},
    CommandText{"CGetFileListCmd", eProtocolAny, "list the files"},
    CommandText{"CDeleteFileCmd", eProtocolQuorin, "delete the file: remove,NAME"},
    CommandText{"CDeleteFileCmd", eProtocolVelmar, "delete the file: del file NAME"},
    CommandText{"CDeleteFileCmd", eProtocolAny, "delete the file"},
    CommandText{"CGetFileCmd", eProtocolAny, "send the file: get,NAME"},
    CommandText{"CGetFileSizeCmd", eProtocolAny, "read the file size: print,/log/NAME&size"},
    CommandText{"CGetReceiverIDCmd", eProtocolAny, "read the id: print,/par/rcvid"},
    CommandText{"CGetReceiverModelCmd", eProtocolAny, "read the model: print,/par/rcv/model"},
    CommandText{"CSetBoudRateCmd", eProtocolAny, "return to the old speed: set,cur/term/rate"},
    CommandText{"CGetReceiverInfoCmd", eProtocolAny, "read model and id: log versiona once"},
    CommandText{"CGetFileHeaderCmd", eProtocolAny, "read the file size: log filehdra"},
    CommandText{"CLogConfigCommand", eProtocolAny, "read the port settings: log comconfiga once"},
    CommandText{"CReadFileCmd", eProtocolAny, "send the file: log filetransferb"},
    CommandText{"CRenameFileCmd", eProtocolAny, "rename the file: rename OLD NEW"},
    CommandText{"CSetPortParamsCmd", eProtocolAny, "set the port: COM SPEED ..."},
    CommandText{
        "CSetInterfacemodeCommand", eProtocolAny, "set the language of the port: interfacemode"},
};

// The texts that the stars match; nothing when the pattern does not match. The last bracket may be
// open: a line with bytes beyond ASCII loses its end.
std::optional<std::vector<std::string_view>> Match(std::string_view pattern,
                                                   std::string_view line) {
  const size_t head = std::min(pattern.find('*'), pattern.size());
  if (!line.starts_with(pattern.substr(0, head))) return std::nullopt;
  if (head == pattern.size()) {
    return line.size() == head ? std::optional(std::vector<std::string_view>()) : std::nullopt;
  }
  std::vector<std::string_view> stars;
  line.remove_prefix(head);
  pattern.remove_prefix(head);
  while (!pattern.empty()) {
    pattern.remove_prefix(1);
    const size_t length = std::min(pattern.find('*'), pattern.size());
    const std::string_view literal = pattern.substr(0, length);
    const bool is_last = length == pattern.size();
    size_t found = line.find(literal);
    if (is_last && line.ends_with(literal)) found = line.size() - length;
    if (is_last && !line.ends_with(literal)) {
      if (!literal.starts_with(']')) return std::nullopt;
      stars.push_back(line);
      return stars;
    }
    if (found == std::string_view::npos) return std::nullopt;
    stars.push_back(line.substr(0, found));
    line.remove_prefix(found + length);
    pattern.remove_prefix(length);
  }
  return stars;
}

// A name or text of the receiver, not too long for a line.
std::string Shortened(std::string_view text) {
  constexpr size_t kMost = 160;
  constexpr unsigned char kContinuation = 0x80;
  constexpr unsigned char kContinuationMask = 0xC0;
  if (text.size() <= kMost) return std::string(text);
  size_t end = kMost;
  while ((static_cast<unsigned char>(text[end]) & kContinuationMask) == kContinuation) --end;
  return std::string(text.substr(0, end)) + "...";
}

std::string Filled(std::string_view meaning, const std::vector<std::string_view>& stars) {
  std::string filled;
  for (size_t i = 0; i < meaning.size(); ++i) {
    if (meaning[i] != '%') {
      filled += meaning[i];
      continue;
    }
    const auto star = static_cast<size_t>(meaning[++i] - '1');
    filled += star < stars.size() ? Shortened(stars[star]) : "?";
  }
  return filled;
}

// The code in the brackets that open at `open`. Windows errors are decimal.
std::optional<long> CodeIn(std::string_view line, size_t open) {
  constexpr size_t kHexLength = 10;  // 0x8007048F
  constexpr size_t kLongestError = 5;
  const size_t close = line.find(']', open);
  if (open == std::string_view::npos || close == std::string_view::npos) return std::nullopt;
  const std::string_view text = line.substr(open + 1, close - open - 1);
  const bool is_code = text.starts_with("0x") && text.size() == kHexLength;
  const bool is_error = !text.empty() && text.size() <= kLongestError &&
                        text.find_first_not_of("0123456789") == std::string_view::npos;
  if (!is_code && !is_error) return std::nullopt;
  const auto code = ParseCode(text);
  return code && is_error ? ResultOfWin32(static_cast<unsigned long>(*code)) : code;
}

// The result code of a line that reports a failure. It comes first where a receiver's text
// follows, otherwise last or before the port's name.
std::optional<long> CodeOf(std::string_view line) {
  constexpr std::string_view kResponse = "::DumpInvalidResponse - [";
  const size_t response = line.find(kResponse);
  if (response != std::string_view::npos) return CodeIn(line, response + kResponse.size() - 1);
  for (size_t open = line.rfind('['); open != std::string_view::npos && open > 0;
       open = line.rfind('[', open - 1)) {
    if (const auto code = CodeIn(line, open)) return code;
  }
  return std::nullopt;
}

}  // namespace

std::string_view NameOf(TraceKind kind) {
  switch (kind) {
    case TraceKind::kNote:
      return "note";
    case TraceKind::kHost:
      return "host";
    case TraceKind::kLink:
      return "link";
    case TraceKind::kLock:
      return "lock";
    case TraceKind::kCommand:
      return "command";
    case TraceKind::kSend:
      return "send";
    case TraceKind::kRead:
      return "read";
    case TraceKind::kReply:
      return "reply";
    case TraceKind::kBlocks:
      return "blocks";
    case TraceKind::kRetry:
      return "retry";
    case TraceKind::kTimeout:
      return "timeout";
    case TraceKind::kFailure:
      return "failure";
    case TraceKind::kCancel:
      return "cancel";
    case TraceKind::kDone:
      return "done";
  }
  return "";
}

TraceWords WordsOf(std::string_view line) {
  for (const Pattern& pattern : kPatterns) {
    const auto stars = Match(pattern.line, line);
    if (!stars) continue;
    const bool is_failure =
        pattern.kind == TraceKind::kFailure || pattern.kind == TraceKind::kTimeout;
    return {.kind = pattern.kind,
            .meaning = Filled(pattern.meaning, *stars),
            .code = is_failure ? CodeOf(line) : std::nullopt};
  }
  if (!CommandClass(line).empty()) return {.kind = TraceKind::kCommand};
  const bool is_failure = line.find("failed") != std::string_view::npos;
  return {.kind = is_failure ? TraceKind::kFailure : TraceKind::kNote,
          .meaning = Shortened(line),
          .code = is_failure ? CodeOf(line) : std::nullopt};
}

const Family* FamilyOf(std::string_view line) {
  const auto is_about = [line](std::string_view name) {
    return line.starts_with("C" + std::string(name)) ||
           (line.starts_with("Create") &&
            (line.find("looking for " + std::string(name)) != std::string_view::npos ||
             line.find(std::string(name) + " receiver found") != std::string_view::npos));
  };
  for (const Family& family : kFamilies) {
    if (is_about(family.name)) return &family;
  }
  return nullptr;
}

std::string CommandMeaning(std::string_view class_name, const Family* family) {
  const EProtocol protocol = family ? family->protocol : eProtocolAny;
  const auto* const found = std::ranges::find_if(kCommands, [&](const CommandText& command) {
    return command.class_name == class_name &&
           (command.family == protocol || command.family == eProtocolAny);
  });
  return std::string(found == kCommands.end() ? class_name : found->meaning);
}

std::string_view CommandClass(std::string_view line) {
  const size_t colons = line.find("::");
  if (colons == std::string_view::npos) return {};
  const std::string_view name = line.substr(0, colons);
  const bool is_command = name.ends_with("Cmd") || name.ends_with("Command");
  return is_command && line.substr(colons + 2) == name ? name : std::string_view();
}

}  // namespace cli
