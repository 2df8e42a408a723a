#include "progress.h"

#include "text.h"

namespace cli {

Progress::Progress(Context& context, const TransferState& start)
    : context_(context), mode_(ProgressModeOf(context)) {
  // Before the first byte arrives both sides agree on the speed of the line.
  const std::string line = "Downloading " + Printable(start.name) + ", " + FormatBytes(start.total);
  if (mode_ == ProgressMode::kBar) Draw(line + ": preparing ...");
  if (mode_ == ProgressMode::kLines) context_.err.Write(line + "\n");
  if (mode_ == ProgressMode::kJson) context_.err.Write(ProgressJson(start) + "\n");
}

void Progress::Show(TransferState state, uint64_t elapsed_ms) {
  constexpr uint64_t kLineIntervalMs = 5000;
  constexpr uint64_t kJsonIntervalMs = 1000;
  if (mode_ == ProgressMode::kNone || state.done == 0) return;
  rate_.Add(elapsed_ms, state.done);
  state.rate = rate_.BytesPerSecond();
  if (mode_ == ProgressMode::kBar) {
    // The last column stays free, because a full line would wrap.
    Draw(ProgressBar(state, context_.err.Width() - 1));
    return;
  }
  const bool json = mode_ == ProgressMode::kJson;
  if (elapsed_ms - last_line_ms_ < (json ? kJsonIntervalMs : kLineIntervalMs)) return;
  context_.err.Write((json ? ProgressJson(state) : ProgressLine(state)) + "\n");
  last_line_ms_ = elapsed_ms;
}

void Progress::Draw(const std::string& line) {
  const size_t width = context_.err.Width() - 1;
  const std::string shown = line.substr(0, width);
  context_.err.Write(Redrawn(shown, drawn_width_));
  drawn_width_ = shown.size();
}

Progress::~Progress() {
  if (drawn_width_ > 0) context_.err.Write(Erased(drawn_width_));
}

}  // namespace cli
