// A download's progress on standard error.
#ifndef RCVLINK_CLI_PROGRESS_H_
#define RCVLINK_CLI_PROGRESS_H_

#include "context.h"
#include "formats.h"
#include "rate_meter.h"

namespace cli {

// A bar, a line now and then, JSON lines, or nothing.
class Progress {
 public:
  Progress(Context& context, const TransferState& start);

  // Erases the bar.
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  // To be called several times a second.
  // `elapsed_ms`: since the beginning.
  void Show(TransferState state, uint64_t elapsed_ms);

 private:
  void Draw(const std::string& line);

  Context& context_;
  ProgressMode mode_;
  RateMeter rate_;
  size_t drawn_width_ = 0;
  uint64_t last_line_ms_ = 0;
};

}  // namespace cli

#endif  // RCVLINK_CLI_PROGRESS_H_
