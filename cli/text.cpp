#include "text.h"

#include <windows.h>

#include <algorithm>
#include <cctype>
#include <charconv>
#include <numeric>
#include <vector>

namespace cli {
namespace {

constexpr int kHexBase = 16;
constexpr size_t kCodeDigits = 8;

bool IsBetween(wchar_t character, wchar_t first, wchar_t last) {
  return character >= first && character <= last;
}

}  // namespace

std::string ToUtf8(std::wstring_view text) {
  const int length = static_cast<int>(text.size());
  const int size =
      WideCharToMultiByte(CP_UTF8, 0, text.data(), length, nullptr, 0, nullptr, nullptr);
  std::string utf8(static_cast<size_t>(size), '\0');
  WideCharToMultiByte(CP_UTF8, 0, text.data(), length, utf8.data(), size, nullptr, nullptr);
  return utf8;
}

std::wstring ToUtf16(std::string_view text) {
  const int length = static_cast<int>(text.size());
  const int size = MultiByteToWideChar(CP_UTF8, 0, text.data(), length, nullptr, 0);
  std::wstring utf16(static_cast<size_t>(size), L'\0');
  MultiByteToWideChar(CP_UTF8, 0, text.data(), length, utf16.data(), size);
  return utf16;
}

bool IsControl(wchar_t character) {
  return IsBetween(character, L'\0', L'\x1F') || IsBetween(character, L'\x7F', L'\x9F') ||
         IsBetween(character, L'\x200E', L'\x200F') ||  // marks of the direction of writing
         IsBetween(character, L'\x2028', L'\x202E') ||  // line separators, direction overrides
         IsBetween(character, L'\x2066', L'\x2069');    // direction isolates
}

std::string Printable(std::wstring_view text) {
  constexpr size_t kByteDigits = 2;
  constexpr size_t kUnitDigits = 4;
  constexpr wchar_t kLastByte = L'\xFF';
  std::wstring shown;
  for (const wchar_t character : text) {
    if (!IsControl(character)) {
      shown += character;
    } else if (character <= kLastByte) {
      shown += L"\\x" + ToUtf16(Hex(character, kByteDigits));
    } else {
      shown += L"\\u" + ToUtf16(Hex(character, kUnitDigits));
    }
  }
  return ToUtf8(shown);
}

std::string HexCode(long code) { return "0x" + Hex(static_cast<unsigned long>(code), kCodeDigits); }

std::string Hex(unsigned long value, size_t digits) {
  char buffer[kCodeDigits];
  const auto end = std::to_chars(buffer, buffer + kCodeDigits, value, kHexBase).ptr;
  std::string text(buffer, end);
  std::transform(text.begin(), text.end(), text.begin(), [](char digit) {
    return static_cast<char>(std::toupper(static_cast<unsigned char>(digit)));
  });
  return std::string(digits - std::min(digits, text.size()), '0') + text;
}

std::string Lowered(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(), [](char letter) {
    return static_cast<char>(std::tolower(static_cast<unsigned char>(letter)));
  });
  return text;
}

size_t ChangesBetween(std::string_view first, std::string_view second) {
  std::vector<size_t> row(second.size() + 1);
  std::iota(row.begin(), row.end(), size_t{0});
  for (size_t i = 0; i < first.size(); ++i) {
    size_t diagonal = row[0];
    row[0] = i + 1;
    for (size_t j = 0; j < second.size(); ++j) {
      const size_t changed = diagonal + (first[i] == second[j] ? 0 : 1);
      diagonal = row[j + 1];
      row[j + 1] = std::min({changed, row[j] + 1, row[j + 1] + 1});
    }
  }
  return row.back();
}

std::string PadLeft(std::string text, size_t width) {
  text.insert(0, width - std::min(width, text.size()), ' ');
  return text;
}

std::string PadRight(std::string text, size_t width) {
  text.append(width - std::min(width, text.size()), ' ');
  return text;
}

std::string Redrawn(const std::string& line, size_t width) {
  return std::string("\r").append(PadRight(line, width));
}

std::string Erased(size_t width) { return Redrawn("", width).append("\r"); }

}  // namespace cli
