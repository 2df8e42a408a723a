// rcvlink-sim, run as a user runs it.
#ifndef TESTS_SIMULATOR_PROGRAM_H_
#define TESTS_SIMULATOR_PROGRAM_H_

#include <sys/types.h>

#include <filesystem>
#include <string>
#include <vector>

#include "simulator/ports/descriptor.h"

namespace sim {

// A folder that is removed with its content in the end.
class TemporaryFolder {
 public:
  TemporaryFolder();
  ~TemporaryFolder();
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;

  std::string operator/(const std::string& name) const { return (path_ / name).string(); }
  void Write(const std::string& name, const std::string& content) const;
  std::string Read(const std::string& name) const;

 private:
  std::filesystem::path path_;
};

// The program while it runs; it is ended with the object.
class Program {
 public:
  explicit Program(const std::vector<std::string>& arguments);
  ~Program();
  Program(const Program&) = delete;
  Program& operator=(const Program&) = delete;

  // The next line of the output and the errors; empty at the end.
  std::string ReadLine();
  // Everything up to the end of the program.
  std::string ReadAll();
  // The exit status, when it has ended; Terminate asks for that.
  int Wait();
  void Terminate();

 private:
  pid_t process_ = 0;
  Descriptor output_;
};

// A host that has opened a TCP port.
class TcpHost {
 public:
  // `address` is "127.0.0.1:PORT".
  explicit TcpHost(const std::string& address);

  bool connected() const { return connected_; }
  // That the connection has been closed shows when nothing can be read.
  void Write(std::string_view text);
  // So many bytes, or fewer at the end of the connection.
  std::string Read(size_t size);

 private:
  Descriptor socket_;
  bool connected_ = false;
};

}  // namespace sim

#endif  // TESTS_SIMULATOR_PROGRAM_H_
