// The transfer of a Velmar download: takes the log of the current file chunk by chunk into the host's
// stream.
#ifndef RCVLINK_VELMAR_FILE_DOWNLOAD_H_
#define RCVLINK_VELMAR_FILE_DOWNLOAD_H_

#include <cstdint>
#include <functional>
#include <memory>

#include "velmar/commands.h"

#include <objidl.h>

class CVelmarProtocol;

class FileDownload {
 public:
  using ProgressFunction = std::function<void(uint8_t percent)>;

  // The driver executes the command, and calls TakeChunk for each chunk that it is told of. `size` is
  // what the receiver said, and serves the progress only.
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
  std::unique_ptr<IStream, StreamDeleter> stream_;  // a counted reference
  VelmarCommands::CReadFileCmd read_file_;
  uint32_t total_;
  uint32_t remaining_;
  uint8_t percent_ = 0;  // the last that was told
  bool is_sending_ = false;
};

#endif  // RCVLINK_VELMAR_FILE_DOWNLOAD_H_
