#include "platform/text.h"

#include <cstdio>
#include <new>

#include "platform/hresult.h"

namespace rcvlink {

UniqueBstr CopyBstr(const wchar_t* text) {
  if (!text) return nullptr;
  UniqueBstr copy(SysAllocString(text));
  if (!copy) throw HResultError(E_OUTOFMEMORY);
  return copy;
}

std::wstring ToWide(std::string_view text) {
  const int length = static_cast<int>(text.size());
  const int needed = MultiByteToWideChar(CP_THREAD_ACP, 0, text.data(), length, nullptr, 0);
  std::wstring wide(static_cast<size_t>(needed), L'\0');
  MultiByteToWideChar(CP_THREAD_ACP, 0, text.data(), length, wide.data(), needed);
  return wide;
}

std::string ToNarrow(std::wstring_view text) {
  const int length = static_cast<int>(text.size());
  const int needed =
      WideCharToMultiByte(CP_THREAD_ACP, 0, text.data(), length, nullptr, 0, nullptr, nullptr);
  std::string narrow(static_cast<size_t>(needed), '\0');
  WideCharToMultiByte(
      CP_THREAD_ACP, 0, text.data(), length, narrow.data(), needed, nullptr, nullptr);
  return narrow;
}

namespace {

// The length is measured first, since vsprintf_s does not cut a text that is too long, but fails.
template <typename Character, typename Measure, typename Print>
std::basic_string<Character> Format(const Character* format, Measure measure, Print print) {
  if (!format) throw HResultError(E_INVALIDARG);
  const int length = measure();
  if (length < 0) throw HResultError(E_FAIL);
  try {
    std::basic_string<Character> text(static_cast<size_t>(length) + 1, Character{});
    print(text.data(), text.size());
    text.pop_back();
    return text;
  } catch (const std::bad_alloc&) {
    throw HResultError(E_OUTOFMEMORY);
  }
}

}  // namespace

std::string FormatArguments(const char* format, va_list arguments) {
  return Format(
      format,
      [&] { return _vscprintf(format, arguments); },
      [&](char* text, size_t size) { vsprintf_s(text, size, format, arguments); });
}

std::wstring FormatArguments(const wchar_t* format, va_list arguments) {
  return Format(
      format,
      [&] { return _vscwprintf(format, arguments); },
      [&](wchar_t* text, size_t size) { vswprintf_s(text, size, format, arguments); });
}

std::string FormatText(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  std::string text = FormatArguments(format, arguments);
  va_end(arguments);
  return text;
}

}  // namespace rcvlink
