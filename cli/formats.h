// Sizes, times and the progress of a download in words.
#ifndef RCVLINK_CLI_FORMATS_H_
#define RCVLINK_CLI_FORMATS_H_

#include <windows.h>

#include <cstdint>
#include <string>

namespace cli {

inline constexpr uint32_t kMsPerSecond = 1000;

// "512 B", "1.2 MB": thousands, as in the speed of a line.
std::string FormatBytes(uint64_t bytes);

// "45 s", "2 min 05 s", "1 h 02 min"
std::string FormatDuration(uint64_t seconds);

// "2024-05-01 12:00:00" with `separator` between date and time; "-" for a time that is all zero.
std::string FormatTime(const SYSTEMTIME& time, char separator = ' ');

// How far a download is.
struct TransferState {
  std::wstring name{};
  uint64_t done = 0;   // bytes
  uint64_t total = 0;  // bytes that the receiver listed
  uint64_t rate = 0;   // bytes a second right now; 0 while it is not known
};

// 0 to 100; 100 only when all has arrived.
unsigned PercentOf(const TransferState& state);

// One line without line end: bar, percent, bytes, rate, time left, name; not wider than `width`.
std::string ProgressBar(const TransferState& state, size_t width);

// The same for a reader that is no terminal: no bar.
std::string ProgressLine(const TransferState& state);

// The same for a program: {"file", "done", "total", "percent", "rate"}
std::string ProgressJson(const TransferState& state);

}  // namespace cli

#endif  // RCVLINK_CLI_FORMATS_H_
