#include "discovery.h"

#include <windows.h>

#include <filesystem>
#include <utility>
#include <vector>

#include "families.h"
#include "handle.h"
#include "names.h"
#include "port_list.h"
#include "rcvlink.h"
#include "text.h"

namespace cli {
namespace {

constexpr DWORD kShareAll = FILE_SHARE_READ | FILE_SHARE_WRITE;
// The prefix of a port's name for `CreateFileW`.
const std::wstring kDevices = L"\\\\.\\";

// Why a device cannot be opened; S_OK when it can. A search on USB does not report that: it just
// finds no receiver.
long WhyNotOpened(const std::wstring& device) {
  const UniqueHandle handle(
      CreateFileW(device.c_str(), 0, kShareAll, nullptr, OPEN_EXISTING, 0, nullptr));
  return handle.get() == INVALID_HANDLE_VALUE ? ResultOfWin32(GetLastError()) : S_OK;
}

bool IsOneTry(const Arguments& arguments) { return arguments.speed || arguments.rts; }

// The port of a search on a serial port.
class SearchedPort : public SweepPort {
 public:
  SearchedPort(const Context& context, std::wstring port, SearchDisplay& display)
      : context_(context),
        port_(std::move(port)),
        display_(display),
        there_(SUCCEEDED(WhyNotOpened(kDevices + port_))) {}

  long Ask(const LineSetting& line, EProtocol family, void** receiver) override {
    DCB settings = PortSettings(line.speed, line.rts);
    const HANDLE cancel = context_.interrupt.event();
    return devapi::CreateReceiverOnSerial(port_.data(), family, &settings, cancel, receiver);
  }

  void Begin(size_t number, size_t count, const LineSetting& line) override {
    // No line for a port that does not exist: the first try ends the search.
    if (there_) display_.Begin(port_, number, count, line);
  }

  bool IsCancelled() const override { return context_.interrupt.requested(); }

 private:
  const Context& context_;
  std::wstring port_;
  SearchDisplay& display_;
  bool there_;
};

std::vector<Try> TriesOn(const std::wstring& port,
                         const Arguments& arguments,
                         const PortMemory& memory) {
  const auto current = arguments.speed ? std::nullopt : CurrentSettings(port);
  const unsigned long port_speed = current ? current->BaudRate : 0;
  if (!IsOneTry(arguments)) {
    return PlanSweep(arguments.protocol, port_speed, memory.Recall(port));
  }
  const LineSetting line{arguments.speed.value_or(port_speed),
                         arguments.rts.value_or(RtsMode::kOn)};
  return {{line, FamiliesOf(arguments.protocol)}};
}

// The result of a search on one link.
struct SearchResult {
  long code = S_FALSE;
  FoundReceiver found{};
};

SearchResult SearchSerial(const Context& context,
                          const std::wstring& port,
                          SearchDisplay& display) {
  const Arguments& arguments = context.arguments;
  const PortMemory memory = MemoryOf(arguments);
  SearchedPort searched(context, port, display);
  const SweepResult result = RunSweep(TriesOn(port, arguments, memory), searched);
  if (result.receiver == nullptr) return {.code = result.code};
  // A speed of 0 would not help the next search.
  if (result.setting.line.speed != 0 && !memory.Remember(port, result.setting) &&
      arguments.verbose) {
    display.PrintStatus(UnwrittenMemory(port));
  }
  return {S_OK, {result.receiver, eInstanceSerial, result.setting}};
}

SearchResult SearchUsb(const Context& context, std::wstring device) {
  SearchResult result{.found = {nullptr, eInstanceUSB}};
  result.code = devapi::CreateReceiverOnUSB(
      device.data(), context.arguments.protocol, context.interrupt.event(), &result.found.handle);
  return result;
}

std::string SilenceHint(const Arguments& arguments, EInstanceType link) {
  if (link == eInstanceUSB) return "Is the receiver switched on, and is it a Quorin receiver?";
  if (IsOneTry(arguments)) {
    return "Is the receiver switched on, and is this its speed? Without --speed and --rts all "
           "settings are tried.";
  }
  return "Is the receiver switched on, and is its cable on this port? `rcvlink-cli ports` lists "
         "the ports.";
}

// Refuses a file of this computer as a port: commands would be written into it.
// Throws Failure.
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
                  .meaning = "it is a file of this computer and would be overwritten",
                  .hint = "Name the port first, then the files of the receiver."};
  }
}

bool IsMissing(long code) {
  return code == ResultOfWin32(ERROR_FILE_NOT_FOUND) ||
         code == ResultOfWin32(ERROR_PATH_NOT_FOUND) || code == ResultOfWin32(ERROR_INVALID_NAME);
}

// The family that answers in place of the one that was asked for; empty when none does. Asked for at
// known settings only: a sweep takes minutes.
std::string OtherFamily(const Context& context, std::wstring port) {
  const Arguments& arguments = context.arguments;
  if (arguments.protocol == eProtocolAny || !IsOneTry(arguments)) return {};
  DCB settings = PortSettings(arguments.speed.value_or(0), arguments.rts.value_or(RtsMode::kOn));
  for (const Family& other : kFamilies) {
    if (other.protocol == arguments.protocol) continue;
    void* receiver = nullptr;
    devapi::CreateReceiverOnSerial(
        port.data(), other.protocol, &settings, context.interrupt.event(), &receiver);
    if (receiver == nullptr) continue;
    devapi::CloseReceiver(receiver);
    return other.name;
  }
  return {};
}

// What a result of the search on a link means to the user.
Failure SearchFailure(const Arguments& arguments, const SearchPlace& place, long code) {
  const bool on_usb = place.link == eInstanceUSB;
  const std::string port = Printable(place.port);
  if (on_usb && SUCCEEDED(code)) {
    const long opening = WhyNotOpened(place.port);
    if (FAILED(opening)) code = opening;
  }
  Failure failure{
      .exit = ExitCode::kNoReceiver, .tried = "find a receiver", .port = port, .code = code};
  if (!on_usb && code == ResultOfWin32(ERROR_INVALID_NAME)) {
    failure.meaning = port + " is not the name of a COM port";
    failure.hint = PortsInWords(ListPorts(), place.link);
  } else if (IsMissing(code)) {
    failure.meaning = port + " does not exist: nothing is plugged in there";
    failure.hint = PortsInWords(ListPorts(), place.link);
    if (on_usb && IsComPort(place.port)) failure.hint += " COM ports are for --link serial.";
  } else if (code == ResultOfWin32(ERROR_ACCESS_DENIED)) {
    failure.meaning = "another program is using " + port;
    failure.hint = "Close that program and try again.";
  } else if (code == ResultOfWin32(ERROR_NOT_READY)) {
    failure.meaning = port + " exists, but its device does not answer";
    failure.hint = "Is the device switched on and in reach? Plug it in again, then try again.";
  } else if (SUCCEEDED(code)) {
    failure.meaning = "no receiver answered";
    failure.hint = SilenceHint(arguments, place.link);
  }
  return failure;
}

}  // namespace

long TryPort(const Context& context, EProtocol family, DCB settings, void** receiver) {
  std::wstring port = context.arguments.port;
  return devapi::CreateReceiverOnSerial(
      port.data(), family, &settings, context.interrupt.event(), receiver);
}

std::optional<DCB> CurrentSettings(const std::wstring& port) {
  const std::wstring path = kDevices + port;
  const UniqueHandle handle(CreateFileW(
      path.c_str(), GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, 0, nullptr));
  DCB settings{};
  settings.DCBlength = sizeof(settings);
  if (handle.get() == INVALID_HANDLE_VALUE) return std::nullopt;
  if (!GetCommState(handle.get(), &settings)) return std::nullopt;
  return settings;
}

PortMemory MemoryOf(const Arguments& arguments) {
  return PortMemory(arguments.no_memory ? std::filesystem::path() : PortMemory::UsualFile());
}

std::string UnwrittenMemory(const std::wstring& port) {
  return Printable(port) + ": the setting found could not be saved in " +
         Printable(PortMemory::UsualFile().native()) + "\n";
}

FoundReceiver FindReceiver(Context& context) {
  SearchDisplay display(context, 1);
  return FindReceiverAt(context, {context.arguments.port, context.arguments.link}, display);
}

FoundReceiver FindReceiverAt(const Context& context,
                             const SearchPlace& place,
                             SearchDisplay& display) {
  const Arguments& arguments = context.arguments;
  // The USB link would open a file of that name in the current folder. On the serial link COM7 is
  // always the port.
  if (!IsComPort(place.port) || place.link != eInstanceSerial) RefuseFile(place.port);
  const bool any = place.link == eInstanceAny;
  SearchPlace tried{place.port, any ? eInstanceSerial : place.link};
  SearchResult result = tried.link == eInstanceUSB ? SearchUsb(context, place.port)
                                                   : SearchSerial(context, place.port, display);
  if (any && result.found.handle == nullptr && !context.interrupt.requested()) {
    if (arguments.verbose) {
      Failure failure = SearchFailure(arguments, tried, result.code);
      failure.tried = "find a receiver on a serial port";
      display.PrintFailure(failure);
    }
    tried.link = eInstanceUSB;
    result = SearchUsb(context, place.port);
  }
  if (result.found.handle != nullptr) return result.found;
  Failure failure = SearchFailure(arguments, tried, result.code);
  if (context.interrupt.requested()) {
    failure.exit = ExitCode::kCancelled;
    failure.meaning = "ended by Ctrl-C";
    failure.hint.clear();
  } else if (tried.link == eInstanceSerial && result.code == S_FALSE) {
    if (const std::string family = OtherFamily(context, place.port); !family.empty()) {
      failure.meaning = "a " + family + " receiver answered instead";
      failure.hint = "Leave out --protocol, or use --protocol " + Lowered(family) + ".";
    }
  } else if (any) {
    failure.tried =
        arguments.verbose ? "find a receiver on USB" : "find a receiver on a serial port or on USB";
    if (!arguments.verbose) failure.hint = "--verbose shows the reason for each link.";
  }
  throw failure;
}

}  // namespace cli
