#include "tests/host/support/simulated_port.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <deque>
#include <mutex>
#include <sstream>
#include <utility>

namespace bed {
namespace {

// The ports that this process has.
class Ports {
 public:
  static Ports& All() {
    static Ports ports;
    return ports;
  }

  std::string Take() {
    const std::scoped_lock lock(mutex_);
    if (free_.empty()) throw Error("no port is left for this test");
    std::string name = free_.front();
    free_.pop_front();
    return name;
  }
  void GiveBack(std::string name) {
    const std::scoped_lock lock(mutex_);
    free_.push_front(std::move(name));
  }

 private:
  Ports() {
    const char* const names = std::getenv("RCVLINK_PORTS");
    std::istringstream list(names == nullptr ? "" : names);
    for (std::string name; list >> name;) free_.push_back(name);
  }

  std::mutex mutex_;
  std::deque<std::string> free_;
};

std::wstring Widen(const std::string& ascii) { return std::wstring(ascii.begin(), ascii.end()); }

}  // namespace

PortLease::PortLease() : name_(Ports::All().Take()) {}

PortLease::~PortLease() { Ports::All().GiveBack(name_); }

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
  const int status = answer.at("status").get<int>();
  // A test that fails because its receiver ended shows this as the cause.
  if (status != 0 || answer.at("has_ended").get<bool>()) {
    std::printf("%s: the receiver had ended, or failed: %d %s\n",
                lease_.name().c_str(),
                status,
                answer.at("errors").get<std::string>().c_str());
  }
  return status;
}

void SimulatedPort::Kill() {
  Ask("kill");
  plugged_ = false;
}

void SimulatedPort::Start(std::vector<std::string> arguments) {
  if (std::find(arguments.begin(), arguments.end(), "--folder") == arguments.end()) {
    arguments.insert(arguments.end(), {"--folder", files_.unix_path()});
  }
  transcript_.Clear();
  arguments.insert(arguments.end(), {"--transcript", transcript_.unix_path()});
  connection_.Request({{"do", "start"}, {"port", lease_.name()}, {"arguments", arguments}});
  plugged_ = true;
}

void SimulatedPort::Pause() { Ask("pause"); }

void SimulatedPort::Resume() { Ask("resume"); }

std::optional<int> SimulatedPort::Status() {
  const nlohmann::json status = Ask("status").at("status");
  return status.is_null() ? std::nullopt : std::optional(status.get<int>());
}

nlohmann::json SimulatedPort::Ask(const char* what) {
  return connection_.Request({{"do", what}, {"port", lease_.name()}});
}

}  // namespace bed
