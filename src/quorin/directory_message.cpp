#include "quorin/directory_message.h"

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <string>

#include "platform/hresult.h"
#include "platform/text.h"

using rcvlink::HResultError;
using rcvlink::ToWide;

namespace QuorinCommands {
namespace {

constexpr size_t kMaxNameBytes = 32;  // names of receivers are not longer
constexpr int kDecimal = 10;
constexpr int kTmYearBase = 1900;
constexpr int kEpochYear = 1988;

// The time from which receivers count, in the runtime library's seconds.
int64_t ReceiverEpoch() {
  std::tm epoch{};
  epoch.tm_year = kEpochYear - kTmYearBase;
  epoch.tm_mday = 1;
  epoch.tm_isdst = -1;  // the runtime library finds out whether it was daylight saving time
  const int64_t seconds = _mktime64(&epoch);
  if (seconds == -1) throw HResultError(E_INVALIDARG);
  return seconds;
}

}  // namespace

std::optional<SYSTEMTIME> TimeFromReceiver(int64_t seconds) {
  int64_t since_1970 = 0;
  std::tm local{};
  if (__builtin_add_overflow(ReceiverEpoch(), seconds, &since_1970) ||
      _localtime64_s(&local, &since_1970) != 0) {
    return std::nullopt;
  }
  return SYSTEMTIME{.wYear = static_cast<WORD>(local.tm_year + kTmYearBase),
                    .wMonth = static_cast<WORD>(local.tm_mon + 1),
                    .wDayOfWeek = static_cast<WORD>(local.tm_wday),
                    .wDay = static_cast<WORD>(local.tm_mday),
                    .wHour = static_cast<WORD>(local.tm_hour),
                    .wMinute = static_cast<WORD>(local.tm_min),
                    .wSecond = static_cast<WORD>(local.tm_sec),
                    .wMilliseconds = 0};
}

DirectoryMessage ParseDirectoryMessage(std::string_view text) {
  DirectoryMessage message;
  text = text.substr(0, text.find('\0'));
  const size_t start = text.find_first_not_of("{ ");
  if (start == std::string_view::npos) return message;
  text.remove_prefix(start);
  if (text.front() == '}') {
    message.kind = DirectoryMessage::Kind::kEnd;
    return message;
  }

  message.kind = DirectoryMessage::Kind::kEntry;
  const std::string_view name = text.substr(0, text.find(','));
  message.entry.name = ToWide(name.substr(0, kMaxNameBytes));
  text.remove_prefix(std::min(name.size() + 1, text.size()));

  const std::string numbers(text);
  char* end_of_size = nullptr;
  message.entry.size = static_cast<uint32_t>(std::strtoul(numbers.c_str(), &end_of_size, kDecimal));
  const char* const time = *end_of_size == '\0' ? end_of_size : end_of_size + 1;
  const int64_t seconds = std::strtoll(time, nullptr, kDecimal);
  // A file whose time cannot be read stays in the list: it can be downloaded all the same.
  message.entry.time = TimeFromReceiver(seconds).value_or(SYSTEMTIME{});
  message.last = numbers.find("}}") != std::string::npos;
  return message;
}

}  // namespace QuorinCommands
