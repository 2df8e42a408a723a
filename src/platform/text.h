// Text between UTF-16, the thread's ANSI code page and BSTRs.
#ifndef RCVLINK_PLATFORM_TEXT_H_
#define RCVLINK_PLATFORM_TEXT_H_

#include <cstdarg>
#include <memory>
#include <string>
#include <string_view>

#include "platform/win32.h"

#include <oleauto.h>

namespace rcvlink {

struct BstrDeleter {
  void operator()(wchar_t* text) const { SysFreeString(text); }
};

// Owns a BSTR; null is the empty state. release() hands it to a record of the host.
using UniqueBstr = std::unique_ptr<wchar_t, BstrDeleter>;

// A BSTR copy; null for a null text. Raises E_OUTOFMEMORY.
UniqueBstr CopyBstr(const wchar_t* text);

// Conversions in the thread's ANSI code page (CP_THREAD_ACP). A text that cannot be converted gives
// an empty one.
std::wstring ToWide(std::string_view text);
std::string ToNarrow(std::wstring_view text);

// The text that a format of Microsoft's printf makes. Raises E_INVALIDARG for a null format, E_FAIL
// for one that cannot be measured, E_OUTOFMEMORY.
std::string FormatText(const char* format, ...);
std::string FormatArguments(const char* format, va_list arguments);
std::wstring FormatArguments(const wchar_t* format, va_list arguments);

// Raises what FormatArguments raises for this format, and makes no text.
void CheckFormat(const char* format, va_list arguments);
void CheckFormat(const wchar_t* format, va_list arguments);

}  // namespace rcvlink

#endif  // RCVLINK_PLATFORM_TEXT_H_
