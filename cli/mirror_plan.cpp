#include "mirror_plan.h"

#include <algorithm>
#include <array>

#include "formats.h"
#include "text.h"

namespace cli {

MirrorStep StepFor(uint64_t size, std::optional<uint64_t> local_size, bool deletes) {
  if (local_size != size) return size == 0 ? MirrorStep::kMakeEmpty : MirrorStep::kDownload;
  return deletes && size > 0 ? MirrorStep::kCompare : MirrorStep::kNothing;
}

ExitCode Worse(ExitCode first, ExitCode second) {
  constexpr std::array kFromBest = {ExitCode::kDone,
                                    ExitCode::kUsage,
                                    ExitCode::kLocalFile,
                                    ExitCode::kFailed,
                                    ExitCode::kNoReceiver,
                                    ExitCode::kCancelled};
  const auto rank = [&](ExitCode code) {
    return std::find(kFromBest.begin(), kFromBest.end(), code);
  };
  return rank(first) < rank(second) ? second : first;
}

std::string InWords(const MirrorState& state, const std::wstring& name, uint64_t size) {
  std::string text = "File " + std::to_string(state.file) + " of " + std::to_string(state.files) +
                     ": " + Printable(name) + ", " + FormatBytes(size);
  const uint64_t rate = state.elapsed_ms == 0 ? 0 : state.done * kMsPerSecond / state.elapsed_ms;
  if (rate == 0) return text;
  const uint64_t rest = state.total - std::min(state.done, state.total);
  return text + ", " + FormatDuration((rest + rate - 1) / rate) + " left in total";
}

}  // namespace cli
