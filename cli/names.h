// Which file names may be sent to a receiver, and which names its files get on this computer.
#ifndef RCVLINK_CLI_NAMES_H_
#define RCVLINK_CLI_NAMES_H_

#include <optional>
#include <string>
#include <string_view>

namespace cli {

// Appended to a download's name until it is complete.
inline constexpr std::wstring_view kPartSuffix = L".part";

// Why a file name must not reach a command of the receiver; nothing when it may. A name is sent
// in the ANSI code page, so one that the page cannot carry unchanged is refused as well: its
// replacement could be a quote.
std::optional<std::string> WhyNotSendable(std::wstring_view name);

// The name under which a receiver's file is kept: one plain name inside the output folder. What
// Windows forbids or gives a meaning (separators, colons, control characters, trailing dots) is
// written as % and its hexadecimal code, and a device's name gets a leading underscore. Nothing
// when the name is empty or too long.
std::optional<std::wstring> SafeLocalName(std::wstring_view name);

// Whether the name is a plain one that `SafeLocalName` leaves as it is.
bool IsPlainFileName(std::wstring_view name);

// Whether the file system takes both for the same name.
bool SameLocalName(std::wstring_view first, std::wstring_view second);

// In capitals, as the file system compares names.
std::wstring Capitals(std::wstring_view text);

// A COM port as it is listed, from the ways in which people write one: `com7`, `COM7:`,
// `\\.\COM7`. Any other name stays as it is.
std::wstring PlainPortName(std::wstring_view name);

// Whether the name is COM and a number, in any letter case.
bool IsComPort(std::wstring_view name);

// Whether the name is a COM port's in one of the ways in which people write it, or the path of a
// device.
bool LooksLikePort(std::wstring_view name);

}  // namespace cli

#endif  // RCVLINK_CLI_NAMES_H_
