// The simulated Velmar receiver.
#ifndef SIMULATOR_VELMAR_RECEIVER_H_
#define SIMULATOR_VELMAR_RECEIVER_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "simulator/bytes.h"
#include "simulator/files.h"
#include "simulator/line.h"
#include "simulator/receiver.h"
#include "simulator/transcript.h"
#include "simulator/velmar/command_reader.h"
#include "simulator/velmar/commands.h"
#include "simulator/velmar/faults.h"
#include "simulator/velmar/transfer.h"

namespace sim {

struct VelmarOptions {
  VelmarIdentity identity = {};
  LineOptions line = {};
  VelmarFaults faults = {};
  VelmarListing listing = {};
  // How many bytes of a file a log carries, from 1 to kMaxChunkLength.
  size_t chunk_length = kDefaultChunkLength;
  // Errors carry no text.
  bool bare_errors = false;
  // Any command ends a transfer, not only the one that ends all logs.
  bool stops_for_commands = false;
};

// A Velmar receiver: acknowledges commands, answers with ASCII logs, and sends files as binary logs
// that follow each other without being asked for.
class VelmarReceiver : public Receiver {
 public:
  // `transcript`, if given, must outlive the receiver.
  VelmarReceiver(const VelmarOptions& options, FileStore files, Transcript* transcript = nullptr);
  ~VelmarReceiver() override;
  VelmarReceiver(const VelmarReceiver&) = delete;
  VelmarReceiver& operator=(const VelmarReceiver&) = delete;

  void Receive(std::span<const uint8_t> bytes, uint32_t host_speed, uint64_t now_ms) override;
  std::optional<uint64_t> NextSendTime() const override;
  Bytes Send(uint64_t now_ms, uint32_t host_speed) override;
  bool gone() const override { return gone_; }
  uint32_t speed() const override { return line_.speed(); }
  std::optional<uint64_t> last_block() const override { return last_block_; }
  size_t EndOfSpeedCommand(std::span<const uint8_t> bytes) const override;

  bool in_transfer() const { return transfer_.has_value(); }
  const FileStore& files() const { return commands_.files(); }
  const VelmarPortSettings& port_settings() const { return commands_.port_settings(); }

 private:
  void HearCommand(std::string_view command, uint64_t now_ms);
  VelmarAnswer Execute(std::string_view command);
  void SendAnswer(std::string_view command, const VelmarAnswer& answer, uint64_t now_ms);
  void SendLogs(std::string_view command, std::vector<AsciiLog> logs, uint64_t due_ms);
  std::vector<uint32_t> SequenceNumbers(std::string_view command, size_t count);
  void StartTransfer(std::string_view command, const FileEntry& file);
  void QueueText(std::string_view text, uint64_t not_before_ms);

  bool ChunkDue(uint64_t now_ms) const;
  void SendChunk();
  void TakeChunkSilence();
  void NoteIdleLine(uint64_t now_ms);

  Transcript silent_transcript_;
  Transcript& transcript_;
  Line line_;
  VelmarCommandSet commands_;
  VelmarFaults faults_;
  VelmarCommandReader reader_;
  size_t piece_size_;
  size_t chunk_length_;
  bool bare_errors_;
  bool stops_for_commands_;
  bool unheard_ = false;
  bool gone_ = false;

  std::optional<VelmarTransfer> transfer_;
  std::optional<uint64_t> last_block_;
  // How long the line is silent before the current chunk, and when that is over.
  uint64_t silence_ms_ = 0;
  uint64_t silent_until_ms_ = 0;
  bool vanishes_ = false;
  std::optional<uint64_t> vanish_ms_;
};

}  // namespace sim

#endif  // SIMULATOR_VELMAR_RECEIVER_H_
