#include "tests/host/support/simulated_port.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <mutex>
#include <thread>
#include <utility>

namespace bed {
namespace {

constexpr int kFirstPort = 10;
constexpr int kPortsPerSet = 3;
constexpr const char* kTranscript = "transcript.txt";
constexpr auto kPollInterval = std::chrono::milliseconds(5);

std::mutex slots_mutex;
std::array<bool, kPortsPerSet> slots_in_use{};

// The set of ports of this process.
int PortSet() {
  const char* const value = std::getenv("RCVLINK_PORT_SET");
  return value == nullptr ? 0 : std::atoi(value);
}

int TakeSlot() {
  const std::scoped_lock lock(slots_mutex);
  const auto slot = std::find(slots_in_use.begin(), slots_in_use.end(), false);
  if (slot == slots_in_use.end()) throw Error("no port is left for this test");
  *slot = true;
  return static_cast<int>(slot - slots_in_use.begin());
}

std::wstring Widen(const std::string& ascii) { return std::wstring(ascii.begin(), ascii.end()); }

}  // namespace

PortLease::PortLease() : slot_(TakeSlot()) {}

PortLease::~PortLease() {
  const std::scoped_lock lock(slots_mutex);
  slots_in_use.at(static_cast<size_t>(slot_)) = false;
}

std::string PortLease::name() const {
  return "COM" + std::to_string(kFirstPort + kPortsPerSet * PortSet() + slot_);
}

SimulatedPort::SimulatedPort(std::vector<std::string> arguments,
                             const std::map<std::string, std::string>& files) {
  for (const auto& [name, content] : files) files_.Write(name, content);
  Start(std::move(arguments));
}

SimulatedPort::~SimulatedPort() {
  try {
    if (plugged_) Stop();
  } catch (const std::exception&) {
    // The server stops the receiver when the connection closes.
  }
}

std::wstring SimulatedPort::name() const { return Widen(lease_.name()); }

std::wstring SimulatedPort::path() const { return L"\\\\.\\" + name(); }

int SimulatedPort::Stop() {
  const nlohmann::json answer = Ask("stop");
  plugged_ = false;
  return answer.at("status").get<int>();
}

void SimulatedPort::Kill() {
  Ask("kill");
  plugged_ = false;
}

void SimulatedPort::Start(std::vector<std::string> arguments) {
  if (std::find(arguments.begin(), arguments.end(), "--folder") == arguments.end()) {
    arguments.insert(arguments.end(), {"--folder", files_.unix_path()});
  }
  arguments.insert(arguments.end(), {"--transcript", notes_.unix_path() + "/" + kTranscript});
  connection_.Request({{"do", "start"}, {"port", lease_.name()}, {"arguments", arguments}});
  plugged_ = true;
}

void SimulatedPort::Pause() { Ask("pause"); }

void SimulatedPort::Resume() { Ask("resume"); }

std::optional<int> SimulatedPort::Status() {
  const nlohmann::json status = Ask("status").at("status");
  return status.is_null() ? std::nullopt : std::optional(status.get<int>());
}

std::string SimulatedPort::Transcript() const { return notes_.Read(kTranscript); }

void SimulatedPort::WaitForTranscript(std::string_view text,
                                      std::chrono::milliseconds timeout) const {
  const auto end = std::chrono::steady_clock::now() + timeout;
  std::string transcript = Transcript();
  while (transcript.find(text) == std::string::npos) {
    if (std::chrono::steady_clock::now() > end) {
      throw Error("the transcript does not hold \"" + std::string(text) + "\":\n" + transcript);
    }
    std::this_thread::sleep_for(kPollInterval);
    transcript = Transcript();
  }
}

nlohmann::json SimulatedPort::Ask(const char* what) {
  return connection_.Request({{"do", what}, {"port", lease_.name()}});
}

}  // namespace bed
