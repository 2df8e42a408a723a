// Included before every source that is compiled for Linux with Wine's headers. The headers of the C++
// library and of GoogleTest come first: they are to see Linux, all that follows sees Windows.
#ifndef RCVLINK_TESTS_NATIVE_PREFIX_H_
#define RCVLINK_TESTS_NATIVE_PREFIX_H_

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <malloc.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <charconv>
#include <chrono>
#include <condition_variable>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <cwchar>
#include <deque>
#include <filesystem>
#include <functional>
#include <future>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <random>
#include <regex>
#include <span>
#include <sstream>
#include <string>
#include <thread>
#include <unordered_map>
#include <variant>
#include <vector>

#define WIN32
#define _WIN32
#define WIN64
#define _WIN64
#define WINE_UNICODE_NATIVE  // wchar_t has two bytes
#define __declspec(x) __declspec_##x
#define __declspec_dllimport
#define __declspec_dllexport
#define __declspec_align(x) __attribute__((aligned(x)))

#define _msize malloc_usable_size

#define WIN32_LEAN_AND_MEAN
#define NOMINMAX
#define tagDCB _DCB  // MinGW's name of it
#include <windows.h>
#undef tagDCB
#define _MINWINBASE_  // as MinGW marks that it was included

#include <objidl.h>
#include <oleauto.h>

// Wine's headers have Windows 3's codes of the speeds.
#undef CBR_110
#define CBR_110 110
#undef CBR_300
#define CBR_300 300
#undef CBR_600
#define CBR_600 600
#undef CBR_1200
#define CBR_1200 1200
#undef CBR_2400
#define CBR_2400 2400
#undef CBR_4800
#define CBR_4800 4800
#undef CBR_9600
#define CBR_9600 9600
#undef CBR_14400
#define CBR_14400 14400
#undef CBR_19200
#define CBR_19200 19200
#undef CBR_38400
#define CBR_38400 38400
#undef CBR_56000
#define CBR_56000 56000
#undef CBR_57600
#define CBR_57600 57600
#undef CBR_115200
#define CBR_115200 115200
#undef CBR_128000
#define CBR_128000 128000
#undef CBR_256000
#define CBR_256000 256000

#include "tests/native/microsoft_arguments.h"

#undef va_list
#undef va_start
#undef va_end
#define va_list char*
#define va_start(list, format)                                                               \
  __builtin_va_list linux_##list;                                                            \
  __builtin_va_start(linux_##list, format);                                                  \
  MicrosoftArguments<std::remove_cvref_t<decltype(*format)>> values_of_##list(format,        \
                                                                              linux_##list); \
  __builtin_va_end(linux_##list);                                                            \
  list = values_of_##list.data()
#define va_end(list)

// Microsoft's C runtime, which Wine has in a DLL (runtime.cpp).
int _vscprintf(const char* format, va_list arguments);
int _vscwprintf(const wchar_t* format, va_list arguments);
int vsprintf_s(char* text, size_t size, const char* format, va_list arguments);
int vswprintf_s(wchar_t* text, size_t size, const wchar_t* format, va_list arguments);
int sprintf_s(char* text, size_t size, const char* format, ...);
int _wtoi(const wchar_t* text);
double _wtof(const wchar_t* text);
int _putenv(const char* text);
void _tzset();
int64_t _mktime64(std::tm* local);
int _localtime64_s(std::tm* local, const int64_t* seconds);

#endif  // RCVLINK_TESTS_NATIVE_PREFIX_H_
