// What a mirror has to do, from sizes alone.
#ifndef RCVLINK_CLI_MIRROR_PLAN_H_
#define RCVLINK_CLI_MIRROR_PLAN_H_

#include <cstdint>
#include <optional>
#include <string>

#include "results.h"

namespace cli {

enum class MirrorStep {
  kNothing,    // the file is here already
  kDownload,   // it is missing, or differs in size
  kCompare,    // it is here, but is to be deleted on the receiver: only after a second download
  kMakeEmpty,  // it is empty; no protocol transfers empty files
};

// `size`: bytes that the receiver listed
// `local_size`: of the file on this computer; nothing when there is none
// `deletes`: whether files are to be deleted on the receiver.
MirrorStep StepFor(uint64_t size, std::optional<uint64_t> local_size, bool deletes);

// The worse of two exit codes. A cancellation is worst, a failure with a local file least bad.
ExitCode Worse(ExitCode first, ExitCode second);

// How far the files of a mirror are.
struct MirrorState {
  size_t file = 0;  // the current one, from 1
  size_t files = 0;
  uint64_t done = 0;   // bytes of the files before it
  uint64_t total = 0;  // bytes of all of them
  uint64_t elapsed_ms = 0;
};

// "File 3 of 300: A.JPS, 1.2 MB, 5 min 10 s left in total"
std::string InWords(const MirrorState& state, const std::wstring& name, uint64_t size);

}  // namespace cli

#endif  // RCVLINK_CLI_MIRROR_PLAN_H_
