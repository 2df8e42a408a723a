/// @file progress.h
/// A download's progress on standard error.
#ifndef RCVLINK_CLI_PROGRESS_H_
#define RCVLINK_CLI_PROGRESS_H_

#include "context.h"
#include "formats.h"

namespace cli {

/// A bar on a terminal, a plain line now and then elsewhere.
class Progress {
 public:
  Progress(Context& context, const TransferState& start);

  /// Takes the bar away.
  ~Progress();
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;

  /// To be called several times a second.
  void Show(const TransferState& state);

 private:
  Context& context_;
  std::size_t drawn_width_ = 0;
  std::uint64_t last_line_ms_ = 0;
};

}  // namespace cli

#endif  // RCVLINK_CLI_PROGRESS_H_
