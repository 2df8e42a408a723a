#include "simulator/line.h"

#include <algorithm>
#include <bit>
#include <utility>

namespace sim {
namespace {

constexpr uint64_t kNsPerMs = 1'000'000;
constexpr uint64_t kNsPerSecond = 1'000'000'000;
constexpr uint64_t kBitsOnLine = 10;  // A start bit, eight data bits and a stop bit.

// Bits sampled at the wrong rate: always the same wrong byte for a byte, never the byte itself.
uint8_t Garble(uint8_t byte) {
  constexpr int kShift = 3;
  constexpr uint8_t kFlip = 0xE5;
  const auto wrong = static_cast<uint8_t>(std::rotl(byte, kShift) ^ kFlip);
  return wrong == byte ? static_cast<uint8_t>(~byte) : wrong;
}

}  // namespace

Line::Line(const LineOptions& options, Transcript& transcript)
    : options_(options), transcript_(transcript), speed_(options.speed) {}

void Line::SetSpeed(uint32_t speed) {
  speed_ = options_.stray_speed == 0 ? speed : options_.stray_speed;
  transcript_.Setting("speed " + std::to_string(speed_));
}

bool Line::Matches(uint32_t host_speed) const { return host_speed == 0 || host_speed == speed_; }

std::optional<uint8_t> Line::Hear(uint8_t byte, uint32_t host_speed) const {
  if (Matches(host_speed)) {
    return byte;
  }
  if (options_.garbled) {
    return Garble(byte);
  }
  return std::nullopt;
}

void Line::Queue(Output output) { queue_.push_back(std::move(output)); }

void Line::DropOutput() {
  std::optional<uint32_t> speed;
  for (const Output& output : queue_) {
    if (output.speed_after) {
      speed = output.speed_after;
    }
  }
  queue_.clear();
  sent_of_front_ = 0;
  if (speed) {
    SetSpeed(*speed);
  }
}

size_t Line::Remaining() const { return queue_.front().bytes.size() - sent_of_front_; }

size_t Line::Waiting() const {
  size_t count = 0;
  for (const Output& output : queue_) {
    count += output.bytes.size();
  }
  return count - sent_of_front_;
}

// A piece goes on into the next message unless that one has to wait for its time or for a speed.
size_t Line::PieceLength() const {
  size_t length = Remaining();
  if (options_.piece_size == 0) {
    return length;
  }
  for (size_t i = 1; i < queue_.size() && length < options_.piece_size; ++i) {
    if (queue_[i - 1].speed_after || queue_[i].not_before_ms > queue_.front().not_before_ms) {
      break;
    }
    length += queue_[i].bytes.size();
  }
  return std::min(options_.piece_size, length);
}

uint64_t Line::ByteTimeNs() const { return kBitsOnLine * kNsPerSecond / std::max(speed_, 1U); }

uint64_t Line::WireStartNs() const {
  if (sent_of_front_ > 0) {
    return wire_free_ns_;
  }
  return std::max(wire_free_ns_, queue_.front().not_before_ms * kNsPerMs);
}

std::optional<uint64_t> Line::NextSendTime() const {
  if (queue_.empty()) {
    return std::nullopt;
  }
  uint64_t due_ms = queue_.front().not_before_ms;
  if (options_.paced) {
    const size_t length = options_.piece_size == 0 ? 1 : PieceLength();
    const uint64_t last_bit_ns = WireStartNs() + length * ByteTimeNs();
    due_ms = (last_bit_ns + kNsPerMs - 1) / kNsPerMs;
  }
  return std::max(due_ms, next_piece_ms_);
}

size_t Line::BytesDue(uint64_t now_ms) const {
  if (!options_.paced || options_.piece_size != 0) {
    return PieceLength();
  }
  const uint64_t carried = (now_ms * kNsPerMs - WireStartNs()) / ByteTimeNs();
  return static_cast<size_t>(std::min<uint64_t>(carried, Remaining()));
}

Bytes Line::Send(uint64_t now_ms, uint32_t host_speed) {
  const std::optional<uint64_t> due = NextSendTime();
  if (!due || *due > now_ms) {
    return {};
  }
  // What leaves now leaves at this speed, even if it is the last before a change.
  const bool readable = Matches(host_speed);
  const size_t count = BytesDue(now_ms);
  wire_free_ns_ = WireStartNs() + count * ByteTimeNs();
  Bytes piece;
  piece.reserve(count);
  while (piece.size() < count) {
    TakeFromFront(count - piece.size(), piece);
  }
  if (options_.piece_size != 0) {
    next_piece_ms_ = now_ms + options_.piece_gap_ms;
  }
  if (!readable) {
    if (options_.garbled) {
      std::transform(piece.begin(), piece.end(), piece.begin(), Garble);
    } else {
      piece.clear();
    }
  }
  return piece;
}

// Moves up to `count` bytes of the first message to `bytes`.
void Line::TakeFromFront(size_t count, Bytes& bytes) {
  const Output& front = queue_.front();
  if (sent_of_front_ == 0 && !front.description.empty()) {
    transcript_.FromReceiver(front.description);
  }
  count = std::min(count, Remaining());
  const auto begin = front.bytes.begin() + static_cast<std::ptrdiff_t>(sent_of_front_);
  bytes.insert(bytes.end(), begin, begin + static_cast<std::ptrdiff_t>(count));
  sent_of_front_ += count;
  if (Remaining() > 0) {
    return;
  }
  const std::optional<uint32_t> speed = front.speed_after;
  queue_.pop_front();
  sent_of_front_ = 0;
  if (speed) {
    SetSpeed(*speed);
  }
}

}  // namespace sim
