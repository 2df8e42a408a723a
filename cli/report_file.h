// The library's trace.
#ifndef RCVLINK_CLI_REPORT_FILE_H_
#define RCVLINK_CLI_REPORT_FILE_H_

#include <string>

#include "context.h"

namespace cli {

// While it lives, the library writes a trace of what it does, if the command line asks for one.
// The report begins with the versions and the command line.
class ReportFile {
 public:
  // Throws Failure when the file exists already and may not be overwritten, or cannot be made.
  explicit ReportFile(Context& context);
  ~ReportFile();
  ReportFile(const ReportFile&) = delete;
  ReportFile& operator=(const ReportFile&) = delete;

  // Where it is; empty when none was asked for.
  const std::wstring& path() const { return path_; }

 private:
  std::wstring path_;
};

}  // namespace cli

#endif  // RCVLINK_CLI_REPORT_FILE_H_
