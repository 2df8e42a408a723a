#include "formats.h"

#include <algorithm>
#include <array>
#include <nlohmann/json.hpp>

#include "text.h"

namespace cli {
namespace {

constexpr uint64_t kSecondsPerMinute = 60;
constexpr uint64_t kMinutesPerHour = 60;
constexpr uint64_t kFullPercent = 100;

std::string Number(uint64_t value, size_t digits) {
  std::string text = std::to_string(value);
  return std::string(digits - std::min(digits, text.size()), '0') + text;
}

std::string TwoDigits(uint64_t value) {
  constexpr size_t kDigits = 2;
  return Number(value, kDigits);
}

std::string TimeLeft(const TransferState& state) {
  const uint64_t rate = state.rate;
  if (rate == 0) return "--";
  const uint64_t rest = state.total - std::min(state.done, state.total);
  return FormatDuration((rest + rate - 1) / rate);
}

// Fields of fixed width, so that the line does not jump while it changes.
std::string Figures(const TransferState& state) {
  constexpr size_t kPercentWidth = 3;
  constexpr size_t kSizeWidth = 8;
  constexpr size_t kLeftWidth = 11;
  return PadLeft(std::to_string(PercentOf(state)), kPercentWidth) + " %  " +
         PadLeft(FormatBytes(state.done), kSizeWidth) + " of " + FormatBytes(state.total) + "  " +
         PadLeft(FormatBytes(state.rate), kSizeWidth) + "/s  " +
         PadLeft(TimeLeft(state), kLeftWidth) + " left";
}

std::string Bar(unsigned percent) {
  constexpr size_t kBarWidth = 20;
  const size_t filled = percent * kBarWidth / kFullPercent;
  return PadRight(std::string(filled, '#'), kBarWidth);
}

}  // namespace

std::string FormatBytes(uint64_t bytes) {
  constexpr uint64_t kThousand = 1000;
  constexpr uint64_t kTenth = 100;  // of a thousand
  constexpr std::array<const char*, 3> kUnits = {" kB", " MB", " GB"};
  if (bytes < kThousand) return std::to_string(bytes) + " B";
  size_t unit = 0;
  while (bytes >= kThousand * kThousand && unit + 1 < kUnits.size()) {
    bytes /= kThousand;
    ++unit;
  }
  return std::to_string(bytes / kThousand) + "." + std::to_string(bytes % kThousand / kTenth) +
         kUnits[unit];
}

std::string FormatDuration(uint64_t seconds) {
  const uint64_t minutes = seconds / kSecondsPerMinute;
  if (minutes == 0) return std::to_string(seconds) + " s";
  if (minutes < kMinutesPerHour) {
    return std::to_string(minutes) + " min " + TwoDigits(seconds % kSecondsPerMinute) + " s";
  }
  return std::to_string(minutes / kMinutesPerHour) + " h " + TwoDigits(minutes % kMinutesPerHour) +
         " min";
}

std::string FormatTime(const SYSTEMTIME& time, char separator) {
  constexpr size_t kYearDigits = 4;
  const bool empty = time.wYear == 0 && time.wMonth == 0 && time.wDay == 0 && time.wHour == 0 &&
                     time.wMinute == 0 && time.wSecond == 0;
  if (empty) return "-";
  return Number(time.wYear, kYearDigits) + "-" + TwoDigits(time.wMonth) + "-" +
         TwoDigits(time.wDay) + separator + TwoDigits(time.wHour) + ":" + TwoDigits(time.wMinute) +
         ":" + TwoDigits(time.wSecond);
}

unsigned PercentOf(const TransferState& state) {
  if (state.done >= state.total) return kFullPercent;
  return static_cast<unsigned>(state.done * kFullPercent / state.total);
}

std::string ProgressBar(const TransferState& state, size_t width) {
  const std::string figures = Figures(state);
  std::string line = "[";
  line.append(Bar(PercentOf(state))).append("] ").append(figures);
  if (line.size() > width) return figures.substr(0, width);
  constexpr std::string_view kGap = "  ";
  if (line.size() + kGap.size() >= width) return line;
  const size_t room = width - line.size() - kGap.size();
  // A control character takes several columns.
  return line.append(kGap) + ToUtf8(ToUtf16(Printable(state.name)).substr(0, room));
}

std::string ProgressJson(const TransferState& state) {
  const nlohmann::ordered_json json = {{"file", ToUtf8(state.name)},
                                       {"done", state.done},
                                       {"total", state.total},
                                       {"percent", PercentOf(state)},
                                       {"rate", state.rate}};
  return json.dump();
}

std::string ProgressLine(const TransferState& state) {
  return Printable(state.name) + ": " + std::to_string(PercentOf(state)) + " %, " +
         FormatBytes(state.done) + " of " + FormatBytes(state.total) + ", " +
         FormatBytes(state.rate) + "/s, " + TimeLeft(state) + " left";
}

}  // namespace cli
