// A file as the binary logs of a Velmar transfer.
#ifndef SIMULATOR_VELMAR_TRANSFER_H_
#define SIMULATOR_VELMAR_TRANSFER_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "simulator/bytes.h"
#include "simulator/files.h"
#include "simulator/velmar/faults.h"
#include "simulator/velmar/log.h"

namespace sim {

// The most that a log's 16-bit length leaves for the bytes of a file.
inline constexpr size_t kMaxChunkLength = 65527;
inline constexpr size_t kDefaultChunkLength = 1024;

// A chunk of a file as it goes over the wire.
struct VelmarChunk {
  Bytes wire = {};
  std::string description = {};
};

// The sending of one file, chunk by chunk, each of them a binary log.
class VelmarTransfer {
 public:
  // `files` must outlive the transfer.
  VelmarTransfer(const FileStore& files,
                 FileEntry file,
                 size_t chunk_length,
                 const std::string& port_name);

  // The number of the current chunk, from 0.
  uint64_t chunk_number() const { return number_; }
  bool at_last_chunk() const { return file_.size - offset_ <= chunk_length_; }

  // The current chunk with the faults that are due for it; nothing if the file can no longer be
  // read.
  std::optional<VelmarChunk> CurrentChunk(VelmarFaults& faults) const;

  // Goes on to the next chunk, which there must be.
  void Next();

 private:
  uint16_t Sequence(const VelmarFaults& faults) const;

  const FileStore& files_;
  FileEntry file_;
  size_t chunk_length_;
  uint8_t port_address_;
  uint64_t offset_ = 0;
  uint64_t number_ = 0;
};

}  // namespace sim

#endif  // SIMULATOR_VELMAR_TRANSFER_H_
