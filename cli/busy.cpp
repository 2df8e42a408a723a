#include "busy.h"

#include <windows.h>

#include <algorithm>
#include <chrono>
#include <utility>

#include "formats.h"
#include "text.h"

namespace cli {

Busy::Busy(Context& context, std::string what)
    : context_(context), what_(std::move(what)), start_ms_(GetTickCount64()) {
  constexpr std::chrono::milliseconds kInterval{1000};
  if (ProgressModeOf(context) != ProgressMode::kBar) return;
  ticker_.emplace(kInterval, [this] { Draw(); });
}

Busy::~Busy() {
  ticker_.reset();
  if (drawn_width_ > 0) context_.err.Write(Erased(drawn_width_));
}

void Busy::Draw() {
  const std::string line = what_ + " ... " +
                           FormatDuration((GetTickCount64() - start_ms_) / kMsPerSecond) +
                           " (Ctrl-C stops it)";
  drawn_width_ = std::min(line.size(), context_.err.Width() - 1);
  context_.err.Write(Redrawn(line.substr(0, drawn_width_), drawn_width_));
}

}  // namespace cli
