// The owner of a file descriptor (Linux).
#ifndef SIMULATOR_PORTS_DESCRIPTOR_H_
#define SIMULATOR_PORTS_DESCRIPTOR_H_

#include <unistd.h>

#include <utility>

namespace sim {

class Descriptor {
 public:
  Descriptor() = default;
  explicit Descriptor(int fd) : fd_(fd) {}
  ~Descriptor() { Close(); }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;

  int get() const { return fd_; }
  bool is_open() const { return fd_ >= 0; }
  void Reset(int fd) {
    Close();
    fd_ = fd;
  }
  void Close() {
    if (is_open()) {
      close(std::exchange(fd_, -1));
    }
  }

 private:
  int fd_ = -1;
};

}  // namespace sim

#endif  // SIMULATOR_PORTS_DESCRIPTOR_H_
