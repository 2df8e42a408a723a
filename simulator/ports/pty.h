// A receiver on a pseudo-terminal, which a host opens like a serial port (Linux).
#ifndef SIMULATOR_PORTS_PTY_H_
#define SIMULATOR_PORTS_PTY_H_

#include <chrono>
#include <csignal>
#include <cstdint>
#include <filesystem>
#include <optional>
#include <span>
#include <string>

#include "simulator/bytes.h"
#include "simulator/ports/descriptor.h"
#include "simulator/receiver.h"

namespace sim {

// A symbolic link that lives as long as the object. It replaces a link of that name in one step, but
// nothing else. At the end it is removed, unless another link has replaced it.
class PortLink {
 public:
  // Makes no link when `path` is empty. Throws std::runtime_error.
  PortLink(std::filesystem::path path, std::filesystem::path target);
  ~PortLink();
  PortLink(const PortLink&) = delete;
  PortLink& operator=(const PortLink&) = delete;

 private:
  std::filesystem::path path_;
  std::filesystem::path target_;
};

// A pseudo-terminal with a receiver on its master end; the host opens the slave like a serial port.
class PtyPort {
 public:
  // Throws std::system_error when the system gives no pseudo-terminal.
  explicit PtyPort(const std::filesystem::path& link);

  const std::string& slave_name() const { return slave_name_; }

  // Carries bytes until `stop` is set or the receiver is gone. The signals that set `stop` must be
  // blocked outside of the call; `wait_mask` is the mask to wait with.
  void Serve(Receiver& receiver, const volatile std::sig_atomic_t& stop, const sigset_t& wait_mask);

 private:
  void PrepareSlave();
  void AnnounceChanges();
  uint64_t NowNs() const;
  uint64_t NowMs() const;
  void Wait(const Receiver& receiver, const sigset_t& wait_mask) const;
  void TakeInput(Receiver& receiver);
  void NoteSpeed();
  void Deliver(Receiver& receiver, std::span<const uint8_t> bytes);
  void SendDue(Receiver& receiver);
  void Write(std::span<const uint8_t> bytes);

  Descriptor master_;
  std::string slave_name_;
  // Kept open so that a host that closes the port does not hang up the line.
  Descriptor slave_;
  // Made once the port is ready to be opened.
  std::optional<PortLink> link_;
  std::chrono::steady_clock::time_point start_;
  uint32_t host_speed_ = 0;
  // Set while it is not known whether waiting bytes were written before the speed changed.
  bool order_unknown_ = false;
  uint32_t earlier_speed_ = 0;
  // What the terminal had no room for.
  Bytes unwritten_;
};

}  // namespace sim

#endif  // SIMULATOR_PORTS_PTY_H_
