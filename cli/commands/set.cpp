#include <optional>

#include "command.h"
#include "discovery.h"
#include "options.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

// Locks the receiver for this thread.
class ReceiverLock {
 public:
  // Throws Failure when it cannot be locked.
  ReceiverLock(const Context& context, Receiver& receiver, const std::string& tried)
      : receiver_(receiver.handle()) {
    const long code = devapi::LockConnection(receiver_, context.interrupt.event());
    if (code != S_OK) throw receiver.FailureOf(tried, code);
  }
  ~ReceiverLock() { devapi::UnlockConnection(receiver_); }
  ReceiverLock(const ReceiverLock&) = delete;
  ReceiverLock& operator=(const ReceiverLock&) = delete;

 private:
  void* receiver_;
};

long Send(void* receiver, Setting setting, unsigned long number) {
  const auto byte = static_cast<unsigned char>(number);
  switch (setting) {
    case Setting::kBaud:
      return devapi::DCSetRcvBaudrate(receiver, number);
    case Setting::kParity:
      return devapi::DCSetRcvParity(receiver, byte);
    case Setting::kStopBits:
      return devapi::DCSetRcvStopbits(receiver, byte);
    case Setting::kRts:
      return devapi::DCSetRcvRTSControl(receiver, byte);
  }
  return E_UNEXPECTED;
}

// The port's settings with which a receiver answers after the change.
DCB Changed(DCB settings, const SettingChange& change) {
  switch (change.setting) {
    case Setting::kBaud:
      settings.BaudRate = change.value;
      break;
    case Setting::kParity:
      settings.Parity = NOPARITY;
      if (change.value == static_cast<unsigned long>(Parity::kOdd)) settings.Parity = ODDPARITY;
      if (change.value == static_cast<unsigned long>(Parity::kEven)) settings.Parity = EVENPARITY;
      settings.fParity = settings.Parity != NOPARITY;
      break;
    case Setting::kStopBits:
      settings.StopBits = change.value == 1 ? ONESTOPBIT : TWOSTOPBITS;
      break;
    case Setting::kRts:
      break;
  }
  return settings;
}

bool AnswersAt(const Context& context, EProtocol family, const DCB& settings) {
  void* receiver = nullptr;
  TryPort(context, family, settings, &receiver);
  if (receiver == nullptr) return false;
  devapi::CloseReceiver(receiver);
  return true;
}

// Saves the setting for the next command; without one, deletes the saved one.
void Remember(Context& context, const std::optional<KnownSetting>& setting) {
  const Arguments& arguments = context.arguments;
  const PortMemory memory = MemoryOf(arguments);
  const bool written =
      setting ? memory.Remember(arguments.port, *setting) : memory.Forget(arguments.port);
  if (!written && arguments.verbose) context.PrintStatus(UnwrittenMemory(arguments.port));
}

// Whether this program looks for receivers with that setting.
bool IsFoundAgain(const SettingChange& change) {
  if (change.setting == Setting::kParity) {
    return change.value == static_cast<unsigned long>(Parity::kNone);
  }
  return change.setting != Setting::kStopBits || change.value == 1;
}

std::string Advice(const SettingChange& change) {
  if (change.setting == Setting::kBaud) {
    return "  Use --speed " + std::to_string(change.value) + " from now on.\n";
  }
  if (IsFoundAgain(change)) return "";
  return "  This program cannot find the receiver again: it uses no parity and one stop bit.\n";
}

// Parses setting and value.
// Throws Failure when they are invalid.
SettingChange CheckedChange(const std::wstring& setting, const std::wstring& value) {
  const auto change = ParseSetting(Lowered(ToUtf8(setting)), Lowered(ToUtf8(value)));
  if (!change) {
    throw UsageError("unknown setting " + Printable(setting) + " " + Printable(value) +
                     "; the settings are baud 110 to 4000000, parity none, odd or even, stopbits 1 "
                     "or 2, and rts on or off");
  }
  return *change;
}

class Set : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& app, Arguments& arguments) override {
    AddPort(app, arguments);
    AddText(app, "SETTING", "baud, parity, stopbits or rts", "", setting_, Need::kRequired);
    AddText(app,
            "VALUE",
            "Bits per second; none, odd, even; 1, 2; on, off",
            "",
            value_,
            Need::kRequired);
    AddFlag(app, "--yes", "Also set values that this program cannot use itself", yes_);
  }

  void Check() const override {
    const SettingChange change = CheckedChange(setting_, value_);
    if (yes_ || IsFoundAgain(change)) return;
    throw UsageError("with that " + SettingName(change.setting) +
                     " this program would not find the receiver again, as it uses no parity and "
                     "one stop bit; --yes sets it anyway");
  }

  Outcome Run(Context& context) override {
    const Arguments& arguments = context.arguments;
    const SettingChange change = CheckedChange(setting_, value_);
    const std::string name = SettingName(change.setting);
    const std::string tried = "set the receiver's " + name + " to " + ValueWord(change);
    std::optional<KnownSetting> found = Change(context, change, tried);
    // The RTS line cannot be checked from here, nor can the receiver's port over USB.
    const bool confirmed = found && change.setting != Setting::kRts;
    if (confirmed) {
      Confirm(context, found->family, change, tried);
      if (change.setting == Setting::kBaud) {
        found->line.speed = change.value;
        Remember(context, found);
      }
    }
    context.PrintDone(
        Printable(arguments.port) + ": the receiver's " + name + " was set to " +
        ValueWord(change) +
        (confirmed ? ", and it answers with that setting.\n" : "; this could not be confirmed.\n") +
        Advice(change));
    return {.document = {{"port", ToUtf8(arguments.port)},
                         {"setting", SettingWord(change.setting)},
                         {"value", ValueWord(change)},
                         {"confirmed", confirmed}}};
  }

 private:
  // Sends the change and closes the receiver.
  // Returns the setting at which it was found; nothing on USB.
  // Throws Failure.
  static std::optional<KnownSetting> Change(Context& context,
                                            const SettingChange& change,
                                            const std::string& tried) {
    Receiver receiver(context);
    const unsigned family = receiver.Family();
    const auto number = FamilyNumber(change, static_cast<EProtocol>(family));
    if (!number) {
      throw Failure{.tried = tried,
                    .code = E_NOTIMPL,
                    .meaning = "a " + FamilyName(family) + " receiver cannot change its " +
                               SettingName(change.setting)};
    }
    const ReceiverLock lock(context, receiver, tried);
    receiver.ThrowIfCancelled(tried);
    const long code = Send(receiver.handle(), change.setting, *number);
    if (code != S_OK) throw receiver.FailureOf(tried, code);
    return receiver.setting();
  }

  // Asks the receiver at its new setting, and when it does not answer there, at the old one.
  // Throws Failure when it was not changed, or is lost.
  static void Confirm(Context& context,
                      EProtocol family,
                      const SettingChange& change,
                      const std::string& tried) {
    const auto before = CurrentSettings(context.arguments.port);
    if (before && AnswersAt(context, family, Changed(*before, change))) return;
    const bool as_before =
        before && !context.interrupt.requested() && AnswersAt(context, family, *before);
    Failure failure{.tried = tried, .code = ResultOfWin32(ERROR_DEVICE_NOT_CONNECTED)};
    // A question that Ctrl-C ended says nothing of the receiver.
    if (!as_before && context.interrupt.requested()) {
      failure.exit = ExitCode::kCancelled;
      failure.meaning = "ended by Ctrl-C before the change was confirmed";
    } else if (as_before) {
      failure.meaning = "refused: the receiver still answers with the old setting";
      failure.hint = "Receivers accept only certain values, such as 115200, 57600 or 9600.";
    } else {
      failure.exit = ExitCode::kNoReceiver;
      failure.meaning = "the receiver answers neither with the new setting nor with the old one";
      failure.hint = "`rcvlink-cli find` tries all the usual speeds.";
      Remember(context, std::nullopt);
    }
    throw failure;
  }

  std::wstring setting_;
  std::wstring value_;
  bool yes_ = false;
};

}  // namespace

std::unique_ptr<Command> MakeSet() {
  return std::make_unique<Set>(Command::Text{
      "set",
      "Change the settings of the receiver's own port",
      "The receiver's own port is changed; from then on it answers with the new setting only.\n"
      "The program then checks whether it answers.\n"
      "Examples:\n"
      "  rcvlink-cli set COM7 baud 115200\n"
      "  rcvlink-cli set COM7 parity none"});
}

}  // namespace cli
