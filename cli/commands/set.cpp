#include <algorithm>

#include "command.h"
#include "options.h"
#include "receiver.h"
#include "text.h"

namespace cli {
namespace {

/// Keeps the receiver for this thread.
class ReceiverLock {
 public:
  /// @throws Failure when it cannot be had
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

std::string Advice(const SettingChange& change) {
  if (change.setting == Setting::kBaud) {
    return "  Open it with --speed " + std::to_string(change.value) + " from now on.\n";
  }
  return "  Open its port with this setting from now on. (--speed and --rts mean no parity and one "
         "stop bit.)\n";
}

/// What the words ask for.
/// @throws Failure when they make no sense
SettingChange CheckedChange(const std::wstring& setting, const std::wstring& value) {
  const auto change = ParseSetting(Lowered(ToUtf8(setting)), Lowered(ToUtf8(value)));
  if (!change) {
    throw UsageError("`set` does not know " + Printable(setting) + " " + Printable(value) +
                     "; there is baud 110 to 4000000, parity none, odd or even, stopbits 1 or 2, "
                     "and rts on or off");
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
  }

  void Check() const override { CheckedChange(setting_, value_); }

  Outcome Run(Context& context) override {
    const Arguments& arguments = context.arguments;
    const SettingChange change = CheckedChange(setting_, value_);
    const std::string name = SettingName(change.setting);
    const std::string tried = "set the receiver's " + name + " to " + ValueWord(change);
    Receiver receiver(context);
    const Identity identity = receiver.Identify();
    const auto family = static_cast<EProtocol>(identity.family);
    const auto number = FamilyNumber(change, family);
    if (!number) {
      throw Failure{.tried = tried,
                    .code = E_NOTIMPL,
                    .meaning = "a " + FamilyName(identity.family) +
                               " receiver does not offer to control its " + name};
    }
    const ReceiverLock lock(context, receiver, tried);
    receiver.ThrowIfCancelled(tried);
    const long code = Send(receiver.handle(), change.setting, *number);
    if (code != S_OK) throw receiver.FailureOf(tried, code);
    context.PrintDone(Printable(arguments.port) + ": the receiver's " + name + " was set to " +
                      ValueWord(change) + "; it does not confirm that.\n" + Advice(change));
    return {.document = {{"port", ToUtf8(arguments.port)},
                         {"setting", SettingWord(change.setting)},
                         {"value", ValueWord(change)}}};
  }

 private:
  std::wstring setting_;
  std::wstring value_;
};

}  // namespace

std::unique_ptr<Command> MakeSet() {
  return std::make_unique<Set>(Command::Text{
      "set",
      "Change the receiver's own port settings",
      "The change is the receiver's: from then on its port is reached with the new setting only.\n"
      "Examples:\n"
      "  rcvlink-cli set COM7 baud 115200\n"
      "  rcvlink-cli set COM7 parity none"});
}

}  // namespace cli
