// Families, links and port settings: from the user's words to the library's numbers.
#ifndef RCVLINK_CLI_SETTINGS_H_
#define RCVLINK_CLI_SETTINGS_H_

#include <windows.h>

#include <optional>
#include <string>
#include <string_view>

#include "rcvlink.h"

namespace cli {

// The slowest and the fastest speed that a serial line may be asked for, in bits per second.
inline constexpr unsigned long kSlowestSpeed = 110;
inline constexpr unsigned long kFastestSpeed = 4'000'000;

// What a port of this computer does with its RTS line.
enum class RtsMode { kHandshake, kOn, kOff };

enum class Setting { kBaud, kParity, kStopBits, kRts };
enum class Parity : unsigned { kNone, kOdd, kEven };

// One change of the receiver's own port.
struct SettingChange {
  Setting setting = Setting::kBaud;
  // Bits per second, a `Parity`, the number of stop bits, or 1 for RTS on: by `setting`.
  unsigned long value = 0;
};

// "Quorin", "Velmar"; "unknown" for any other number.
std::string FamilyName(unsigned family);

// The same as a word of --protocol.
std::string FamilyWord(unsigned family);

// "handshake", "on" or "off", a word of --rts.
std::string RtsWord(RtsMode rts);

// The mode that such a word stands for; nothing for any other word.
std::optional<RtsMode> ParseRts(std::string_view word);

// The family that a word of `FamilyWord` stands for; nothing for any other word.
std::optional<EProtocol> ParseFamily(std::string_view word);

// Reads `SETTING VALUE` of the command line; nothing for other words.
std::optional<SettingChange> ParseSetting(std::string_view setting, std::string_view value);

// "baud rate", "parity", "stop bits", "RTS line"
std::string SettingName(Setting setting);

// The setting as the user would write it: "baud", "parity", "stopbits", "rts".
std::string SettingWord(Setting setting);

// The change's value as the user would write it.
std::string ValueWord(const SettingChange& change);

// The number that a receiver of the family takes for the change; nothing when that family does
// not offer it.
std::optional<unsigned long> FamilyNumber(const SettingChange& change, EProtocol family);

// Settings for a try on a port: 8 data bits, no parity, one stop bit.
// `speed`: bits per second; 0 keeps the port's own.
DCB PortSettings(unsigned long speed, RtsMode rts);

}  // namespace cli

#endif  // RCVLINK_CLI_SETTINGS_H_
