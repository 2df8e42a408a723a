// The simulated Quorin receiver.
#ifndef SIMULATOR_QUORIN_RECEIVER_H_
#define SIMULATOR_QUORIN_RECEIVER_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "simulator/bytes.h"
#include "simulator/files.h"
#include "simulator/line.h"
#include "simulator/quorin/command_reader.h"
#include "simulator/quorin/commands.h"
#include "simulator/quorin/faults.h"
#include "simulator/quorin/transfer.h"
#include "simulator/receiver.h"
#include "simulator/transcript.h"

namespace sim {

struct QuorinOptions {
  QuorinIdentity identity = {};
  LineOptions line = {};
  Faults faults = {};
  // Sends back what it hears until the host turns that off.
  bool echo = false;
  // A file that fills its last block exactly is followed by a last block of length 0.
  bool empty_last_block = false;
};

// A Quorin receiver: answers commands, and sends files in blocks.
class QuorinReceiver : public Receiver {
 public:
  // `transcript`, if given, must outlive the receiver.
  QuorinReceiver(const QuorinOptions& options, FileStore files, Transcript* transcript = nullptr);
  ~QuorinReceiver() override;
  QuorinReceiver(const QuorinReceiver&) = delete;
  QuorinReceiver& operator=(const QuorinReceiver&) = delete;

  void Receive(std::span<const uint8_t> bytes, uint32_t host_speed, uint64_t now_ms) override;
  std::optional<uint64_t> NextSendTime() const override;
  Bytes Send(uint64_t now_ms, uint32_t host_speed) override;
  bool gone() const override { return gone_; }
  uint32_t speed() const override { return line_.speed(); }
  std::optional<uint64_t> last_block() const override { return last_block_; }
  size_t EndOfSpeedCommand(std::span<const uint8_t> bytes) const override;

  bool echoes() const { return echo_; }
  bool in_transfer() const { return transfer_.has_value(); }
  const FileStore& files() const { return commands_.files(); }
  const PortSettings& port_settings(char letter) const { return commands_.port_settings(letter); }

 private:
  void HearByte(uint8_t byte, uint64_t now_ms);
  void HearControl(uint8_t byte, uint64_t now_ms);
  void HearTransferAnswer(bool accepted, uint64_t now_ms);
  void HearLine(const CommandLine& line, uint64_t now_ms);
  void FlushEcho(std::string_view line, uint64_t now_ms);

  void Execute(const Command& command, uint64_t now_ms);
  void SendAnswer(const Command& command, const Answer& answer, uint64_t now_ms);
  void QueueMessage(Bytes message, uint64_t not_before_ms);

  void SendBlock(uint64_t now_ms);
  void QueueBlock(const Block& block, std::optional<BlockFaultKind> fault, uint64_t not_before_ms);

  Transcript silent_transcript_;
  Transcript& transcript_;
  Line line_;
  QuorinCommandSet commands_;
  Faults faults_;
  CommandReader reader_;
  bool echo_;
  Bytes unsent_echo_;
  bool empty_last_block_;
  bool unheard_ = false;
  bool gone_ = false;

  std::optional<Transfer> transfer_;
  // The right CRC of the block that was sent last, or nothing before the first one.
  std::optional<uint16_t> block_crc_;
  std::optional<uint64_t> last_block_;
};

}  // namespace sim

#endif  // SIMULATOR_QUORIN_RECEIVER_H_
