#include "report_file.h"

#include <windows.h>

#include <cstdarg>
#include <vector>

#include "paths.h"
#include "rcvlink.h"
#include "text.h"

namespace cli {
namespace {

// Writes one line into the report.
void WriteLine(const wchar_t* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  dump_hlp::DumpReportString(format, arguments);
  va_end(arguments);
}

// "1.0.0.0", from the version resource of a module; "unknown" without one.
std::wstring VersionOf(const wchar_t* module) {
  const DWORD size = GetFileVersionInfoSizeW(module, nullptr);
  std::vector<BYTE> block(size);
  void* value = nullptr;
  UINT length = 0;
  if (size == 0 || !GetFileVersionInfoW(module, 0, size, block.data()) ||
      !VerQueryValueW(block.data(), L"\\", &value, &length)) {
    return L"unknown";
  }
  const auto& version = *static_cast<const VS_FIXEDFILEINFO*>(value);
  return std::to_wstring(HIWORD(version.dwFileVersionMS)) + L"." +
         std::to_wstring(LOWORD(version.dwFileVersionMS)) + L"." +
         std::to_wstring(HIWORD(version.dwFileVersionLS)) + L"." +
         std::to_wstring(LOWORD(version.dwFileVersionLS));
}

void WriteHeading() {
  const std::wstring command_line = ToUtf16(Printable(GetCommandLineW()));
  WriteLine(L"rcvlink-cli %s, rcvlink.dll %s, kernel32.dll %s\r\n",
            L"" RCVLINK_VERSION,
            VersionOf(L"rcvlink.dll").c_str(),
            VersionOf(L"kernel32.dll").c_str());
  WriteLine(L"command line: %s\r\n", command_line.c_str());
}

}  // namespace

ReportFile::ReportFile(Context& context) {
  const std::wstring& name = context.arguments.report;
  if (name.empty()) return;
  wchar_t folder[MAX_PATH + 1] = L"";
  GetTempPathW(MAX_PATH + 1, folder);
  const std::wstring path = folder + name;
  const std::string shown = Printable(path);
  if (Exists(path) && !context.arguments.force) {
    Failure failure = LocalFailure("create the report " + shown, ERROR_FILE_EXISTS);
    failure.meaning = "it already exists";
    failure.hint = "--force replaces it; --report with another name keeps it.";
    throw failure;
  }
  dump_hlp::CreateReportFile(name.c_str());
  if (!Exists(path)) throw LocalFailure("create the report " + shown, ERROR_CANNOT_MAKE);
  path_ = path;
  WriteHeading();
  context.PrintStatus("The report is in " + shown + " (a hidden file).\n");
}

ReportFile::~ReportFile() {
  if (!path_.empty()) dump_hlp::CloseReportFile();
}

}  // namespace cli
