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

int CountCharacters(const char* format, va_list arguments) { return _vscprintf(format, arguments); }
int CountCharacters(const wchar_t* format, va_list arguments) {
  return _vscwprintf(format, arguments);
}

void Print(std::string& text, const char* format, va_list arguments) {
  vsprintf_s(text.data(), text.size(), format, arguments);
}
void Print(std::wstring& text, const wchar_t* format, va_list arguments) {
  vswprintf_s(text.data(), text.size(), format, arguments);
}

template <typename Character>
size_t Measure(const Character* format, va_list arguments) {
  if (!format) throw HResultError(E_INVALIDARG);
  const int length = CountCharacters(format, arguments);
  if (length < 0) throw HResultError(E_FAIL);
  return static_cast<size_t>(length);
}

// The length is measured first, since vsprintf_s does not cut a text that is too long, but fails.
template <typename Character>
std::basic_string<Character> Format(const Character* format, va_list arguments) {
  const size_t length = Measure(format, arguments);
  try {
    std::basic_string<Character> text(length + 1, Character{});
    Print(text, format, arguments);
    text.pop_back();
    return text;
  } catch (const std::bad_alloc&) {
    throw HResultError(E_OUTOFMEMORY);
  }
}

}  // namespace

std::string FormatArguments(const char* format, va_list arguments) {
  return Format(format, arguments);
}

std::wstring FormatArguments(const wchar_t* format, va_list arguments) {
  return Format(format, arguments);
}

void CheckFormat(const char* format, va_list arguments) { Measure(format, arguments); }

void CheckFormat(const wchar_t* format, va_list arguments) { Measure(format, arguments); }

std::string FormatText(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  std::string text = FormatArguments(format, arguments);
  va_end(arguments);
  return text;
}

}  // namespace rcvlink
