// The lines of a report, as the library wrote them.
#ifndef RCVLINK_CLI_TRACE_LINES_H_
#define RCVLINK_CLI_TRACE_LINES_H_

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace cli {

struct TraceLine {
  uint32_t ms_of_day = 0;
  uint32_t thread = 0;
  std::string bytes{};   // after the stamp, without the line end; in the writer's code page
  bool has_end = false;  // whether there was a line end
};

struct TraceLines {
  std::vector<TraceLine> lines{};
  size_t bytes_before = 0;  // how many bytes come before the first stamp
};

// Splits a report at its stamps, "hh:mm:ss.mmmm thread ". Lines without a stamp belong to the one
// before: receivers' replies have line ends in them. A line with bytes beyond ASCII may have lost
// its end, so that the next stamp stands in it.
TraceLines SplitTrace(std::string_view report);

}  // namespace cli

#endif  // RCVLINK_CLI_TRACE_LINES_H_
