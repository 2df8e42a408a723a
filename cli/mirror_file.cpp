#include "mirror_file.h"

#include <utility>

#include "destination.h"
#include "download.h"
#include "local_files.h"
#include "part_file.h"
#include "paths.h"
#include "text.h"

namespace cli {
namespace {

Failure Difference(const MirrorJob& job, std::string meaning, std::string hint) {
  return {.tried = "mirror " + Printable(job.file.name),
          .code = ResultOfWin32(ERROR_CRC),
          .meaning = std::move(meaning),
          .hint = std::move(hint)};
}

// A file of this computer may be replaced when it is the beginning of the receiver's, as of a log that
// has grown.
// Throws Failure when it is another one.
void CheckBeginning(const MirrorJob& job, bool is_beginning) {
  if (is_beginning) return;
  throw Difference(
      job,
      "the file of that name on this computer is not the beginning of the receiver's file",
      "Move that file away, or use --force to replace it.");
}

std::string DownloadNew(Context& context, Receiver& receiver, const MirrorJob& job, bool verify) {
  const bool force = context.arguments.force;
  // A longer file cannot be the beginning: that is known before the download.
  if (!force) CheckBeginning(job, SizeOf(job.target).value_or(0) <= job.file.size);
  const auto test = [&](const std::filesystem::path& part) {
    if (!force && Exists(job.target)) CheckBeginning(job, BeginsWith(part, job.target));
  };
  PartFile part(job.target, {.part = force, .target = true}, test);
  return Download(context, receiver, job.file, part, {.verify = verify}).sha256;
}

std::string Compare(Context& context, Receiver& receiver, const MirrorJob& job) {
  Nowhere nowhere;
  const std::string sha256 = Download(context, receiver, job.file, nowhere, {}).sha256;
  if (sha256.empty() || sha256 != Sha256Of(job.target)) {
    throw Difference(job,
                     "the file on this computer has the same size but different bytes",
                     "Move that file away, then run the mirror again.");
  }
  return sha256;
}

}  // namespace

std::string Mirror(Context& context, Receiver& receiver, const MirrorJob& job, bool verify) {
  switch (job.step) {
    case MirrorStep::kNothing:
      break;
    case MirrorStep::kDownload:
      return DownloadNew(context, receiver, job, verify);
    case MirrorStep::kCompare:
      return Compare(context, receiver, job);
    case MirrorStep::kMakeEmpty:
      if (Exists(job.target) && !context.arguments.force) {
        throw Difference(
            job,
            "the receiver's file is empty, but the file of that name on this computer is not",
            "Move that file away, or use --force to replace it.");
      }
      MakeEmpty(job.target);
      break;
  }
  return {};
}

uint64_t BytesOf(const MirrorJob& job, bool verify) {
  constexpr uint64_t kTwice = 2;
  if (job.step == MirrorStep::kNothing) return 0;
  const bool twice = verify && job.step == MirrorStep::kDownload;
  return twice ? kTwice * job.file.size : job.file.size;
}

}  // namespace cli
