#include "trace_lines.h"

#include <algorithm>
#include <charconv>
#include <optional>
#include <utility>

namespace cli {
namespace {

constexpr std::string_view kTimePattern = "00:00:00.0000 ";  // a 0 stands for any digit
constexpr size_t kThreadWidth = 6;

struct Stamp {
  uint32_t ms_of_day = 0;
  uint32_t thread = 0;
  size_t length = 0;
};

bool IsDigit(char character) { return character >= '0' && character <= '9'; }

uint32_t NumberAt(std::string_view text, size_t position, size_t digits) {
  uint32_t number = 0;
  std::from_chars(text.data() + position, text.data() + position + digits, number);
  return number;
}

std::optional<uint32_t> TimeOf(std::string_view text) {
  constexpr size_t kMinuteAt = 3;
  constexpr size_t kSecondAt = 6;
  constexpr size_t kMsAt = 9;
  constexpr size_t kDigits = 2;
  constexpr size_t kMsDigits = 4;
  constexpr uint32_t kHours = 24;
  constexpr uint32_t kSixty = 60;
  constexpr uint32_t kThousand = 1000;
  if (text.size() < kTimePattern.size()) return std::nullopt;
  for (size_t i = 0; i < kTimePattern.size(); ++i) {
    if (kTimePattern[i] == '0' ? !IsDigit(text[i]) : text[i] != kTimePattern[i]) {
      return std::nullopt;
    }
  }
  const uint32_t hour = NumberAt(text, 0, kDigits);
  const uint32_t minute = NumberAt(text, kMinuteAt, kDigits);
  const uint32_t second = NumberAt(text, kSecondAt, kDigits);
  const uint32_t ms = NumberAt(text, kMsAt, kMsDigits);
  if (hour >= kHours || minute >= kSixty || second >= kSixty || ms >= kThousand) {
    return std::nullopt;
  }
  return ((hour * kSixty + minute) * kSixty + second) * kThousand + ms;
}

std::optional<Stamp> StampAt(std::string_view text) {
  const auto ms_of_day = TimeOf(text);
  if (!ms_of_day) return std::nullopt;
  const std::string_view rest = text.substr(kTimePattern.size());
  const size_t digits = std::min(rest.find_first_not_of(' '), rest.size());
  const size_t end = std::min(rest.find(' ', digits), rest.size());
  if (end < kThreadWidth || end == rest.size()) return std::nullopt;
  Stamp stamp{.ms_of_day = *ms_of_day, .length = kTimePattern.size() + end + 1};
  const char* const last = rest.data() + end;
  const auto [stop, error] = std::from_chars(rest.data() + digits, last, stamp.thread);
  if (error != std::errc() || stop != last) return std::nullopt;
  return stamp;
}

bool IsBeyondAscii(char character) { return static_cast<signed char>(character) < 0; }

// Removes the line end.
bool Trim(std::string& bytes) {
  const bool has_end = bytes.ends_with('\n');
  if (has_end) bytes.pop_back();
  if (has_end && bytes.ends_with('\r')) bytes.pop_back();
  return has_end;
}

}  // namespace

TraceLines SplitTrace(std::string_view report) {
  TraceLines result;
  bool may_begin = true;  // a stamp may begin here
  bool is_cut = false;    // the line has bytes beyond ASCII, so its end may be missing
  size_t position = 0;
  while (position < report.size()) {
    const auto stamp = may_begin || is_cut ? StampAt(report.substr(position)) : std::nullopt;
    if (stamp) {
      result.lines.push_back({.ms_of_day = stamp->ms_of_day, .thread = stamp->thread});
      position += stamp->length;
      may_begin = true;  // an entry that could not be converted has nothing but its stamp
      is_cut = false;
      continue;
    }
    const char byte = report[position++];
    may_begin = byte == '\n';
    is_cut = !may_begin && (is_cut || IsBeyondAscii(byte));
    if (result.lines.empty()) {
      ++result.bytes_before;
    } else {
      result.lines.back().bytes += byte;
    }
  }
  for (TraceLine& line : result.lines) line.has_end = Trim(line.bytes);
  return result;
}

}  // namespace cli
