#include "discovery.h"

#include <windows.h>

#include <optional>

#include "busy.h"
#include "handle.h"
#include "names.h"
#include "rcvlink.h"
#include "text.h"

namespace cli {
namespace {

constexpr DWORD kShareAll = FILE_SHARE_READ | FILE_SHARE_WRITE;
const std::wstring kDevices = L"\\\\.\\";

bool IsOneTry(const Arguments& arguments) { return arguments.speed || arguments.rts; }

/// Tells a person at a terminal how to have a search shorter.
void PrintAdvice(Context& context) {
  const Arguments& arguments = context.arguments;
  if (ProgressModeOf(context) != ProgressMode::kBar) return;
  if (arguments.link == eInstanceUSB || IsOneTry(arguments)) return;
  context.err.Write(
      "Up to 18 tries of speed and RTS, some minutes on a silent port. Known speed? Then say "
      "--speed N.\n");
}

long SearchOn(EInstanceType link, const Context& context, void** receiver) {
  const Arguments& arguments = context.arguments;
  std::wstring port = arguments.port;
  const HANDLE cancel = context.interrupt.event();
  if (link == eInstanceUSB || !IsOneTry(arguments)) {
    return devapi::SearchReceiver(port.data(), link, arguments.protocol, cancel, receiver);
  }
  return TryPort(context,
                 PortSettings(arguments.speed.value_or(0), arguments.rts.value_or(RtsMode::kOn)),
                 receiver);
}

std::string SilenceHint(const Arguments& arguments, EInstanceType link) {
  if (link == eInstanceUSB) return "Is it switched on, and is it a Quorin receiver?";
  if (IsOneTry(arguments)) {
    return "Is it switched on, and is this its speed? Without --speed and --rts all are tried.";
  }
  return "Is it switched on, and is this the port of its cable? `rcvlink-cli ports` lists them.";
}

/// Why a device cannot be opened, as far as asking for nothing of it tells; S_OK when it can. A
/// search on USB that cannot open its device finds no receiver, no more.
long WhyNotOpened(const std::wstring& device) {
  const UniqueHandle handle(
      CreateFileW(device.c_str(), 0, kShareAll, nullptr, OPEN_EXISTING, 0, nullptr));
  return handle.get() == INVALID_HANDLE_VALUE ? ResultOfWin32(GetLastError()) : S_OK;
}

/// A port that is a file of this computer would have its beginning overwritten.
/// @throws Failure
void RefuseFile(const std::wstring& port) {
  for (const std::wstring& path : {port, kDevices + port}) {
    const UniqueHandle handle(
        CreateFileW(path.c_str(), 0, kShareAll, nullptr, OPEN_EXISTING, 0, nullptr));
    if (handle.get() == INVALID_HANDLE_VALUE || GetFileType(handle.get()) != FILE_TYPE_DISK) {
      continue;
    }
    throw Failure{.exit = ExitCode::kUsage,
                  .tried = "use it as a port",
                  .code = ResultOfWin32(ERROR_BAD_DEVICE),
                  .meaning = "it is a file of this computer, which would be overwritten",
                  .hint = "The port comes first, then the receiver's files."};
  }
}

bool IsMissing(long code) {
  return code == ResultOfWin32(ERROR_FILE_NOT_FOUND) ||
         code == ResultOfWin32(ERROR_PATH_NOT_FOUND) || code == ResultOfWin32(ERROR_INVALID_NAME);
}

/// The family that answers in place of the one that was asked for; empty when none does. Asked for at
/// known settings only: a sweep takes minutes.
std::string OtherFamily(const Context& context) {
  const Arguments& arguments = context.arguments;
  if (arguments.protocol == eProtocolAny || !IsOneTry(arguments)) return {};
  const EProtocol other = arguments.protocol == eProtocolQuorin ? eProtocolVelmar : eProtocolQuorin;
  std::wstring port = arguments.port;
  DCB settings = PortSettings(arguments.speed.value_or(0), arguments.rts.value_or(RtsMode::kOn));
  void* receiver = nullptr;
  devapi::CreateReceiverOnSerial(
      port.data(), other, &settings, context.interrupt.event(), &receiver);
  if (receiver == nullptr) return {};
  devapi::CloseReceiver(receiver);
  return FamilyName(other);
}

/// What a result of the search on a link means to the user.
Failure SearchFailure(const Arguments& arguments, EInstanceType link, long code) {
  const bool on_usb = link == eInstanceUSB;
  const std::string port = Printable(arguments.port);
  if (on_usb && SUCCEEDED(code)) {
    const long opening = WhyNotOpened(arguments.port);
    if (FAILED(opening)) code = opening;
  }
  Failure failure{.exit = ExitCode::kNoReceiver, .tried = "find a receiver", .code = code};
  if (!on_usb && code == ResultOfWin32(ERROR_INVALID_NAME)) {
    failure.meaning = port + " is no name of a COM port";
    failure.hint = "`rcvlink-cli ports` lists the ports of this computer.";
  } else if (IsMissing(code)) {
    failure.meaning = port + " does not exist: nothing is plugged in there";
    failure.hint = on_usb ? "A device on USB is named by its whole path, such as "
                            "\\\\?\\usb#vid_1234&pid_5678#...; --link serial is for COM ports."
                          : "`rcvlink-cli ports` lists the ports of this computer.";
  } else if (code == ResultOfWin32(ERROR_ACCESS_DENIED)) {
    failure.meaning = "another program is using " + port;
    failure.hint = "Close that program and try again.";
  } else if (code == ResultOfWin32(ERROR_NOT_READY)) {
    failure.meaning = port + " is there, but the device behind it does not answer";
    failure.hint = "Is it switched on, and in reach? Plug it in again and try once more.";
  } else if (SUCCEEDED(code)) {
    failure.meaning = "no receiver answered";
    failure.hint = SilenceHint(arguments, link);
  }
  return failure;
}

}  // namespace

long TryPort(const Context& context, DCB settings, void** receiver) {
  std::wstring port = context.arguments.port;
  return devapi::CreateReceiverOnSerial(
      port.data(), context.arguments.protocol, &settings, context.interrupt.event(), receiver);
}

std::optional<DCB> CurrentSettings(const std::wstring& port) {
  const std::wstring path = kDevices + port;
  const UniqueHandle handle(CreateFileW(
      path.c_str(), GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, 0, nullptr));
  DCB settings{};
  settings.DCBlength = sizeof(settings);
  if (handle.get() == INVALID_HANDLE_VALUE) return std::nullopt;
  if (GetCommState(handle.get(), &settings) == FALSE) return std::nullopt;
  return settings;
}

FoundReceiver FindReceiver(Context& context) {
  const Arguments& arguments = context.arguments;
  if (!IsComPort(arguments.port)) RefuseFile(arguments.port);
  const bool any = arguments.link == eInstanceAny;
  EInstanceType link = any ? eInstanceSerial : arguments.link;
  void* receiver = nullptr;
  long code = S_OK;
  {
    PrintAdvice(context);
    const Busy busy(context, "Searching " + Printable(arguments.port));
    code = SearchOn(link, context, &receiver);
  }
  if (any && receiver == nullptr && !context.interrupt.requested()) {
    if (arguments.verbose) {
      Failure failure = SearchFailure(arguments, link, code);
      failure.tried = "find a receiver on a serial port";
      failure.port = Printable(arguments.port);
      context.err.Write(Describe(failure));
    }
    link = eInstanceUSB;
    code = SearchOn(link, context, &receiver);
  }
  if (receiver != nullptr) return {receiver, link};
  Failure failure = SearchFailure(arguments, link, code);
  if (context.interrupt.requested()) {
    failure.exit = ExitCode::kCancelled;
    failure.meaning = "ended by Ctrl-C";
    failure.hint.clear();
  } else if (link == eInstanceSerial && code == S_FALSE) {
    if (const std::string family = OtherFamily(context); !family.empty()) {
      failure.meaning = "a " + family + " receiver answered instead";
      failure.hint = "Leave out --protocol, or say --protocol " + Lowered(family) + ".";
    }
  } else if (any) {
    failure.tried =
        arguments.verbose ? "find a receiver on USB" : "find a receiver on a serial port or on USB";
    if (!arguments.verbose) failure.hint = "With --verbose the reason for each of them is told.";
  }
  throw failure;
}

}  // namespace cli
