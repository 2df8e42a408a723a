// What a command did with several files, of which some may have failed.
#ifndef RCVLINK_CLI_COMMANDS_FILE_REPORT_H_
#define RCVLINK_CLI_COMMANDS_FILE_REPORT_H_

#include <optional>
#include <string>

#include "context.h"

namespace cli {

class FileReport {
 public:
  explicit FileReport(Context& context);

  // Records a file that worked.
  // `details`: what JSON says of it besides its name.
  void AddDone(const std::wstring& name, const Json& details);

  // Records a file that failed, and prints the failure.
  void AddFailed(const std::wstring& name, Failure failure);

  // Records how many files were left when the command ended early.
  void AddUntried(size_t count);

  // Records whether the receiver's file list was complete.
  // `doubt`: why not; empty when it was.
  void SetComplete(const std::string& doubt);

  // How the command ended. The first failure counts, unless a later one is a cancellation.
  Outcome Finish() &&;

 private:
  Context& context_;
  Json document_;
  std::optional<Failure> failure_;
};

}  // namespace cli

#endif  // RCVLINK_CLI_COMMANDS_FILE_REPORT_H_
