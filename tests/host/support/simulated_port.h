// Serial ports with simulated receivers on them.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_SIMULATED_PORT_H_
#define RCVLINK_TESTS_HOST_SUPPORT_SIMULATED_PORT_H_

#include <chrono>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tests/host/support/bed_connection.h"
#include "tests/host/support/temp_folder.h"
#include "tests/host/support/transcript_file.h"

namespace bed {

// The right to use one of the serial ports of this test process. Each process that runs has ports of
// its own (RCVLINK_PORTS, set by run_program.py), so those that run side by side do not meet. Nothing is
// plugged in.
class PortLease {
 public:
  // Raises Error when all are in use.
  PortLease();
  PortLease(const PortLease&) = delete;
  PortLease& operator=(const PortLease&) = delete;
  ~PortLease();

  // "COM12"
  const std::string& name() const { return name_; }

 private:
  std::string name_;
};

// A serial port with a simulated receiver plugged in.
class SimulatedPort {
 public:
  // `arguments` are those of rcvlink-sim, the family first: {"quorin", "--id", "ABC"}. What it
  // needs besides is added: --link, --transcript, and --folder with files(), unless it is given.
  // `files` are put there first, by name; the receiver looks at its folder when it starts. Returns
  // when the port can be opened.
  explicit SimulatedPort(std::vector<std::string> arguments,
                         const std::map<std::string, std::string>& files = {});
  SimulatedPort(const SimulatedPort&) = delete;
  SimulatedPort& operator=(const SimulatedPort&) = delete;
  // Unplugs the receiver.
  ~SimulatedPort();

  // L"COM12", as a user says it.
  std::wstring name() const;
  // L"\\\\.\\COM12", as CreateFileW wants it.
  std::wstring path() const;

  // The folder that the receiver serves.
  const TempFolder& files() const { return files_; }

  // Asks the receiver's program to end and returns its exit status. The port is then absent.
  int Stop();
  // Unplugs it in the middle of whatever it does.
  void Kill();
  // Plugs one in again after Stop or Kill. The transcript starts afresh.
  void Start(std::vector<std::string> arguments);
  // The receiver does nothing until it is resumed; the port takes what is written to it.
  void Pause();
  void Resume();
  // The exit status, when the receiver's program has ended by itself.
  std::optional<int> Status();

  // What has passed over the line so far, one event a line: "> " from the host, "< " from the
  // receiver, "= " a setting, "- " a remark.
  std::string Transcript() const { return transcript_.Text(); }
  // Waits until the transcript holds `text`; raises Error when it does not come.
  void WaitForTranscript(std::string_view text,
                         std::chrono::milliseconds timeout = std::chrono::seconds(20)) const {
    transcript_.WaitFor(text, timeout);
  }

 private:
  nlohmann::json Ask(const char* what);

  PortLease lease_;
  TempFolder files_;
  TranscriptFile transcript_;
  Connection connection_;
  bool plugged_ = false;
};

}  // namespace bed

#endif  // RCVLINK_TESTS_HOST_SUPPORT_SIMULATED_PORT_H_
