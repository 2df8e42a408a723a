// The report of the library, opened and read by a host.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_REPORT_H_
#define RCVLINK_TESTS_HOST_SUPPORT_REPORT_H_

#include <chrono>
#include <string>
#include <string_view>
#include <vector>

namespace host {

// A name for a report that no other test uses.
std::wstring NewReportName();
// The path of a report of this name.
std::wstring ReportPath(const std::wstring& name);
// The content of a report; empty when there is none.
std::string ReadReport(const std::wstring& path);
// Its lines without stamps and line ends; kernel handles and addresses read [HANDLE].
std::vector<std::string> ReportLines(const std::wstring& path);

// Opens a report during a test.
class Report {
 public:
  Report();
  Report(const Report&) = delete;
  Report& operator=(const Report&) = delete;
  ~Report();  // closes and deletes it

  const std::wstring& path() const { return path_; }
  std::vector<std::string> Lines() const { return ReportLines(path_); }
  // The lines from number `first` on.
  std::vector<std::string> LinesFrom(size_t first) const;
  // The lines that begin with this text.
  std::vector<std::string> LinesWith(std::string_view start) const;
  bool Has(std::string_view line) const;
  // Waits until a line from number `first` on begins with this text; raises bed::Error when none
  // comes.
  void WaitFor(std::string_view start, size_t first = 0) const;

 private:
  std::wstring path_;
};

}  // namespace host

#endif  // RCVLINK_TESTS_HOST_SUPPORT_REPORT_H_
