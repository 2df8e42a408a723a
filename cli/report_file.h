/// @file report_file.h
/// The library's trace.
#ifndef RCVLINK_CLI_REPORT_FILE_H_
#define RCVLINK_CLI_REPORT_FILE_H_

#include "context.h"

namespace cli {

/// While it lives, the library writes down what it does, when the command line asks for that.
class ReportFile {
 public:
  explicit ReportFile(Context& context);
  ~ReportFile();
  ReportFile(const ReportFile&) = delete;
  ReportFile& operator=(const ReportFile&) = delete;

 private:
  bool wanted_;
};

}  // namespace cli

#endif  // RCVLINK_CLI_REPORT_FILE_H_
