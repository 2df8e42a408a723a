#include "velmar/file_download.h"

#include <utility>

#include "velmar/velmar_protocol.h"

namespace rcvlink {

using VelmarCommands::RESPONSE_DATA;

namespace {

IStream* AddReference(IStream* stream) {
  stream->AddRef();
  return stream;
}

// In 32-bit arithmetic: the percent wraps in files beyond 42949672 bytes. This is kept for hosts
// that compare the percents of a transfer with recorded ones; nothing else depends on them. A size
// of 0 gives 100, as there is nothing to divide by.
uint8_t Percent(uint32_t total, uint32_t remaining) {
  constexpr uint32_t kComplete = 100;
  if (total == 0) return kComplete;
  return static_cast<uint8_t>((total - remaining) * kComplete / total);
}

}  // namespace

FileDownload::FileDownload(CVelmarProtocol& driver,
                           ProgressFunction tell_progress,
                           IStream* stream,
                           uint32_t size)
    : driver_(driver),
      tell_progress_(std::move(tell_progress)),
      stream_(AddReference(stream)),
      read_file_(&driver, this),
      total_(size),
      remaining_(size) {}

HRESULT FileDownload::Run() {
  const HRESULT result = driver_.ExecuteCommand(read_file_);
  // The line of an aborted command was sent whole: the receiver sends the file, although nothing
  // has come yet.
  const bool has_begun = read_file_.HasBegun() || result == S_FALSE;
  is_sending_ = has_begun && read_file_.Response() != RESPONSE_DATA;
  return result;
}

HRESULT FileDownload::TakeChunk() {
  ULONG written = 0;
  const HRESULT result = stream_->Write(read_file_.GetData(), read_file_.GetDataSize(), &written);
  if (FAILED(result)) return result;
  remaining_ -= read_file_.GetDataSize();
  const uint8_t percent = Percent(total_, remaining_);
  if (percent == percent_) return S_OK;
  percent_ = percent;
  tell_progress_(percent);
  return S_OK;
}

}  // namespace rcvlink
