#include "simulator/ports/memory.h"

#include <algorithm>
#include <optional>

namespace sim {

MemoryPort::MemoryPort(Receiver& receiver, uint64_t start_ms)
    : receiver_(receiver), now_ms_(start_ms) {}

void MemoryPort::Write(std::span<const uint8_t> bytes, uint32_t host_speed) {
  Collect();
  host_speed_ = host_speed;
  if (!receiver_.gone()) {
    receiver_.Receive(bytes, host_speed, now_ms_);
  }
  Collect();
}

void MemoryPort::Write(std::string_view text, uint32_t host_speed) {
  Write(ToBytes(text), host_speed);
}

Bytes MemoryPort::Read(size_t max_bytes, uint64_t timeout_ms) {
  Collect();
  const uint64_t end_ms = now_ms_ + timeout_ms;
  while (waiting_.empty() && now_ms_ < end_ms) {
    const std::optional<uint64_t> next = receiver_.gone() ? std::nullopt : receiver_.NextSendTime();
    now_ms_ = next ? std::min(*next, end_ms) : end_ms;
    Collect();
  }
  const size_t count = std::min(max_bytes, waiting_.size());
  const auto end = waiting_.begin() + static_cast<std::ptrdiff_t>(count);
  Bytes bytes(waiting_.begin(), end);
  waiting_.erase(waiting_.begin(), end);
  return bytes;
}

Bytes MemoryPort::ReadFull(size_t size, uint64_t timeout_ms) {
  const uint64_t end_ms = now_ms_ + timeout_ms;
  Bytes all;
  while (all.size() < size) {
    const Bytes some = Read(size - all.size(), end_ms - now_ms_);
    if (some.empty()) {
      break;
    }
    all.insert(all.end(), some.begin(), some.end());
  }
  return all;
}

void MemoryPort::Purge() {
  Collect();
  waiting_.clear();
}

void MemoryPort::Advance(uint64_t ms) {
  const uint64_t end_ms = now_ms_ + ms;
  Collect();
  while (now_ms_ < end_ms) {
    const std::optional<uint64_t> next = receiver_.NextSendTime();
    now_ms_ = next && !receiver_.gone() ? std::min(*next, end_ms) : end_ms;
    Collect();
  }
}

void MemoryPort::Collect() {
  while (!receiver_.gone()) {
    const std::optional<uint64_t> next = receiver_.NextSendTime();
    if (!next || *next > now_ms_) {
      return;
    }
    const Bytes piece = receiver_.Send(now_ms_, host_speed_);
    waiting_.insert(waiting_.end(), piece.begin(), piece.end());
  }
}

}  // namespace sim
