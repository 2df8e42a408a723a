// Opens a report during a test and gives its lines without stamps.
#ifndef RCVLINK_TESTS_SUPPORT_REPORT_CAPTURE_H_
#define RCVLINK_TESTS_SUPPORT_REPORT_CAPTURE_H_

#include <string>
#include <vector>

class ReportCapture {
 public:
  ReportCapture();
  ReportCapture(const ReportCapture&) = delete;
  ReportCapture& operator=(const ReportCapture&) = delete;
  ~ReportCapture();  // closes and deletes the report

  std::wstring Path() const { return path_; }
  std::string Text() const;                 // the whole report so far, as it is
  std::vector<std::string> Lines() const;   // without stamps and line ends
  bool Has(const std::string& line) const;  // whether one of the lines is just this
  // Whether one of the lines begins so.
  bool HasStart(const std::string& start) const;

 private:
  std::wstring path_;
};

#endif  // RCVLINK_TESTS_SUPPORT_REPORT_CAPTURE_H_
