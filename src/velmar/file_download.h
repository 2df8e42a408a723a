// The transfer of a Velmar download: writes the log of the current file to the host's stream, chunk
// by chunk.
#ifndef RCVLINK_VELMAR_FILE_DOWNLOAD_H_
#define RCVLINK_VELMAR_FILE_DOWNLOAD_H_

#include <cstdint>
#include <functional>
#include <memory>

#include "velmar/commands.h"

#include <objidl.h>

class CVelmarProtocol;

namespace rcvlink {

class FileDownload {
 public:
  using ProgressFunction = std::function<void(uint8_t percent)>;

  // The driver executes the command, and calls TakeChunk for each chunk. `size` is the file's size
  // as the receiver gave it. It is used for the progress only: a file that is still being recorded
  // may have grown.
  FileDownload(CVelmarProtocol& driver,
               ProgressFunction tell_progress,
               IStream* stream,
               uint32_t size);

  // The result of the command.
  HRESULT Run();
  // Whether the receiver may still be sending the file.
  bool IsSending() const { return is_sending_; }

  // Writes the chunk that has come to the stream. A failure of the stream ends the transfer.
  HRESULT TakeChunk();

 private:
  struct StreamDeleter {
    void operator()(IStream* stream) const { stream->Release(); }
  };

  CVelmarProtocol& driver_;
  ProgressFunction tell_progress_;
  // A counted reference, so that a host may release its own during the transfer.
  std::unique_ptr<IStream, StreamDeleter> stream_;
  VelmarCommands::CReadFileCmd read_file_;
  uint32_t total_;
  uint32_t remaining_;
  uint8_t percent_ = 0;  // the last that was reported
  bool is_sending_ = false;
};

}  // namespace rcvlink

#endif  // RCVLINK_VELMAR_FILE_DOWNLOAD_H_
