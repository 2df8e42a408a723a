// One file of a mirror.
#ifndef RCVLINK_CLI_MIRROR_FILE_H_
#define RCVLINK_CLI_MIRROR_FILE_H_

#include <filesystem>
#include <string>

#include "context.h"
#include "mirror_plan.h"
#include "receiver.h"

namespace cli {

struct MirrorJob {
  RemoteFile file{};
  std::filesystem::path target{};
  MirrorStep step = MirrorStep::kNothing;
};

// Executes a job. An existing file is kept whatever fails. Without --force it is replaced only by
// a file that begins with the same bytes, such as a log that has grown.
// `verify`: download twice, and keep nothing when the bytes differ
// Returns the SHA-256 of the file; empty for an empty file
// Throws Failure.
std::string Mirror(Context& context, Receiver& receiver, const MirrorJob& job, bool verify);

// The bytes that a job moves.
uint64_t BytesOf(const MirrorJob& job, bool verify);

}  // namespace cli

#endif  // RCVLINK_CLI_MIRROR_FILE_H_
