// The report as a host sees it: its own lines, its file.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <cstdarg>
#include <cstdio>
#include <regex>
#include <string>

#include "rcvlink.h"
#include "tests/host/support/report.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

void Say(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  dump_hlp::DumpReportString(format, arguments);
  va_end(arguments);
}

void Say(const wchar_t* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  dump_hlp::DumpReportString(format, arguments);
  va_end(arguments);
}

TEST(ApiReport, TakesTheHostsLines) {
  const host::Report report;
  Say("narrow [%s] [%u] [%05.1f]\r\n", "text", 42U, 2.5);
  Say(L"wide [%s] [%i] [0x%08X]\r\n", L"text", -42, 0x8007048FU);
  EXPECT_THAT(report.Lines(),
              ElementsAre("narrow [text] [42] [002.5]", "wide [text] [-42] [0x8007048F]"));
}

TEST(ApiReport, StampsALineWithTimeAndThread) {
  const host::Report report;
  Say("line\r\n");
  std::string end(64, '\0');
  const int length = std::snprintf(end.data(), end.size(), " %6lu line\r\n", GetCurrentThreadId());
  end.resize(static_cast<size_t>(length));
  const std::string text = host::ReadReport(report.path());
  static const std::regex time(R"(^([01]\d|2[0-3]):[0-5]\d:[0-5]\d\.0\d{3} )");
  EXPECT_TRUE(std::regex_search(text, time)) << text;
  EXPECT_EQ(text.substr(13), end);
}

TEST(ApiReport, IsHiddenAndOthersMayOnlyReadIt) {
  const host::Report report;
  const DWORD attributes = GetFileAttributesW(report.path().c_str());
  ASSERT_NE(attributes, INVALID_FILE_ATTRIBUTES);
  EXPECT_NE(attributes & FILE_ATTRIBUTE_HIDDEN, 0U);
  const HANDLE writer = CreateFileW(report.path().c_str(),
                                    GENERIC_WRITE,
                                    FILE_SHARE_READ | FILE_SHARE_WRITE,
                                    nullptr,
                                    OPEN_EXISTING,
                                    0,
                                    nullptr);
  EXPECT_EQ(writer, INVALID_HANDLE_VALUE);
  EXPECT_EQ(GetLastError(), DWORD{ERROR_SHARING_VIOLATION});
}

TEST(ApiReport, NewOneOfTheSameNameStartsEmpty) {
  const std::wstring name = host::NewReportName();
  const std::wstring path = host::ReportPath(name);
  dump_hlp::CreateReportFile(name.c_str());
  Say("first\r\n");
  dump_hlp::CreateReportFile(name.c_str());
  Say("second\r\n");
  EXPECT_THAT(host::ReportLines(path), ElementsAre("second"));
  dump_hlp::CloseReportFile();
  Say("after the end\r\n");
  EXPECT_THAT(host::ReportLines(path), ElementsAre("second"));
  EXPECT_TRUE(DeleteFileW(path.c_str())) << "still open";
}

TEST(ApiReport, SecondReportEndsTheFirst) {
  const std::wstring first = host::NewReportName();
  const std::wstring second = host::NewReportName();
  dump_hlp::CreateReportFile(first.c_str());
  dump_hlp::CreateReportFile(second.c_str());
  Say("where\r\n");
  dump_hlp::CloseReportFile();
  EXPECT_THAT(host::ReportLines(host::ReportPath(first)), IsEmpty());
  EXPECT_THAT(host::ReportLines(host::ReportPath(second)), ElementsAre("where"));
  EXPECT_TRUE(DeleteFileW(host::ReportPath(first).c_str()));
  EXPECT_TRUE(DeleteFileW(host::ReportPath(second).c_str()));
}

TEST(ApiReport, CannotBeCreatedUnderAnInvalidName) {
  const host::Report report;
  dump_hlp::CreateReportFile(std::wstring(5000, L'x').c_str());
  Say("nowhere\r\n");
  dump_hlp::CreateReportFile(L"no\\such\\folder.txt");
  Say(L"nowhere\r\n");
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST(ApiReport, LongLinesAreWhole) {
  const host::Report report;
  const std::string narrow(20000, 'n');
  const std::wstring wide(20000, L'w');
  Say("%s\r\n", narrow.c_str());
  Say(L"%s\r\n", wide.c_str());
  EXPECT_THAT(report.Lines(), ElementsAre(narrow, std::string(20000, 'w')));
}

}  // namespace
