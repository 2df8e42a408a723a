#include "names.h"

#include <windows.h>

#include <algorithm>
#include <array>

#include "text.h"

namespace cli {
namespace {

// 255 is the limit of one name on Windows' file systems.
constexpr size_t kLongestName = 255 - kPartSuffix.size();

bool IsForbidden(wchar_t character) {
  constexpr std::wstring_view kForbidden = L"<>:\"/\\|?*";
  return IsControl(character) || kForbidden.find(character) != std::wstring_view::npos;
}

std::wstring Escaped(wchar_t character) {
  constexpr size_t kDigits = 2;
  return L"%" + ToUtf16(Hex(character, kDigits));
}

bool IsPortNumber(std::wstring_view text) {
  // Windows takes the superscript digits 1 to 3 for digits here.
  constexpr std::wstring_view kDigits = L"0123456789\xB9\xB2\xB3";
  return text.size() == 1 && kDigits.find(text.front()) != std::wstring_view::npos;
}

// Names that reach a device in any folder, whatever follows their first dot.
bool IsDeviceName(std::wstring_view name) {
  constexpr std::array<std::wstring_view, 6> kReservedNames = {
      L"CON", L"PRN", L"AUX", L"NUL", L"CONIN$", L"CONOUT$"};
  std::wstring stem = Capitals(name.substr(0, name.find(L'.')));
  stem.erase(stem.find_last_not_of(L' ') + 1);
  if (std::find(kReservedNames.begin(), kReservedNames.end(), stem) != kReservedNames.end())
    return true;
  constexpr size_t kPortPrefix = 3;
  return (stem.starts_with(L"COM") || stem.starts_with(L"LPT")) &&
         IsPortNumber(std::wstring_view(stem).substr(kPortPrefix));
}

bool SurvivesAnsi(std::wstring_view name) {
  const int length = static_cast<int>(name.size());
  const int size =
      WideCharToMultiByte(CP_THREAD_ACP, 0, name.data(), length, nullptr, 0, nullptr, nullptr);
  std::string ansi(static_cast<size_t>(size), '\0');
  WideCharToMultiByte(CP_THREAD_ACP, 0, name.data(), length, ansi.data(), size, nullptr, nullptr);
  std::wstring back(name.size(), L'\0');
  const int units = MultiByteToWideChar(CP_THREAD_ACP, 0, ansi.data(), size, back.data(), length);
  return units == length && back == name;
}

}  // namespace

std::wstring Capitals(std::wstring_view text) {
  std::wstring capitals(text);
  CharUpperBuffW(capitals.data(), static_cast<DWORD>(capitals.size()));
  return capitals;
}

std::optional<std::string> WhyNotSendable(std::wstring_view name) {
  if (name.empty()) return "a file name is empty";
  const std::string quoted = "the file name " + Printable(name);
  if (std::any_of(name.begin(), name.end(), IsControl)) {
    return quoted + " contains a control character";
  }
  if (name.find_first_of(L"\"'") != std::wstring_view::npos) return quoted + " contains a quote";
  if (!SurvivesAnsi(name)) {
    return quoted + " has characters that this computer's code page does not have";
  }
  return std::nullopt;
}

std::optional<std::wstring> SafeLocalName(std::wstring_view name) {
  // Windows drops dots and spaces at the end, which would make two names one, or "..".
  const size_t trailing = name.find_last_not_of(L". ") + 1;
  std::wstring local = IsDeviceName(name) ? L"_" : L"";
  for (size_t i = 0; i < name.size(); ++i) {
    const bool plain = i < trailing && !IsForbidden(name[i]);
    local += plain ? std::wstring(1, name[i]) : Escaped(name[i]);
  }
  if (local.empty() || local.size() > kLongestName) return std::nullopt;
  return local;
}

bool IsPlainFileName(std::wstring_view name) { return SafeLocalName(name) == name; }

bool SameLocalName(std::wstring_view first, std::wstring_view second) {
  return Capitals(first) == Capitals(second);
}

std::wstring PlainPortName(std::wstring_view name) {
  constexpr std::wstring_view kPrefix = L"\\\\.\\";
  std::wstring_view plain = name;
  if (plain.starts_with(kPrefix)) plain.remove_prefix(kPrefix.size());
  if (plain.ends_with(L':')) plain.remove_suffix(1);
  return IsComPort(plain) ? Capitals(plain) : std::wstring(name);
}

bool IsComPort(std::wstring_view name) {
  constexpr std::wstring_view kPrefix = L"COM";
  return name.size() > kPrefix.size() && SameLocalName(name.substr(0, kPrefix.size()), kPrefix) &&
         name.find_first_not_of(L"0123456789", kPrefix.size()) == std::wstring_view::npos;
}

bool LooksLikePort(std::wstring_view name) {
  return name.starts_with(L"\\\\") || IsComPort(PlainPortName(name));
}

}  // namespace cli
