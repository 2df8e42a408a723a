#include "tests/simulator/program.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <fstream>
#include <iterator>
#include <stdexcept>

namespace sim {
namespace {

constexpr int kCannotStart = 127;
// No test waits so long; it only ends one that hangs.
constexpr time_t kMostSeconds = 30;

[[noreturn]] void Execute(const std::vector<std::string>& arguments, int output) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  dup2(output, STDOUT_FILENO);
  dup2(output, STDERR_FILENO);
  std::string program = SIMULATOR_PROGRAM;
  std::vector<std::string> words = arguments;
  std::vector<char*> list = {program.data()};
  for (std::string& word : words) list.push_back(word.data());
  list.push_back(nullptr);
  execv(program.c_str(), list.data());
  _exit(kCannotStart);
}

}  // namespace

TemporaryFolder::TemporaryFolder() {
  std::string name = (std::filesystem::temp_directory_path() / "rcvlink-sim-XXXXXX").string();
  if (mkdtemp(name.data()) == nullptr) throw std::runtime_error("no folder");
  path_ = name;
}

TemporaryFolder::~TemporaryFolder() {
  std::error_code ignored;
  std::filesystem::remove_all(path_, ignored);
}

void TemporaryFolder::Write(const std::string& name, const std::string& content) const {
  std::ofstream(path_ / name, std::ios::binary) << content;
}

std::string TemporaryFolder::Read(const std::string& name) const {
  std::ifstream file(path_ / name, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

Program::Program(const std::vector<std::string>& arguments) {
  std::array<int, 2> ends{};
  if (pipe2(ends.data(), O_CLOEXEC) != 0) throw std::runtime_error("no pipe");
  output_.Reset(ends[0]);
  const Descriptor write_end(ends[1]);
  process_ = fork();
  if (process_ == 0) Execute(arguments, write_end.get());
}

Program::~Program() {
  if (process_ > 0) {
    kill(process_, SIGKILL);
    Wait();
  }
}

std::string Program::ReadLine() {
  std::string line;
  for (char character = 0; read(output_.get(), &character, 1) == 1 && character != '\n';) {
    line += character;
  }
  return line;
}

std::string Program::ReadAll() {
  std::string all;
  std::array<char, 4096> some{};
  for (ssize_t count; (count = read(output_.get(), some.data(), some.size())) > 0;) {
    all.append(some.data(), static_cast<size_t>(count));
  }
  return all;
}

int Program::Wait() {
  int status = 0;
  waitpid(process_, &status, 0);
  process_ = 0;
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

void Program::Terminate() { kill(process_, SIGTERM); }

TcpHost::TcpHost(const std::string& address)
    : socket_(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
  const timeval limit{kMostSeconds, 0};
  setsockopt(socket_.get(), SOL_SOCKET, SO_RCVTIMEO, &limit, sizeof(limit));
  const size_t colon = address.find(':');
  sockaddr_in name{};
  name.sin_family = AF_INET;
  name.sin_port = htons(static_cast<uint16_t>(std::stoi(address.substr(colon + 1))));
  inet_pton(AF_INET, address.substr(0, colon).c_str(), &name.sin_addr);
  connected_ = connect(socket_.get(), reinterpret_cast<sockaddr*>(&name), sizeof(name)) == 0;
}

void TcpHost::Write(std::string_view text) {
  [[maybe_unused]] const ssize_t ignored =
      send(socket_.get(), text.data(), text.size(), MSG_NOSIGNAL);
}

std::string TcpHost::Read(size_t size) {
  std::string all(size, '\0');
  size_t length = 0;
  while (length < size) {
    const ssize_t count = recv(socket_.get(), all.data() + length, size - length, 0);
    if (count <= 0) break;
    length += static_cast<size_t>(count);
  }
  all.resize(length);
  return all;
}

}  // namespace sim
