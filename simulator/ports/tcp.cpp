#include "simulator/ports/tcp.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <ctime>
#include <optional>
#include <stdexcept>
#include <system_error>
#include <tuple>
#include <utility>

namespace sim {
namespace {

constexpr const char* kThisComputer = "127.0.0.1";
constexpr size_t kReadSize = 4096;
constexpr uint64_t kMsPerSecond = 1000;
constexpr uint64_t kNsPerMs = 1'000'000;

[[noreturn]] void ThrowErrno(const std::string& what) {
  throw std::system_error(errno, std::generic_category(), what);
}

std::pair<std::string, uint16_t> SplitAddress(const std::string& address) {
  const size_t colon = address.rfind(':');
  const std::string host = colon == std::string::npos ? kThisComputer : address.substr(0, colon);
  const std::string number = colon == std::string::npos ? address : address.substr(colon + 1);
  uint16_t port = 0;
  const char* const end = number.data() + number.size();
  const auto [stop, error] = std::from_chars(number.data(), end, port);
  in_addr ignored{};
  if (error != std::errc() || stop != end || inet_pton(AF_INET, host.c_str(), &ignored) != 1) {
    throw std::invalid_argument("'" + address +
                                "' is no [HOST:]PORT, with a host such as 127.0.0.1");
  }
  return {host, port};
}

void SetFlag(int socket, int level, int flag) {
  const int on = 1;
  setsockopt(socket, level, flag, &on, sizeof(on));
}

}  // namespace

TcpPort::TcpPort(const std::string& address) {
  std::tie(host_, port_) = SplitAddress(address);
  Listen();
  address_ = host_ + ':' + std::to_string(port_);
}

void TcpPort::Listen() {
  listener_.Reset(socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
  sockaddr_in name{};
  name.sin_family = AF_INET;
  name.sin_port = htons(port_);
  inet_pton(AF_INET, host_.c_str(), &name.sin_addr);
  SetFlag(listener_.get(), SOL_SOCKET, SO_REUSEADDR);
  socklen_t size = sizeof(name);
  auto* const any_name = reinterpret_cast<sockaddr*>(&name);
  if (bind(listener_.get(), any_name, size) != 0 || listen(listener_.get(), SOMAXCONN) != 0 ||
      getsockname(listener_.get(), any_name, &size) != 0) {
    ThrowErrno("cannot listen on port " + std::to_string(port_));
  }
  // The same port again after an unplugging.
  port_ = ntohs(name.sin_port);
}

void TcpPort::Serve(Receiver& receiver,
                    const volatile std::sig_atomic_t& stop,
                    const sigset_t& wait_mask) {
  while (stop == 0 && !receiver.gone()) {
    Wait(receiver, wait_mask);
    TakeHost();
    Write();
    TakeInput(receiver);
    SendDue(receiver);
    if (!receiver.plugged()) {
      connection_.Close();
      unwritten_.clear();
      listener_.Close();
    } else if (!listener_.is_open()) {
      Listen();
    }
  }
}

void TcpPort::Wait(const Receiver& receiver, const sigset_t& wait_mask) const {
  // The next host waits until this one has closed its connection.
  pollfd event{connection_.is_open() ? connection_.get() : listener_.get(), POLLIN, 0};
  if (!unwritten_.empty()) {
    event.events |= POLLOUT;
  }
  const std::optional<uint64_t> wait_ms =
      unwritten_.empty() ? clock_.WaitMs(receiver) : std::nullopt;
  timespec timeout{};
  timeout.tv_sec = static_cast<time_t>(wait_ms.value_or(0) / kMsPerSecond);
  timeout.tv_nsec = static_cast<long>(wait_ms.value_or(0) % kMsPerSecond * kNsPerMs);
  if (ppoll(&event, 1, wait_ms ? &timeout : nullptr, &wait_mask) < 0 && errno != EINTR) {
    ThrowErrno("cannot wait for the connection");
  }
}

void TcpPort::TakeHost() {
  if (connection_.is_open() || !listener_.is_open()) {
    return;
  }
  connection_.Reset(accept4(listener_.get(), nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC));
  if (connection_.is_open()) {
    SetFlag(connection_.get(), IPPROTO_TCP, TCP_NODELAY);
  }
}

void TcpPort::TakeInput(Receiver& receiver) {
  std::array<uint8_t, kReadSize> buffer{};
  while (connection_.is_open() && !receiver.gone()) {
    const ssize_t count = recv(connection_.get(), buffer.data(), buffer.size(), 0);
    if (count < 0 && (errno == EAGAIN || errno == EINTR)) {
      return;
    }
    if (count <= 0) {
      connection_.Close();
      unwritten_.clear();
      return;
    }
    receiver.Receive(
        std::span(buffer).first(static_cast<size_t>(count)), /*host_speed=*/0, clock_.NowMs());
  }
}

// One piece at a time, so that a receiver with a lot to send still listens. What it sends without a
// host is lost.
void TcpPort::SendDue(Receiver& receiver) {
  if (unwritten_.empty() && clock_.IsDue(receiver)) {
    unwritten_ = receiver.Send(clock_.NowMs(), /*host_speed=*/0);
    Write();
  }
}

void TcpPort::Write() {
  if (!connection_.is_open()) {
    unwritten_.clear();
  }
  while (!unwritten_.empty()) {
    const ssize_t count =
        send(connection_.get(), unwritten_.data(), unwritten_.size(), MSG_NOSIGNAL);
    if (count < 0 && errno != EINTR) {
      if (errno != EAGAIN) {
        // The next read says that the host has gone.
        unwritten_.clear();
      }
      return;
    }
    unwritten_.erase(unwritten_.begin(), unwritten_.begin() + std::max<ssize_t>(count, 0));
  }
}

}  // namespace sim
