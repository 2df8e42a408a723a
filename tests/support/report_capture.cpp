#include "tests/support/report_capture.h"

#include <algorithm>
#include <array>
#include <atomic>

#include "platform/api_types.h"
#include "platform/handle.h"

using rcvlink::FileHandle;

ReportCapture::ReportCapture() {
  static std::atomic<int> counter = 0;
  const std::wstring name = L"rcvlink-test-" + std::to_wstring(GetCurrentProcessId()) + L"-" +
                            std::to_wstring(counter++) + L".txt";
  std::array<wchar_t, MAX_PATH> folder{};
  GetTempPathW(MAX_PATH, folder.data());
  path_ = folder.data() + name;
  dump_hlp::CreateReportFile(name.c_str());
}

ReportCapture::~ReportCapture() {
  dump_hlp::CloseReportFile();
  DeleteFileW(path_.c_str());
}

std::string ReportCapture::Text() const {
  const FileHandle file(CreateFileW(path_.c_str(),
                                    GENERIC_READ,
                                    FILE_SHARE_READ | FILE_SHARE_WRITE,
                                    nullptr,
                                    OPEN_EXISTING,
                                    0,
                                    nullptr));
  if (!file) return {};
  std::string text(GetFileSize(file.get(), nullptr), '\0');
  DWORD count = 0;
  ReadFile(file.get(), text.data(), static_cast<DWORD>(text.size()), &count, nullptr);
  text.resize(count);
  return text;
}

std::vector<std::string> ReportCapture::Lines() const {
  // "hh:mm:ss.mmmm " and the thread's number, at least six columns wide, and a blank.
  constexpr size_t kStampTime = 14;
  std::vector<std::string> lines;
  const std::string text = Text();
  size_t start = 0;
  for (size_t end; (end = text.find("\r\n", start)) != std::string::npos; start = end + 2) {
    std::string line = text.substr(start, end - start);
    const size_t number = line.find_first_not_of(' ', std::min(kStampTime, line.size()));
    const size_t blank = line.find(' ', number);
    lines.push_back(blank == std::string::npos ? line : line.substr(blank + 1));
  }
  return lines;
}

bool ReportCapture::Has(const std::string& line) const {
  return std::ranges::count(Lines(), line) != 0;
}

bool ReportCapture::HasStart(const std::string& start) const {
  return std::ranges::any_of(Lines(),
                             [&](const std::string& line) { return line.starts_with(start); });
}
