// A serial line between two pseudo-terminals, as slow as a cable: 10 bits a byte at 115200 bit/s in each
// direction. What the host sends arrives DELAY later, so that each change of the speaker costs that much, as with
// a USB adapter that collects bytes.
//
//   bench-relay DELAY_MS HOST_LINK open|make DEVICE
//
// The host's end is a new pseudo-terminal, to which HOST_LINK leads. The device's end is one that exists (open), or
// a new one too, to which DEVICE leads (make). It prints "ready", runs until its standard input ends, and prints
// what passed over the line.
#include <fcntl.h>
#include <poll.h>
#include <stdlib.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <deque>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <system_error>
#include <vector>

namespace {

using Ns = int64_t;

constexpr Ns kNsPerMs = 1'000'000;
constexpr Ns kNsPerSecond = 1'000'000'000;
constexpr Ns kBitsOfByte = 10;
constexpr Ns kBitsPerSecond = 115'200;
constexpr Ns kByteNs = kNsPerSecond * kBitsOfByte / kBitsPerSecond;
// Bytes are handed on at most this late while more follow, so that the relay sleeps between them.
constexpr Ns kStepNs = kNsPerMs;
constexpr size_t kMostHeld =
    4096;  // more is left in the terminal, so that the sender notices the line's speed
constexpr Ns kSilenceNs = 400 * kNsPerMs;  // a fixed pause of a program, not the line's own

[[noreturn]] void ThrowErrno(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

Ns Now() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return now.tv_sec * kNsPerSecond + now.tv_nsec;
}

void MakeRaw(int terminal) {
  termios settings{};
  if (tcgetattr(terminal, &settings) != 0) ThrowErrno("tcgetattr");
  cfmakeraw(&settings);
  cfsetispeed(&settings, B115200);
  cfsetospeed(&settings, B115200);
  if (tcsetattr(terminal, TCSANOW, &settings) != 0) ThrowErrno("tcsetattr");
}

int OpenTerminal(const std::string& path) {
  const int fd = open(path.c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC);
  if (fd < 0) ThrowErrno(path.c_str());
  MakeRaw(fd);
  return fd;
}

// The master; the slave stays open until the relay ends, so that a host that closes the port does not hang up.
int MakeTerminal(const std::string& link) {
  const int master = posix_openpt(O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC);
  if (master < 0 || grantpt(master) != 0 || unlockpt(master) != 0) ThrowErrno("posix_openpt");
  const std::string slave = ptsname(master);
  OpenTerminal(slave);
  std::filesystem::remove(link);
  std::filesystem::create_symlink(slave, link);
  return master;
}

struct Event {
  Ns time;
  size_t bytes;
};

// One direction of the line.
class Wire {
 public:
  Wire(int from, int to, Ns delay) : from_(from), to_(to), delay_(delay) {}

  bool HasRoom() const { return held_.size() < kMostHeld; }
  int from() const { return from_; }
  const std::vector<Event>& arrivals() const { return arrivals_; }

  void Take() {
    std::array<uint8_t, kMostHeld> buffer{};
    const ssize_t count = read(from_, buffer.data(), kMostHeld - held_.size());
    if (count <= 0) return;
    const Ns now = Now();
    free_at_ = std::max(free_at_, now);
    for (size_t i = 0; i < static_cast<size_t>(count); ++i) {
      free_at_ += kByteNs;
      held_.push_back({free_at_ + delay_, buffer[i]});
    }
    next_ = std::max(next_, std::min(held_.front().due, now + kStepNs));
  }

  void Deliver() {
    const Ns now = Now();
    if (held_.empty() || now < WakeTime()) return;
    std::vector<uint8_t> due;
    for (const Held& held : held_) {
      if (held.due > now) break;
      due.push_back(held.byte);
    }
    if (due.empty()) return;
    const ssize_t written = write(to_, due.data(), due.size());
    if (written > 0) {
      held_.erase(held_.begin(), held_.begin() + written);
      arrivals_.push_back({now, static_cast<size_t>(written)});
    }
    next_ = now + kStepNs;
  }

  // When the next bytes are to be handed on: once a step, and at once when the last one has come.
  Ns WakeTime() const {
    if (held_.empty()) return INT64_MAX;
    return std::min(held_.back().due, std::max(held_.front().due, next_));
  }

 private:
  struct Held {
    Ns due;
    uint8_t byte;
  };

  int from_;
  int to_;
  Ns delay_;
  std::deque<Held> held_;
  Ns free_at_ = 0;  // when the wire has carried the last byte
  Ns next_ = 0;
  std::vector<Event> arrivals_;
};

// Carries bytes until the standard input ends.
void Carry(Wire& to_host, Wire& from_host) {
  for (;;) {
    std::array<pollfd, 3> events{{{STDIN_FILENO, POLLIN, 0},
                                  {to_host.HasRoom() ? to_host.from() : -1, POLLIN, 0},
                                  {from_host.HasRoom() ? from_host.from() : -1, POLLIN, 0}}};
    const Ns wake = std::min(to_host.WakeTime(), from_host.WakeTime());
    timespec wait{};
    const Ns left = std::max<Ns>(wake - Now(), 0);
    wait.tv_sec = left / kNsPerSecond;
    wait.tv_nsec = left % kNsPerSecond;
    if (ppoll(events.data(), events.size(), wake == INT64_MAX ? nullptr : &wait, nullptr) < 0 &&
        errno != EINTR) {
      ThrowErrno("ppoll");
    }
    if (events[0].revents != 0) return;
    if (events[1].revents != 0) to_host.Take();
    if (events[2].revents != 0) from_host.Take();
    to_host.Deliver();
    from_host.Deliver();
  }
}

size_t Total(const std::vector<Event>& events) {
  size_t total = 0;
  for (const Event& event : events) total += event.bytes;
  return total;
}

double Seconds(Ns ns) { return static_cast<double>(ns) / static_cast<double>(kNsPerSecond); }

// The middle of the transfer: what came to the host between 10 and 90 % of all bytes.
void PrintMiddle(const std::vector<Event>& events) {
  const size_t total = Total(events);
  size_t count = 0;
  Event begin{0, 0};
  Event end{0, 0};
  for (const Event& event : events) {
    count += event.bytes;
    if (begin.time == 0 && count >= total / 10) begin = {event.time, count};
    if (end.time == 0 && count >= total - total / 10) end = {event.time, count};
  }
  std::printf("\"middle_bytes\": %zu, \"middle_s\": %.6f, ",
              end.bytes - begin.bytes,
              Seconds(end.time - begin.time));
}

// How long the line was in use from the first byte to the last, and how much of it was silence.
void PrintSilence(std::vector<Event> events) {
  std::ranges::sort(events, {}, &Event::time);
  Ns silent = 0;
  int silences = 0;
  for (size_t i = 1; i < events.size(); ++i) {
    const Ns gap = events[i].time - events[i - 1].time;
    if (gap < kSilenceNs) continue;
    silent += gap;
    ++silences;
  }
  const Ns used = events.empty() ? 0 : events.back().time - events.front().time;
  std::printf("\"used_s\": %.6f, \"silences\": %d, \"silent_s\": %.6f",
              Seconds(used),
              silences,
              Seconds(silent));
}

void Print(const Wire& to_host, const Wire& from_host) {
  std::printf("{\"to_host\": %zu, \"from_host\": %zu, ",
              Total(to_host.arrivals()),
              Total(from_host.arrivals()));
  PrintMiddle(to_host.arrivals());
  std::vector<Event> all = to_host.arrivals();
  all.insert(all.end(), from_host.arrivals().begin(), from_host.arrivals().end());
  PrintSilence(std::move(all));
  std::puts("}");
}

}  // namespace

int main(int argc, char** argv) try {
  if (argc != 5)
    return std::fputs("usage: bench-relay DELAY_MS HOST_LINK open|make DEVICE\n", stderr), 2;
  const Ns delay = std::stol(argv[1]) * kNsPerMs;
  const int host = MakeTerminal(argv[2]);
  const int device =
      std::strcmp(argv[3], "make") == 0 ? MakeTerminal(argv[4]) : OpenTerminal(argv[4]);
  std::puts("ready");
  std::fflush(stdout);
  Wire to_host(device, host, 0);
  Wire from_host(host, device, delay);
  Carry(to_host, from_host);
  Print(to_host, from_host);
  std::filesystem::remove(argv[2]);
  return 0;
} catch (const std::exception& error) {
  std::fprintf(stderr, "bench-relay: %s\n", error.what());
  return 1;
}
