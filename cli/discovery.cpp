#include "discovery.h"

#include <windows.h>

#include <optional>

#include "formats.h"
#include "handle.h"
#include "rcvlink.h"
#include "text.h"
#include "ticker.h"

namespace cli {
namespace {

bool IsOneTry(const Arguments& arguments) { return arguments.speed || arguments.rts; }

/// Shows a person at a terminal that a search is going on, and how to have it shorter.
class SearchNote {
 public:
  explicit SearchNote(Context& context) : context_(context), start_(GetTickCount64()) {
    if (!context.err.is_terminal()) return;
    const Arguments& arguments = context.arguments;
    if (arguments.link != eInstanceUSB && !IsOneTry(arguments)) {
      context.PrintStatus(
          "Up to 18 tries of speed and RTS, some minutes on a silent port. Known speed? Then say "
          "--speed N.\n");
    }
    ticker_.emplace(kInterval, [this] { Draw(); });
  }

  ~SearchNote() {
    ticker_.reset();
    if (!line_.empty()) context_.PrintStatus(Erased(line_.size()));
  }

  SearchNote(const SearchNote&) = delete;
  SearchNote& operator=(const SearchNote&) = delete;

 private:
  static constexpr std::chrono::milliseconds kInterval{1000};

  void Draw() {
    constexpr std::uint64_t kMsPerSecond = 1000;
    line_ = "Searching " + Printable(context_.arguments.port) + " ... " +
            FormatDuration((GetTickCount64() - start_) / kMsPerSecond) + " (Ctrl-C ends it)";
    context_.PrintStatus(Redrawn(line_, line_.size()));
  }

  Context& context_;
  std::uint64_t start_;
  std::string line_;
  std::optional<Ticker> ticker_;
};

long SearchOn(EInstanceType link, const Context& context, void** receiver) {
  const Arguments& arguments = context.arguments;
  std::wstring port = arguments.port;
  const HANDLE cancel = context.interrupt.event();
  if (link == eInstanceUSB || !IsOneTry(arguments)) {
    return devapi::SearchReceiver(port.data(), link, arguments.protocol, cancel, receiver);
  }
  DCB settings = PortSettings(arguments.speed.value_or(0), arguments.rts.value_or(RtsMode::kOn));
  return devapi::CreateReceiverOnSerial(
      port.data(), arguments.protocol, &settings, cancel, receiver);
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
  constexpr DWORD kShareAll = FILE_SHARE_READ | FILE_SHARE_WRITE;
  const UniqueHandle handle(
      CreateFileW(device.c_str(), 0, kShareAll, nullptr, OPEN_EXISTING, 0, nullptr));
  return handle.get() == INVALID_HANDLE_VALUE ? ResultOfWin32(GetLastError()) : S_OK;
}

bool IsMissing(long code) {
  return code == ResultOfWin32(ERROR_FILE_NOT_FOUND) ||
         code == ResultOfWin32(ERROR_PATH_NOT_FOUND) || code == ResultOfWin32(ERROR_INVALID_NAME);
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
  } else if (SUCCEEDED(code)) {
    failure.meaning = "no receiver answered";
    failure.hint = SilenceHint(arguments, link);
  }
  return failure;
}

}  // namespace

FoundReceiver FindReceiver(Context& context) {
  const Arguments& arguments = context.arguments;
  const bool any = arguments.link == eInstanceAny;
  EInstanceType link = any ? eInstanceSerial : arguments.link;
  void* receiver = nullptr;
  long code = S_OK;
  {
    const SearchNote note(context);
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
  } else if (any) {
    failure.tried =
        arguments.verbose ? "find a receiver on USB" : "find a receiver on a serial port or on USB";
    if (!arguments.verbose) failure.hint = "With --verbose the reason for each of them is told.";
  }
  throw failure;
}

}  // namespace cli
