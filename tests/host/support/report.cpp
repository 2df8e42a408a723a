#include "tests/host/support/report.h"

#include <windows.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <regex>
#include <thread>

#include "rcvlink.h"
#include "tests/host/support/bed_connection.h"
#include "tests/host/support/handle.h"

namespace host {
namespace {

constexpr auto kPatience = std::chrono::seconds(20);
constexpr auto kPollInterval = std::chrono::milliseconds(5);

// "12:05:09.0042", a blank, the thread in six columns or more, a blank
std::string WithoutStamp(const std::string& line) {
  static const std::regex stamp(R"(^\d\d:\d\d:\d\d\.\d{4} (\d{6,}| +\d+) )");
  return std::regex_replace(line, stamp, "");
}

std::string WithoutHandles(const std::string& line) {
  static const std::regex handle(R"(\[0x[0-9A-F]{16}\])");
  return std::regex_replace(line, handle, "[HANDLE]");
}

}  // namespace

std::wstring NewReportName() {
  static std::atomic<int> counter = 0;
  return L"rcvlink-host-" + std::to_wstring(GetCurrentProcessId()) + L"-" +
         std::to_wstring(counter++) + L".txt";
}

std::wstring ReportPath(const std::wstring& name) {
  std::array<wchar_t, MAX_PATH> folder{};
  GetTempPathW(MAX_PATH, folder.data());
  return folder.data() + name;
}

std::string ReadReport(const std::wstring& path) {
  const bed::UniqueHandle file(CreateFileW(path.c_str(),
                                           GENERIC_READ,
                                           FILE_SHARE_READ | FILE_SHARE_WRITE,
                                           nullptr,
                                           OPEN_EXISTING,
                                           0,
                                           nullptr));
  if (file.get() == INVALID_HANDLE_VALUE) return {};
  std::string text(GetFileSize(file.get(), nullptr), '\0');
  DWORD count = 0;
  ReadFile(file.get(), text.data(), static_cast<DWORD>(text.size()), &count, nullptr);
  text.resize(count);
  return text;
}

std::vector<std::string> ReportLines(const std::wstring& path) {
  std::vector<std::string> lines;
  const std::string text = ReadReport(path);
  size_t start = 0;
  for (size_t end; (end = text.find("\r\n", start)) != std::string::npos; start = end + 2) {
    lines.push_back(WithoutHandles(WithoutStamp(text.substr(start, end - start))));
  }
  return lines;
}

Report::Report() {
  const std::wstring name = NewReportName();
  path_ = ReportPath(name);
  dump_hlp::CreateReportFile(name.c_str());
}

Report::~Report() {
  dump_hlp::CloseReportFile();
  DeleteFileW(path_.c_str());
}

std::vector<std::string> Report::LinesFrom(size_t first) const {
  std::vector<std::string> lines = Lines();
  const size_t count = std::min(first, lines.size());
  lines.erase(lines.begin(), lines.begin() + static_cast<std::ptrdiff_t>(count));
  return lines;
}

std::vector<std::string> Report::LinesWith(std::string_view start) const {
  std::vector<std::string> lines = Lines();
  std::erase_if(lines, [&](const std::string& line) { return !line.starts_with(start); });
  return lines;
}

bool Report::Has(std::string_view line) const { return std::ranges::count(Lines(), line) != 0; }

void Report::WaitFor(std::string_view start, size_t first) const {
  const auto end = std::chrono::steady_clock::now() + kPatience;
  for (;;) {
    const std::vector<std::string> lines = LinesFrom(first);
    if (std::ranges::any_of(lines, [&](const auto& line) { return line.starts_with(start); })) {
      return;
    }
    if (std::chrono::steady_clock::now() > end) {
      throw bed::Error("the report does not hold \"" + std::string(start) + "\"");
    }
    std::this_thread::sleep_for(kPollInterval);
  }
}

}  // namespace host
