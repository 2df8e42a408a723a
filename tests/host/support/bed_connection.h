// A client of the bed server (tests/bed/bed.py), which does on Linux what a test under Wine cannot
// do itself. The server's address is in the environment variable RCVLINK_BED.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_BED_CONNECTION_H_
#define RCVLINK_TESTS_HOST_SUPPORT_BED_CONNECTION_H_

#include <cstdint>
#include <nlohmann/json.hpp>
#include <stdexcept>
#include <string>

namespace bed {

// The bed server does not answer, or refused a request.
class Error : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// One connection. When it closes, the server stops whatever was started through it. For one thread
// at a time.
class Connection {
 public:
  Connection();
  Connection(const Connection&) = delete;
  Connection& operator=(const Connection&) = delete;
  ~Connection();

  // Sends a request and returns its answer; raises Error when the answer is a refusal.
  nlohmann::json Request(const nlohmann::json& request);

 private:
  void Send(const std::string& text);
  std::string ReceiveLine();

  // A SOCKET. Winsock's header must come before <windows.h>, so it is not included here.
  std::uintptr_t socket_;
  std::string received_;
};

}  // namespace bed

#endif  // RCVLINK_TESTS_HOST_SUPPORT_BED_CONNECTION_H_
