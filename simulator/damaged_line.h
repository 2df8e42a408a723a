// A line between a receiver and its host that damages what it carries.
#ifndef SIMULATOR_DAMAGED_LINE_H_
#define SIMULATOR_DAMAGED_LINE_H_

#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

#include "simulator/bytes.h"
#include "simulator/noise.h"
#include "simulator/receiver.h"
#include "simulator/transcript.h"

namespace sim {

enum class LineEventKind {
  kUnplug,   // No byte passes, in neither direction.
  kSilence,  // What the receiver sends comes late.
};

enum class LineEventStart {
  kTime,   // So many milliseconds after the host's first byte.
  kByte,   // When the receiver has sent so many bytes.
  kBlock,  // Just before this block or chunk of a file, the first time that it is sent.
};

// Happens once.
struct LineEvent {
  LineEventKind kind = LineEventKind::kUnplug;
  LineEventStart start = LineEventStart::kTime;
  uint64_t at = 0;
  // How long it lasts; for ever if there is nothing.
  std::optional<uint64_t> duration_ms = std::nullopt;
};

struct DamageOptions {
  // The chance of a byte to be damaged on its way to the host, and on its way to the receiver.
  double rate = 0;
  double command_rate = 0;
  std::vector<NoiseKind> kinds = AllNoiseKinds();
  uint64_t seed = 0;
  std::vector<LineEvent> events = {};
};

// A receiver behind a bad line. The damage of a byte depends on the seed and on how many bytes went
// the same way before, not on the clock or on how the bytes were cut; but while the line is
// unplugged or silent, the clock says what is lost or late.
class DamagedLine : public Receiver {
 public:
  // `receiver` and, if given, `transcript` must outlive the line.
  DamagedLine(const DamageOptions& options, Receiver& receiver, Transcript* transcript = nullptr);

  void Receive(std::span<const uint8_t> bytes, uint32_t host_speed, uint64_t now_ms) override;
  std::optional<uint64_t> NextSendTime() const override;
  Bytes Send(uint64_t now_ms, uint32_t host_speed) override;
  bool gone() const override { return receiver_.gone(); }
  uint32_t speed() const override { return receiver_.speed(); }
  std::optional<uint64_t> last_block() const override { return receiver_.last_block(); }
  bool plugged() const override { return plugged_; }
  size_t EndOfSpeedCommand(std::span<const uint8_t> bytes) const override {
    return receiver_.EndOfSpeedCommand(bytes);
  }

 private:
  // One direction.
  struct Way {
    Noise noise;
    std::string_view name;
    uint64_t bytes = 0;
  };

  void Carry(uint8_t byte, Way& way, Bytes& arrived, uint64_t now_ms);
  void CatchUp(uint64_t now_ms);
  void StartEvents(LineEventStart start, uint64_t reached, uint64_t now_ms);
  void Start(LineEventKind kind, std::optional<uint64_t> duration_ms, uint64_t start_ms);
  bool Silent(uint64_t now_ms) const { return now_ms < silent_until_ms_; }

  Receiver& receiver_;
  Transcript silent_transcript_;
  Transcript& transcript_;
  Way to_host_;
  Way to_receiver_;
  // Those that have not happened yet.
  std::vector<LineEvent> events_;
  std::optional<uint64_t> first_byte_ms_;
  // What the receiver has sent and the line has not carried yet.
  std::deque<uint8_t> waiting_;
  uint64_t silent_until_ms_ = 0;
  bool plugged_ = true;
  uint64_t unplugged_until_ms_ = 0;
};

}  // namespace sim

#endif  // SIMULATOR_DAMAGED_LINE_H_
