#include "simulator/damaged_line.h"

#include <algorithm>
#include <limits>
#include <string>

namespace sim {
namespace {

constexpr uint64_t kForEver = std::numeric_limits<uint64_t>::max();
// So that the two directions are damaged in different places.
constexpr uint64_t kOtherWay = 0x9E3779B97F4A7C15;

void TakeEarlier(std::optional<uint64_t>& time, uint64_t other) {
  time = std::min(time.value_or(other), other);
}

}  // namespace

DamagedLine::DamagedLine(const DamageOptions& options, Receiver& receiver, Transcript* transcript)
    : receiver_(receiver),
      transcript_(transcript != nullptr ? *transcript : silent_transcript_),
      to_host_{Noise(options.rate, options.kinds, options.seed), "to the host"},
      to_receiver_{Noise(options.command_rate, options.kinds, options.seed ^ kOtherWay),
                   "to the receiver"},
      events_(options.events) {}

void DamagedLine::Receive(std::span<const uint8_t> bytes, uint32_t host_speed, uint64_t now_ms) {
  if (!first_byte_ms_) {
    first_byte_ms_ = now_ms;
  }
  CatchUp(now_ms);
  Bytes arrived;
  for (const uint8_t byte : bytes) {
    if (plugged_) {
      Carry(byte, to_receiver_, arrived, now_ms);
    }
  }
  receiver_.Receive(arrived, host_speed, now_ms);
  CatchUp(now_ms);
}

std::optional<uint64_t> DamagedLine::NextSendTime() const {
  std::optional<uint64_t> next =
      waiting_.empty() ? receiver_.NextSendTime() : std::optional<uint64_t>(0);
  if (next && plugged_) {
    next = std::max(*next, silent_until_ms_);
  }
  if (!plugged_ && unplugged_until_ms_ != kForEver) {
    TakeEarlier(next, unplugged_until_ms_);
  }
  for (const LineEvent& event : events_) {
    if (event.start == LineEventStart::kTime && first_byte_ms_) {
      TakeEarlier(next, *first_byte_ms_ + event.at);
    }
  }
  return next;
}

Bytes DamagedLine::Send(uint64_t now_ms, uint32_t host_speed) {
  CatchUp(now_ms);
  // A receiver that is unplugged goes on sending.
  if (waiting_.empty() && (!plugged_ || !Silent(now_ms))) {
    const Bytes sent = receiver_.Send(now_ms, host_speed);
    waiting_.assign(sent.begin(), sent.end());
    CatchUp(now_ms);
  }
  Bytes arrived;
  while (plugged_ && !Silent(now_ms) && !waiting_.empty()) {
    StartEvents(LineEventStart::kByte, to_host_.bytes, now_ms);
    if (plugged_ && !Silent(now_ms)) {
      Carry(waiting_.front(), to_host_, arrived, now_ms);
      waiting_.pop_front();
    }
  }
  if (!plugged_) {
    waiting_.clear();
  }
  return arrived;
}

void DamagedLine::Carry(uint8_t byte, Way& way, Bytes& arrived, uint64_t now_ms) {
  const std::optional<Damage> damage = way.noise.Next();
  const uint64_t number = way.bytes++;
  if (!damage) {
    arrived.push_back(byte);
    return;
  }
  transcript_.Remark("noise " + std::string(NoiseName(damage->kind)) + " at byte " +
                     std::to_string(number) + ' ' + std::string(way.name));
  switch (damage->kind) {
    case NoiseKind::kFlip:
    case NoiseKind::kBurst:
      arrived.push_back(static_cast<uint8_t>(byte ^ damage->amount));
      break;
    case NoiseKind::kDrop:
      break;
    case NoiseKind::kInsert:
      arrived.push_back(static_cast<uint8_t>(damage->amount));
      arrived.push_back(byte);
      break;
    case NoiseKind::kDouble:
      arrived.insert(arrived.end(), 2, byte);
      break;
    case NoiseKind::kStall:
      arrived.push_back(byte);
      Start(LineEventKind::kSilence, damage->amount, now_ms);
      break;
    case NoiseKind::kUnplug:
      Start(LineEventKind::kUnplug, damage->amount, now_ms);
      break;
  }
}

// Brings the line to the state that it has at this time.
void DamagedLine::CatchUp(uint64_t now_ms) {
  if (first_byte_ms_) {
    StartEvents(LineEventStart::kTime, now_ms - *first_byte_ms_, now_ms);
  }
  if (const std::optional<uint64_t> block = receiver_.last_block()) {
    StartEvents(LineEventStart::kBlock, *block, now_ms);
  }
  if (!plugged_ && now_ms >= unplugged_until_ms_) {
    plugged_ = true;
    transcript_.Remark("plugged in");
  }
}

// Starts the events whose time, byte or block is reached.
void DamagedLine::StartEvents(LineEventStart start, uint64_t reached, uint64_t now_ms) {
  std::erase_if(events_, [&](const LineEvent& event) {
    if (event.start != start || event.at > reached) {
      return false;
    }
    const bool timed = start == LineEventStart::kTime;
    Start(event.kind, event.duration_ms, timed ? *first_byte_ms_ + event.at : now_ms);
    return true;
  });
}

void DamagedLine::Start(LineEventKind kind,
                        std::optional<uint64_t> duration_ms,
                        uint64_t start_ms) {
  const uint64_t end_ms = duration_ms ? start_ms + *duration_ms : kForEver;
  if (kind == LineEventKind::kSilence) {
    transcript_.Remark("silent");
    silent_until_ms_ = std::max(silent_until_ms_, end_ms);
    return;
  }
  transcript_.Remark("unplugged");
  plugged_ = false;
  unplugged_until_ms_ = std::max(unplugged_until_ms_, end_ms);
}

}  // namespace sim
