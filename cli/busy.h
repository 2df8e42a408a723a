// A line on the terminal while the program waits for the receiver.
#ifndef RCVLINK_CLI_BUSY_H_
#define RCVLINK_CLI_BUSY_H_

#include <cstdint>
#include <optional>
#include <string>

#include "context.h"
#include "ticker.h"

namespace cli {

// While it lives, a line says what is going on and for how long. It appears after a second, and only
// where a bar would be shown.
class Busy {
 public:
  Busy(Context& context, std::string what);
  ~Busy();
  Busy(const Busy&) = delete;
  Busy& operator=(const Busy&) = delete;

 private:
  void Draw();

  Context& context_;
  const std::string what_;
  const uint64_t start_ms_;
  size_t drawn_width_ = 0;
  std::optional<Ticker> ticker_;
};

}  // namespace cli

#endif  // RCVLINK_CLI_BUSY_H_
