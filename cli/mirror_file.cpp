#include "mirror_file.h"

#include <utility>

#include "download.h"
#include "local_files.h"
#include "paths.h"
#include "text.h"

namespace cli {
namespace {

/// A further copy of a file, beside it, which vanishes.
class Copy {
 public:
  /// @throws Failure when there is a file of that name
  Copy(const std::filesystem::path& target, const wchar_t* suffix)
      : path_(target.native() + suffix) {
    if (!Exists(path_)) return;
    Failure failure =
        LocalFailure("make " + Printable(path_.native()), static_cast<DWORD>(ERROR_FILE_EXISTS));
    failure.hint = "A mirror that was cut off left it, or another one is at work here; delete it.";
    throw failure;
  }
  ~Copy() { DeleteFileW(path_.c_str()); }
  Copy(const Copy&) = delete;
  Copy& operator=(const Copy&) = delete;

  const std::filesystem::path& path() const { return path_; }

 private:
  std::filesystem::path path_;
};

constexpr const wchar_t* kFirst = L".new";
constexpr const wchar_t* kSecond = L".check";

Failure Difference(const MirrorJob& job, std::string meaning, std::string hint) {
  return {.tried = "mirror " + Printable(job.file.name),
          .code = ResultOfWin32(ERROR_CRC),
          .meaning = std::move(meaning),
          .hint = std::move(hint)};
}

/// Downloads the file once more, and compares.
void Verify(Context& context,
            Receiver& receiver,
            const MirrorJob& job,
            const std::filesystem::path& first,
            const std::string& meaning,
            const std::string& hint) {
  const Copy second(job.target, kSecond);
  Download(context, receiver, job.file, second.path(), false);
  if (!HaveSameBytes(first, second.path())) throw Difference(job, meaning, hint);
}

void DownloadNew(
    Context& context, Receiver& receiver, const MirrorJob& job, bool verify, bool force) {
  const bool replaces = Exists(job.target);
  const Copy first(job.target, kFirst);
  Download(context, receiver, job.file, first.path(), false);
  if (verify) {
    Verify(context,
           receiver,
           job,
           first.path(),
           "a second download brought other bytes than the first",
           "Check the cable or lower the speed, and mirror it again.");
  }
  if (replaces && !force && !BeginsWith(first.path(), job.target)) {
    throw Difference(job,
                     "the file of that name on this computer is another one, not its beginning",
                     "Move that file away, or say --force to replace it.");
  }
  MoveOver(first.path(), job.target);
}

}  // namespace

void Mirror(Context& context, Receiver& receiver, const MirrorJob& job, bool verify, bool force) {
  switch (job.step) {
    case MirrorStep::kNothing:
      break;
    case MirrorStep::kDownload:
      DownloadNew(context, receiver, job, verify, force);
      break;
    case MirrorStep::kCompare:
      Verify(context,
             receiver,
             job,
             job.target,
             "the file on this computer has the same size, but other bytes",
             "Move that file away, and mirror it again.");
      break;
    case MirrorStep::kMakeEmpty:
      if (Exists(job.target) && !force) {
        throw Difference(job,
                         "it has no bytes, but the file of that name on this computer has",
                         "Move that file away, or say --force to replace it.");
      }
      MakeEmpty(job.target);
      break;
  }
}

std::uint64_t BytesOf(const MirrorJob& job, bool verify) {
  constexpr std::uint64_t kTwice = 2;
  if (job.step == MirrorStep::kNothing) return 0;
  const bool twice = verify && job.step == MirrorStep::kDownload;
  return twice ? kTwice * job.file.size : job.file.size;
}

}  // namespace cli
