#include "discovery.h"

#include <windows.h>

#include <optional>

#include "formats.h"
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
    if (!IsOneTry(arguments)) {
      context.Note(
          "Up to 18 tries of speed and RTS, some minutes on a silent port. Known speed? Then say "
          "--speed N.\n");
    }
    ticker_.emplace(kInterval, [this] { Draw(); });
  }

  ~SearchNote() {
    ticker_.reset();
    if (!line_.empty()) context_.Note(Erased(line_.size()));
  }

  SearchNote(const SearchNote&) = delete;
  SearchNote& operator=(const SearchNote&) = delete;

 private:
  static constexpr std::chrono::milliseconds kInterval{1000};

  void Draw() {
    constexpr std::uint64_t kMsPerSecond = 1000;
    line_ = "Searching " + Printable(context_.arguments.port) + " ... " +
            FormatDuration((GetTickCount64() - start_) / kMsPerSecond) + " (Ctrl-C ends it)";
    context_.Note(Redrawn(line_, line_.size()));
  }

  Context& context_;
  std::uint64_t start_;
  std::string line_;
  std::optional<Ticker> ticker_;
};

long Search(const Context& context, void** receiver) {
  const Arguments& arguments = context.arguments;
  std::wstring port = arguments.port;
  const HANDLE cancel = context.interrupt.event();
  if (!IsOneTry(arguments)) {
    return devapi::SearchReceiver(
        port.data(), arguments.link, arguments.protocol, cancel, receiver);
  }
  DCB settings = PortSettings(arguments.speed.value_or(0), arguments.rts.value_or(RtsMode::kOn));
  return devapi::CreateReceiverOnSerial(
      port.data(), arguments.protocol, &settings, cancel, receiver);
}

std::string SilenceHint(const Arguments& arguments) {
  if (IsOneTry(arguments)) {
    return "Is it switched on, and is this its speed? Without --speed and --rts all are tried.";
  }
  return "Is it switched on, and is this the port of its cable? `rcvlink-cli ports` lists them.";
}

}  // namespace

Failure SearchFailure(const Arguments& arguments, long code) {
  const std::string port = Printable(arguments.port);
  Failure failure{.exit = ExitCode::kNoReceiver, .tried = "find a receiver", .code = code};
  const bool missing =
      code == ResultOfWin32(ERROR_FILE_NOT_FOUND) || code == ResultOfWin32(ERROR_PATH_NOT_FOUND);
  if (missing) {
    failure.meaning = port + " does not exist: nothing is plugged in there";
    failure.hint = "`rcvlink-cli ports` lists the ports of this computer.";
  } else if (code == ResultOfWin32(ERROR_ACCESS_DENIED)) {
    failure.meaning = "another program is using " + port;
    failure.hint = "Close that program and try again.";
  } else if (code == E_NOTIMPL && arguments.link == eInstanceAny) {
    failure.meaning =
        "no receiver on a serial port of that name, and this version does not reach "
        "receivers on USB yet";
    failure.hint = "With --link serial the reason is told.";
  } else if (code == E_NOTIMPL) {
    failure.meaning = "this version does not reach receivers on USB yet";
  } else if (code == S_FALSE || code == S_OK) {
    failure.meaning = "no receiver answered";
    failure.hint = SilenceHint(arguments);
  }
  return failure;
}

void* FindReceiver(Context& context) {
  void* receiver = nullptr;
  long code = S_OK;
  {
    const SearchNote note(context);
    code = Search(context, &receiver);
  }
  if (code == S_OK && receiver != nullptr) return receiver;
  Failure failure = SearchFailure(context.arguments, code);
  if (context.interrupt.requested()) {
    failure.exit = ExitCode::kCancelled;
    failure.meaning = "ended by Ctrl-C";
    failure.hint.clear();
  }
  throw failure;
}

}  // namespace cli
