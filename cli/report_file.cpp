#include "report_file.h"

#include <windows.h>

#include "paths.h"
#include "rcvlink.h"
#include "text.h"

namespace cli {

ReportFile::ReportFile(Context& context) : wanted_(!context.arguments.report.empty()) {
  if (!wanted_) return;
  wchar_t folder[MAX_PATH + 1] = L"";
  GetTempPathW(MAX_PATH + 1, folder);
  const std::wstring path = folder + context.arguments.report;
  dump_hlp::CreateReportFile(context.arguments.report.c_str());
  const std::string shown = Printable(path);
  context.PrintStatus(Exists(path) ? "The report is in " + shown + " (a hidden file).\n"
                                   : "The report " + shown + " could not be made.\n");
}

ReportFile::~ReportFile() {
  if (wanted_) dump_hlp::CloseReportFile();
}

}  // namespace cli
