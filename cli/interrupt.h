// Ctrl-C.
#ifndef RCVLINK_CLI_INTERRUPT_H_
#define RCVLINK_CLI_INTERRUPT_H_

#include <string>

#include "handle.h"

namespace cli {

// While it lives, Ctrl-C, Ctrl-Break and the closing of the console window signal an event instead
// of ending the process. There is one per process.
class Interrupt {
 public:
  // `message`: printed on standard error at the moment of the first Ctrl-C; may be empty.
  explicit Interrupt(std::string message);
  ~Interrupt();
  Interrupt(const Interrupt&) = delete;
  Interrupt& operator=(const Interrupt&) = delete;

  // Manual reset; null when it could not be made, and Ctrl-C ends the process as usual.
  HANDLE event() const { return event_.get(); }
  bool requested() const;

 private:
  std::string message_;
  UniqueHandle event_;
};

}  // namespace cli

#endif  // RCVLINK_CLI_INTERRUPT_H_
