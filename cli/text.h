// Text between the program, the receiver and the screen.
#ifndef RCVLINK_CLI_TEXT_H_
#define RCVLINK_CLI_TEXT_H_

#include <string>
#include <string_view>

namespace cli {

std::string ToUtf8(std::wstring_view text);
std::wstring ToUtf16(std::string_view text);

// Whether a character controls a terminal or the direction of writing instead of showing itself.
bool IsControl(wchar_t character);

// A name from the receiver or the command line, as UTF-8 that is safe on a terminal: characters
// that control it are written as \x1B or \u202E.
std::string Printable(std::wstring_view text);

// "0x8007048F"
std::string HexCode(long code);

// Hexadecimal digits in capitals, at least `digits` of them.
std::string Hex(unsigned long value, size_t digits);

// In lower case, ASCII letters only.
std::string Lowered(std::string text);

// How many letters have to be added, removed or changed to turn one word into the other.
size_t ChangesBetween(std::string_view first, std::string_view second);

std::string PadLeft(std::string text, size_t width);
std::string PadRight(std::string text, size_t width);

// Draws a terminal's last line anew: back to its beginning, the text, and blanks up to `width`
// over what was there.
std::string Redrawn(const std::string& line, size_t width);

// Erases a line of that width.
std::string Erased(size_t width);

}  // namespace cli

#endif  // RCVLINK_CLI_TEXT_H_
