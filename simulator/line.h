// The receiver's end of a link: its speed, and what it still has to send.
#ifndef SIMULATOR_LINE_H_
#define SIMULATOR_LINE_H_

#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>

#include "simulator/bytes.h"
#include "simulator/transcript.h"

namespace sim {

inline constexpr uint32_t kDefaultSpeed = 9600;
inline constexpr uint32_t kDefaultPieceGapMs = 5;

struct LineOptions {
  uint32_t speed = kDefaultSpeed;
  // The speed that is taken, whatever is asked for; 0 means what is asked for.
  uint32_t stray_speed = 0;
  // Bytes between two ends of different speed arrive as garbage; otherwise they do not arrive.
  bool garbled = false;
  // Output takes the time it needs on a wire, 10 bits a byte.
  bool paced = false;
  // Output comes in pieces of this many bytes with a pause between them. A piece may hold the end
  // of one message and the start of the next. 0 means message by message.
  size_t piece_size = 0;
  uint32_t piece_gap_ms = kDefaultPieceGapMs;
};

// One message on its way to the host.
struct Output {
  Bytes bytes;
  uint64_t not_before_ms = 0;
  // What the transcript says when the first byte leaves; empty for nothing.
  std::string description = {};
  // The speed the line is set to once the last byte has left.
  std::optional<uint32_t> speed_after = std::nullopt;
};

// The receiver's end of a serial line: its speed, and the output that waits to leave.
class Line {
 public:
  // `transcript` must outlive the line.
  Line(const LineOptions& options, Transcript& transcript);

  uint32_t speed() const { return speed_; }
  void SetSpeed(uint32_t speed);

  // What the receiver makes of a byte that was sent at `host_speed`; nothing if it is not heard.
  std::optional<uint8_t> Hear(uint8_t byte, uint32_t host_speed) const;

  // Appends a message that must not be empty.
  void Queue(Output output);

  // True when everything queued has left.
  bool Idle() const { return queue_.empty(); }

  // How many bytes have not left yet.
  size_t Waiting() const;

  // Discards what has not left yet. A change of speed that was to follow it happens now.
  void DropOutput();

  // As those of Receiver.
  std::optional<uint64_t> NextSendTime() const;
  Bytes Send(uint64_t now_ms, uint32_t host_speed);

 private:
  bool Matches(uint32_t host_speed) const;
  size_t Remaining() const;
  size_t PieceLength() const;
  uint64_t ByteTimeNs() const;
  uint64_t WireStartNs() const;
  size_t BytesDue(uint64_t now_ms) const;
  void TakeFromFront(size_t count, Bytes& bytes);

  LineOptions options_;
  Transcript& transcript_;
  uint32_t speed_;
  std::deque<Output> queue_;
  size_t sent_of_front_ = 0;
  uint64_t next_piece_ms_ = 0;
  // When the wire has carried the last byte handed out so far.
  uint64_t wire_free_ns_ = 0;
};

}  // namespace sim

#endif  // SIMULATOR_LINE_H_
