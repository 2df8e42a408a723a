#include "progress.h"

#include "text.h"

namespace cli {

Progress::Progress(Context& context, const TransferState& start) : context_(context) {
  if (context_.err.is_terminal()) {
    Show(start);
  } else {
    context_.PrintStatus("Downloading " + Printable(start.name) + ", " + FormatBytes(start.total) +
                         "\n");
  }
}

void Progress::Show(const TransferState& state) {
  constexpr std::uint64_t kLineIntervalMs = 5000;
  if (context_.err.is_terminal()) {
    // The last column stays free: a full line would wrap.
    const std::size_t width = context_.err.Width() - 1;
    context_.PrintStatus(Redrawn(ProgressBar(state, width), drawn_width_));
    drawn_width_ = width;
  } else if (state.elapsed_ms - last_line_ms_ >= kLineIntervalMs) {
    context_.PrintStatus(ProgressLine(state) + "\n");
    last_line_ms_ = state.elapsed_ms;
  }
}

Progress::~Progress() {
  if (drawn_width_ > 0) context_.PrintStatus(Erased(drawn_width_));
}

}  // namespace cli
