#include "tests/host/support/bed_connection.h"

#include <winsock2.h>

#include <array>
#include <cstdlib>
#include <string_view>

namespace bed {
namespace {

constexpr WORD kWinsockVersion = 0x0202;

// Each user must start and clean up Winsock.
class WinsockUser {
 public:
  WinsockUser() {
    WSADATA data;
    if (WSAStartup(kWinsockVersion, &data) != 0) throw Error("Winsock does not start");
  }
  WinsockUser(const WinsockUser&) = delete;
  WinsockUser& operator=(const WinsockUser&) = delete;
  ~WinsockUser() { WSACleanup(); }
};

sockaddr_in ServerAddress() {
  const char* const value = std::getenv("RCVLINK_BED");
  if (value == nullptr) {
    throw Error("RCVLINK_BED is not set: start the tests with ./test, or see tests/README.md");
  }
  const std::string text = value;
  const size_t colon = text.find(':');
  if (colon == std::string::npos) throw Error("RCVLINK_BED is not HOST:PORT: " + text);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = inet_addr(text.substr(0, colon).c_str());
  address.sin_port = htons(static_cast<u_short>(std::stoul(text.substr(colon + 1))));
  return address;
}

SOCKET Connect() {
  static const WinsockUser winsock;
  const sockaddr_in address = ServerAddress();
  const SOCKET connected = socket(AF_INET, SOCK_STREAM, IPPROTO_TCP);
  if (connected == INVALID_SOCKET) throw Error("no socket");
  if (connect(connected, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
    closesocket(connected);
    throw Error("the bed server does not answer");
  }
  return connected;
}

}  // namespace

Connection::Connection() : socket_(Connect()) {}

Connection::~Connection() { closesocket(socket_); }

nlohmann::json Connection::Request(const nlohmann::json& request) {
  Send(request.dump() + "\n");
  nlohmann::json answer = nlohmann::json::parse(ReceiveLine());
  if (!answer.at("ok").get<bool>()) {
    throw Error(request.at("do").get<std::string>() + ": " + answer.at("error").get<std::string>());
  }
  return answer;
}

void Connection::Send(const std::string& text) {
  std::string_view rest = text;
  while (!rest.empty()) {
    const int count = send(socket_, rest.data(), static_cast<int>(rest.size()), 0);
    if (count <= 0) throw Error("the bed server is gone");
    rest.remove_prefix(static_cast<size_t>(count));
  }
}

std::string Connection::ReceiveLine() {
  std::array<char, 4096> buffer;
  size_t end = received_.find('\n');
  while (end == std::string::npos) {
    const int count = recv(socket_, buffer.data(), static_cast<int>(buffer.size()), 0);
    if (count <= 0) throw Error("the bed server is gone");
    received_.append(buffer.data(), static_cast<size_t>(count));
    end = received_.find('\n');
  }
  std::string line = received_.substr(0, end);
  received_.erase(0, end + 1);
  return line;
}

}  // namespace bed
