#include "download.h"

#include <atomic>

#include "file_stream.h"
#include "progress.h"
#include "text.h"
#include "ticker.h"

namespace cli {
namespace {

constexpr std::uint64_t kMsPerSecond = 1000;

/// Looks after a running transfer from a thread of its own: shows how far it is, and ends it when
/// nothing new arrives or what arrives cannot be kept.
class TransferWatch {
 public:
  TransferWatch(Context& context,
                const Receiver& receiver,
                const RemoteFile& file,
                const FileStream& stream)
      : stall_ms_(context.arguments.stall_timeout_s * kMsPerSecond),
        stream_(stream),
        state_{.name = file.name, .total = file.size},
        progress_(context, state_),
        aborter_(receiver.handle()),
        ticker_(Aborter::kInterval, [this] { Tick(); }) {}

  bool stalled() const { return stalled_; }

 private:
  void Tick() {
    state_.elapsed_ms = GetTickCount64() - start_ms_;
    if (state_.done != stream_.received()) {
      state_.done = stream_.received();
      last_news_ms_ = state_.elapsed_ms;
    }
    progress_.Show(state_);
    if (stall_ms_ != 0 && state_.elapsed_ms - last_news_ms_ >= stall_ms_) stalled_ = true;
    if (stalled_ || stream_.first_error() != ERROR_SUCCESS) aborter_.Tick();
  }

  const std::uint64_t start_ms_ = GetTickCount64();
  const std::uint64_t stall_ms_;
  const FileStream& stream_;
  TransferState state_;
  std::uint64_t last_news_ms_ = 0;
  std::atomic<bool> stalled_{false};
  Progress progress_;
  Aborter aborter_;
  Ticker ticker_;  // ends before all that it uses
};

std::string MeaningOfDownload(const RemoteFile& file, const FileStream& stream, long code) {
  if (code == S_OK) {
    return "incomplete: the receiver listed " + std::to_string(file.size) + " bytes, but " +
           std::to_string(stream.received()) + " arrived";
  }
  if (code == S_FALSE) return "ended by the receiver before the file was complete";
  if (code == E_FAIL) return "the receiver says that the file is empty, or does not tell its size";
  return "";
}

}  // namespace

std::uint64_t Download(Context& context,
                       Receiver& receiver,
                       const RemoteFile& file,
                       const std::filesystem::path& target,
                       bool overwrite) {
  const std::string tried = "download " + Printable(file.name);
  receiver.ThrowIfCancelled(tried);
  const std::uint64_t start_ms = GetTickCount64();
  PartFile part(target, overwrite);
  const auto stream = FileStream::Make(part);
  std::wstring name = file.name;
  long code = S_OK;
  bool stalled = false;
  {
    const TransferWatch watch(context, receiver, file, *stream);
    code = devapi::DownloadFile(receiver.handle(), name.data(), stream.get(), nullptr);
    stalled = watch.stalled();
  }
  stream->Detach();
  if (stream->first_error() != ERROR_SUCCESS) throw part.FailureOf(stream->first_error());
  if (code != S_OK || stream->received() != file.size) {
    throw receiver.FailureOf(tried,
                             code,
                             stalled ? "the receiver sent nothing new for " +
                                           FormatDuration(context.arguments.stall_timeout_s) +
                                           ", so it was ended"
                                     : MeaningOfDownload(file, *stream, code));
  }
  part.Keep();
  return GetTickCount64() - start_ms;
}

}  // namespace cli
