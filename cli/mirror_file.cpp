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

/// The temporary file of a download; deleted unless it is renamed.
class NewFile {
 public:
  /// @throws Failure when there is a file of that name
  explicit NewFile(const std::filesystem::path& target) : path_(target.native() + L".new") {
    if (!Exists(path_)) return;
    Failure failure = LocalFailure("make " + Printable(path_.native()), ERROR_FILE_EXISTS);
    failure.hint =
        "An interrupted mirror left it, or another mirror is running here. If none is running, "
        "delete it.";
    throw failure;
  }
  ~NewFile() { DeleteFileW(path_.c_str()); }
  NewFile(const NewFile&) = delete;
  NewFile& operator=(const NewFile&) = delete;

  const std::filesystem::path& path() const { return path_; }

 private:
  std::filesystem::path path_;
};

std::string DownloadNew(Context& context, Receiver& receiver, const MirrorJob& job, bool verify) {
  const NewFile file(job.target);
  std::string sha256;
  {
    // What an earlier mirror kept of the file is out of date.
    PartFile part(file.path(), /*overwrite=*/true);
    sha256 = Download(context, receiver, job.file, part, {.verify = verify}).sha256;
  }
  const bool replaces = Exists(job.target);
  if (replaces && !context.arguments.force && !BeginsWith(file.path(), job.target)) {
    throw Difference(
        job,
        "the file of that name on this computer is not the beginning of the receiver's file",
        "Move that file away, or use --force to replace it.");
  }
  MoveOver(file.path(), job.target);
  return sha256;
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

std::uint64_t BytesOf(const MirrorJob& job, bool verify) {
  constexpr std::uint64_t kTwice = 2;
  if (job.step == MirrorStep::kNothing) return 0;
  const bool twice = verify && job.step == MirrorStep::kDownload;
  return twice ? kTwice * job.file.size : job.file.size;
}

}  // namespace cli
