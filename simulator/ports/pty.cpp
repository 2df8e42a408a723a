#include "simulator/ports/pty.h"

#include <fcntl.h>
#include <poll.h>
#include <stdlib.h>
#include <sys/ioctl.h>
#include <termios.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <ctime>
#include <optional>
#include <stdexcept>
#include <system_error>
#include <utility>

#include "simulator/ports/host_speed.h"

namespace sim {
namespace {

constexpr size_t kReadSize = 4096;
constexpr uint64_t kNsPerMs = 1'000'000;
constexpr uint64_t kNsPerSecond = 1'000'000'000;

[[noreturn]] void ThrowErrno(const char* what) {
  throw std::system_error(errno, std::generic_category(), what);
}

int OpenMaster() {
  const int fd = posix_openpt(O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC);
  if (fd < 0) {
    ThrowErrno("cannot make a pseudo-terminal");
  }
  return fd;
}

std::string UnlockSlave(int master) {
  std::array<char, 64> name{};
  if (grantpt(master) != 0 || unlockpt(master) != 0 ||
      ptsname_r(master, name.data(), name.size()) != 0) {
    ThrowErrno("cannot unlock the pseudo-terminal");
  }
  return name.data();
}

int OpenSlave(const std::string& name) {
  const int fd = open(name.c_str(), O_RDWR | O_NOCTTY | O_CLOEXEC);
  if (fd < 0) {
    ThrowErrno("cannot open the pseudo-terminal's slave");
  }
  return fd;
}

}  // namespace

PortLink::PortLink(std::filesystem::path path, std::filesystem::path target)
    : path_(std::move(path)), target_(std::move(target)) {
  if (path_.empty()) {
    return;
  }
  std::error_code error;
  std::filesystem::create_symlink(target_, path_, error);
  if (!error) {
    return;
  }
  if (error == std::errc::file_exists && !std::filesystem::is_symlink(path_)) {
    throw std::runtime_error(path_.string() + " exists already and is no link");
  }
  std::filesystem::path temporary = path_;
  temporary += "." + std::to_string(getpid());
  std::filesystem::create_symlink(target_, temporary);
  std::filesystem::rename(temporary, path_, error);
  if (error) {
    std::error_code ignored;
    std::filesystem::remove(temporary, ignored);
    throw std::filesystem::filesystem_error("cannot make the link", path_, error);
  }
}

PortLink::~PortLink() {
  std::error_code error;
  if (!path_.empty() && std::filesystem::read_symlink(path_, error) == target_) {
    std::filesystem::remove(path_, error);
  }
}

PtyPort::PtyPort(const std::filesystem::path& link)
    : master_(OpenMaster()),
      slave_name_(UnlockSlave(master_.get())),
      slave_(OpenSlave(slave_name_)),
      start_(std::chrono::steady_clock::now()) {
  PrepareSlave();
  link_.emplace(link, slave_name_);
  host_speed_ = HostSpeed(master_.get());
}

void PtyPort::PrepareSlave() {
  termios settings{};
  if (tcgetattr(slave_.get(), &settings) != 0) {
    ThrowErrno("cannot read the pseudo-terminal's settings");
  }
  cfmakeraw(&settings);
  // A pseudo-terminal that nobody set reads as speed 0 in some programs.
  cfsetispeed(&settings, B9600);
  cfsetospeed(&settings, B9600);
  if (tcsetattr(slave_.get(), TCSANOW, &settings) != 0) {
    ThrowErrno("cannot set the pseudo-terminal");
  }
  // In packet mode the master gets changes of the settings in order with the bytes that it reads.
  const int on = 1;
  if (ioctl(master_.get(), TIOCPKT, &on) != 0) {
    ThrowErrno("cannot switch the pseudo-terminal to packet mode");
  }
  AnnounceChanges();
}

// Changes are announced only while the slave has this flag, which a host may clear by accident.
void PtyPort::AnnounceChanges() {
  termios settings{};
  if (tcgetattr(slave_.get(), &settings) == 0 && (settings.c_lflag & EXTPROC) == 0) {
    settings.c_lflag |= EXTPROC;
    tcsetattr(slave_.get(), TCSANOW, &settings);
  }
}

uint64_t PtyPort::NowNs() const {
  const auto elapsed = std::chrono::steady_clock::now() - start_;
  return static_cast<uint64_t>(
      std::chrono::duration_cast<std::chrono::nanoseconds>(elapsed).count());
}

uint64_t PtyPort::NowMs() const { return NowNs() / kNsPerMs; }

void PtyPort::Serve(Receiver& receiver,
                    const volatile std::sig_atomic_t& stop,
                    const sigset_t& wait_mask) {
  while (stop == 0 && !receiver.gone()) {
    Wait(receiver, wait_mask);
    if (!unwritten_.empty()) {
      Write(std::exchange(unwritten_, {}));
    }
    TakeInput(receiver);
    SendDue(receiver);
  }
}

void PtyPort::Wait(const Receiver& receiver, const sigset_t& wait_mask) const {
  pollfd event{master_.get(), POLLIN | POLLPRI, 0};
  if (!unwritten_.empty()) {
    event.events |= POLLOUT;
  }
  timespec timeout{};
  // Nothing is sent while the terminal has no room.
  const std::optional<uint64_t> next = unwritten_.empty() ? receiver.NextSendTime() : std::nullopt;
  if (next) {
    const uint64_t now_ns = NowNs();
    const uint64_t due_ns = *next * kNsPerMs;
    const uint64_t wait_ns = due_ns > now_ns ? due_ns - now_ns : 0;
    timeout.tv_sec = static_cast<time_t>(wait_ns / kNsPerSecond);
    timeout.tv_nsec = static_cast<long>(wait_ns % kNsPerSecond);
  }
  if (ppoll(&event, 1, next ? &timeout : nullptr, &wait_mask) < 0 && errno != EINTR) {
    ThrowErrno("cannot wait for the pseudo-terminal");
  }
}

void PtyPort::TakeInput(Receiver& receiver) {
  std::array<uint8_t, kReadSize> buffer{};
  while (!receiver.gone()) {
    const ssize_t count = read(master_.get(), buffer.data(), buffer.size());
    if (count <= 0) {
      if (count < 0 && errno != EAGAIN && errno != EINTR) {
        ThrowErrno("cannot read from the pseudo-terminal");
      }
      // Nothing waits, so whatever comes next is sent at the speed known now.
      order_unknown_ = false;
      return;
    }
    // The first byte of each packet says what kind it is.
    if (buffer[0] == TIOCPKT_DATA) {
      // A change that was made during the read is announced only after the bytes that were written
      // after it.
      NoteSpeed();
      Deliver(receiver, std::span(buffer).subspan(1, static_cast<size_t>(count) - 1));
    } else if ((buffer[0] & TIOCPKT_IOCTL) != 0) {
      AnnounceChanges();
      NoteSpeed();
    }
  }
}

void PtyPort::NoteSpeed() {
  const uint32_t speed = HostSpeed(master_.get());
  if (speed != host_speed_) {
    earlier_speed_ = std::exchange(host_speed_, speed);
    order_unknown_ = true;
  }
}

// The announcement of a new speed comes before the bytes that were written just before the change.
// On a wire the command that asks for the change has left by then, so it counts as sent at the old
// speed.
void PtyPort::Deliver(Receiver& receiver, std::span<const uint8_t> bytes) {
  if (std::exchange(order_unknown_, false)) {
    const size_t earlier = receiver.EndOfSpeedCommand(bytes);
    if (earlier > 0) {
      receiver.Receive(bytes.first(earlier), earlier_speed_, NowMs());
      bytes = bytes.subspan(earlier);
    }
  }
  if (!bytes.empty()) {
    receiver.Receive(bytes, host_speed_, NowMs());
  }
}

// One write at a time, so that a receiver with a lot to send still listens.
void PtyPort::SendDue(Receiver& receiver) {
  const uint64_t now_ms = NowMs();
  const std::optional<uint64_t> next = receiver.NextSendTime();
  if (unwritten_.empty() && next && *next <= now_ms) {
    Write(receiver.Send(now_ms, host_speed_));
  }
}

void PtyPort::Write(std::span<const uint8_t> bytes) {
  while (unwritten_.empty() && !bytes.empty()) {
    const ssize_t count = write(master_.get(), bytes.data(), bytes.size());
    if (count < 0 && errno != EAGAIN && errno != EINTR) {
      ThrowErrno("cannot write to the pseudo-terminal");
    }
    if (count < 0) {
      break;
    }
    bytes = bytes.subspan(static_cast<size_t>(count));
  }
  unwritten_.insert(unwritten_.end(), bytes.begin(), bytes.end());
}

}  // namespace sim
