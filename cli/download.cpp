#include "download.h"

#include <atomic>

#include "file_stream.h"
#include "formats.h"
#include "progress.h"
#include "text.h"
#include "ticker.h"

namespace cli {
namespace {

// Watches a transfer on a thread of its own: shows the progress, and aborts the transfer when no
// new data arrives or the data cannot be written.
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
    const uint64_t elapsed_ms = GetTickCount64() - start_ms_;
    if (state_.done != stream_.received()) {
      state_.done = stream_.received();
      last_news_ms_ = elapsed_ms;
    }
    progress_.Show(state_, elapsed_ms);
    if (stall_ms_ != 0 && elapsed_ms - last_news_ms_ >= stall_ms_) stalled_ = true;
    if (stalled_ || stream_.first_error() != ERROR_SUCCESS) aborter_.Tick();
  }

  const uint64_t start_ms_ = GetTickCount64();
  const uint64_t stall_ms_;
  const FileStream& stream_;
  TransferState state_;
  uint64_t last_news_ms_ = 0;
  std::atomic<bool> stalled_{false};
  Progress progress_;
  Aborter aborter_;
  Ticker ticker_;  // ends before all that it uses
};

// The result of one transfer.
struct Transfer {
  long code = S_OK;
  bool stalled = false;
  uint64_t received = 0;
  DWORD write_error = ERROR_SUCCESS;
  std::string sha256{};

  bool IsComplete(const RemoteFile& file) const {
    return code == S_OK && write_error == ERROR_SUCCESS && received == file.size;
  }
};

Transfer RunTransfer(Context& context,
                     const Receiver& receiver,
                     const RemoteFile& file,
                     Destination& destination) {
  const auto stream = FileStream::Make(destination);
  std::wstring name = file.name;
  Transfer transfer;
  {
    const TransferWatch watch(context, receiver, file, *stream);
    transfer.code = devapi::DownloadFile(receiver.handle(), name.data(), stream.get(), nullptr);
    transfer.stalled = watch.stalled();
  }
  stream->Detach();
  transfer.received = stream->received();
  transfer.write_error = stream->first_error();
  transfer.sha256 = stream->TakeHash();
  return transfer;
}

// Whether the receiver ended the transfer in order, but with another size than it had listed.
bool HasOtherSize(const Transfer& transfer, const RemoteFile& file) {
  return transfer.code == S_OK && !transfer.stalled && transfer.received > 0 &&
         transfer.received != file.size;
}

std::string MeaningOf(const Context& context, const Transfer& transfer, const RemoteFile& file) {
  if (transfer.stalled) {
    return "the receiver sent no new data for " +
           FormatDuration(context.arguments.stall_timeout_s) + ", so the download was aborted";
  }
  if (transfer.code == S_OK) {
    return std::string(transfer.received < file.size ? "incomplete" : "longer than listed") +
           ": the receiver listed " + std::to_string(file.size) + " bytes, but " +
           std::to_string(transfer.received) + " arrived";
  }
  if (transfer.code == S_FALSE) return "ended by the receiver before the file was complete";
  if (transfer.code == E_FAIL) {
    return "the receiver reports an empty file or no file size";
  }
  return "";
}

// Why a transfer is not complete. Keeps its data where that is useful.
Failure WhyIncomplete(const Context& context,
                      const Receiver& receiver,
                      const Transfer& transfer,
                      const RemoteFile& file,
                      Destination& destination,
                      bool keep_partial) {
  if (transfer.write_error != ERROR_SUCCESS) {
    Failure failure = destination.FailureOf(transfer.write_error);
    if (keep_partial) failure.kept = ToUtf8(destination.KeepIncomplete());
    return failure;
  }
  Failure failure = receiver.FailureOf(
      "download " + Printable(file.name), transfer.code, MeaningOf(context, transfer, file));
  const bool other_size = HasOtherSize(transfer, file) && failure.exit != ExitCode::kCancelled;
  if (other_size) {
    failure.hint =
        "A file that is still being recorded grows. Close it on the receiver, then download it "
        "again.";
  }
  if (keep_partial || other_size) failure.kept = ToUtf8(destination.KeepIncomplete());
  return failure;
}

// No protocol transfers a file without bytes.
Downloaded WithoutBytes(Destination& destination) {
  const auto stream = FileStream::Make(destination);
  stream->Detach();
  destination.Complete();
  return {.milliseconds = 0, .sha256 = stream->TakeHash()};
}

}  // namespace

void CheckSize(Receiver& receiver, const RemoteFile& file) {
  constexpr uint64_t kMostBlocks = 65'536;
  constexpr uint64_t kBlockBytes = 512;
  constexpr uint64_t kMostBytes = kMostBlocks * kBlockBytes;
  if (file.size <= kMostBytes || receiver.Family() != eProtocolQuorin) return;
  throw Failure{.tried = "download " + Printable(file.name),
                .code = ResultOfWin32(ERROR_FILE_TOO_LARGE),
                .meaning = "the file has " + std::to_string(file.size) +
                           " bytes; a Quorin receiver can send at most " +
                           std::to_string(kMostBytes) + " bytes of a file"};
}

Downloaded Download(Context& context,
                    Receiver& receiver,
                    const RemoteFile& file,
                    Destination& destination,
                    const DownloadOptions& options) {
  const std::string tried = "download " + Printable(file.name);
  receiver.ThrowIfCancelled(tried);
  if (file.size == 0) return WithoutBytes(destination);
  const uint64_t start_ms = GetTickCount64();
  const Transfer transfer = RunTransfer(context, receiver, file, destination);
  if (!transfer.IsComplete(file)) {
    throw WhyIncomplete(context, receiver, transfer, file, destination, options.keep_partial);
  }
  if (options.verify) {
    Nowhere nowhere;
    const Transfer again = RunTransfer(context, receiver, file, nowhere);
    if (!again.IsComplete(file) || again.sha256 != transfer.sha256) {
      Failure failure =
          again.IsComplete(file)
              ? Failure{.tried = "verify " + Printable(file.name),
                        .code = ResultOfWin32(ERROR_CRC),
                        .meaning = "the second download differs from the first",
                        .hint = "Check the cable, lower the speed, and download the file again."}
              : WhyIncomplete(context, receiver, again, file, nowhere, false);
      if (options.keep_partial) failure.kept = ToUtf8(destination.KeepIncomplete());
      throw failure;
    }
  }
  destination.Complete();
  return {.milliseconds = GetTickCount64() - start_ms, .sha256 = transfer.sha256};
}

bool MayGoOn(Receiver& receiver, const Failure& failure) {
  if (failure.exit == ExitCode::kCancelled) return false;
  if (failure.exit == ExitCode::kLocalFile) return failure.code != ResultOfWin32(ERROR_DISK_FULL);
  return receiver.Answers();
}

}  // namespace cli
