#include "report/report_file.h"

#include <gtest/gtest.h>

#include <array>
#include <cstdarg>
#include <cstdio>
#include <functional>
#include <regex>
#include <string>
#include <thread>
#include <vector>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "platform/win32.h"
#include "tests/support/report_capture.h"

using rcvlink::FileHandle;
using rcvlink::HResultError;
using rcvlink::HResultFromError;
using rcvlink::Trace;

namespace {

std::wstring TempFolder() {
  std::array<wchar_t, MAX_PATH> folder{};
  GetTempPathW(MAX_PATH, folder.data());
  return folder.data();
}

bool Exists(const std::wstring& path) {
  return GetFileAttributesW(path.c_str()) != INVALID_FILE_ATTRIBUTES;
}

// As hosts call it: from a variadic function of their own.
void HostLine(const wchar_t* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  dump_hlp::DumpReportString(format, arguments);
  va_end(arguments);
}
void HostLine(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  dump_hlp::DumpReportString(format, arguments);
  va_end(arguments);
}

HRESULT CodeOf(const std::function<void()>& action) {
  try {
    action();
  } catch (const HResultError& error) {
    return error.code();
  }
  return S_OK;
}

// A line that nobody reads costs nothing: the text would be read to measure it.
TEST(Report, WithoutOneTheTextsOfALineAreNotRead) {
  void* const unreadable = VirtualAlloc(nullptr, 1, MEM_RESERVE, PAGE_NOACCESS);
  Trace(L"a line [%s]\r\n", static_cast<const wchar_t*>(unreadable));
  Trace("a line [%s]\r\n", static_cast<const char*>(unreadable));
  VirtualFree(unreadable, 0, MEM_RELEASE);
}

TEST(Report, StampsEachEntry) {
  const ReportCapture report;
  Trace(L"an event [%u] [%s]\r\n", 7u, L"COM7");
  std::array<char, 16> thread{};
  sprintf_s(thread.data(), thread.size(), "%6lu", GetCurrentThreadId());
  const std::string text = report.Text();
  EXPECT_TRUE(
      std::regex_match(text,
                       std::regex(R"(\d\d:\d\d:\d\d\.0\d\d\d )" + std::string(thread.data()) +
                                  R"( an event \[7\] \[COM7\]\r\n)")))
      << text;
}

TEST(Report, StampsTheLocalTime) {
  const ReportCapture report;
  SYSTEMTIME before;
  GetLocalTime(&before);
  Trace(L"x\r\n");
  SYSTEMTIME after;
  GetLocalTime(&after);
  unsigned hour = 99;
  unsigned minute = 99;
  unsigned second = 99;
  unsigned millisecond = 9999;
  ASSERT_EQ(
      std::sscanf(report.Text().c_str(), "%2u:%2u:%2u.%4u ", &hour, &minute, &second, &millisecond),
      4);
  const auto in_day = [](unsigned h, unsigned m, unsigned s, unsigned ms) {
    return ((h * 60 + m) * 60 + s) * 1000 + ms;
  };
  const unsigned stamp = in_day(hour, minute, second, millisecond);
  const unsigned from = in_day(before.wHour, before.wMinute, before.wSecond, before.wMilliseconds);
  const unsigned to = in_day(after.wHour, after.wMinute, after.wSecond, after.wMilliseconds);
  EXPECT_TRUE((from <= stamp && stamp <= to) || to < from) << report.Text();
}

TEST(Report, WritesNarrowAndWideEntriesOfTheHost) {
  const ReportCapture report;
  HostLine("narrow [%s] [0x%08X]\r\n", "text", 0x8007048Fu);
  HostLine(L"wide [%s] [0x%p]\r\n", L"text", reinterpret_cast<void*>(0x1234));
  EXPECT_TRUE(report.Has("narrow [text] [0x8007048F]"));
  EXPECT_TRUE(report.Has("wide [text] [0x0000000000001234]"));
}

TEST(Report, AppendsNothingToAnEntry) {
  const ReportCapture report;
  HostLine("no end");
  EXPECT_TRUE(report.Text().ends_with(" no end"));
}

TEST(Report, LongEntriesAreWhole) {
  const ReportCapture report;
  const std::wstring wide(5000, L'w');
  const std::string narrow(5000, 'n');
  HostLine(L"%s\r\n", wide.c_str());
  HostLine("%s\r\n", narrow.c_str());
  EXPECT_TRUE(report.Has(std::string(5000, 'w')));
  EXPECT_TRUE(report.Has(narrow));
}

TEST(Report, WithoutAReportNothingIsWrittenAndNothingFails) {
  dump_hlp::CloseReportFile();
  EXPECT_NO_THROW(Trace(L"lost [%u]\r\n", 1u));
  EXPECT_NO_THROW(HostLine("lost [%u]\r\n", 1u));
  const ReportCapture report;
  EXPECT_EQ(report.Text(), "");
}

TEST(Report, IsHiddenAndOthersMayReadButNotWrite) {
  const ReportCapture report;
  EXPECT_NE(GetFileAttributesW(report.Path().c_str()) & FILE_ATTRIBUTE_HIDDEN, 0u);
  Trace(L"x\r\n");
  EXPECT_TRUE(report.Has("x"));
  const FileHandle writer(CreateFileW(report.Path().c_str(),
                                      GENERIC_WRITE,
                                      FILE_SHARE_READ | FILE_SHARE_WRITE,
                                      nullptr,
                                      OPEN_EXISTING,
                                      0,
                                      nullptr));
  EXPECT_FALSE(writer);
}

TEST(Report, TheSameNameAgainTruncatesTheFile) {
  const ReportCapture report;
  Trace(L"first\r\n");
  dump_hlp::CreateReportFile(report.Path().substr(TempFolder().size()).c_str());
  Trace(L"second\r\n");
  EXPECT_EQ(report.Lines(), std::vector<std::string>{"second"});
}

TEST(Report, AnotherReportClosesTheFirst) {
  const ReportCapture first;
  const ReportCapture second;
  Trace(L"to the second\r\n");
  EXPECT_EQ(first.Text(), "");
  EXPECT_TRUE(DeleteFileW(first.Path().c_str()));  // it is no longer open
  EXPECT_TRUE(second.Has("to the second"));
}

TEST(Report, ClosingEndsIt) {
  const ReportCapture report;
  dump_hlp::CloseReportFile();
  Trace(L"lost\r\n");
  EXPECT_EQ(report.Text(), "");
}

TEST(Report, TakesANarrowName) {
  const std::wstring path = TempFolder() + L"rcvlink-narrow-name.txt";
  dump_hlp::CreateReportFile("rcvlink-narrow-name.txt");
  dump_hlp::CloseReportFile();
  EXPECT_TRUE(Exists(path));
  DeleteFileW(path.c_str());
}

// Longer than the 128 characters that the conversion starts with.
TEST(Report, TakesALongNarrowName) {
  const std::string name(150, 'r');
  const std::wstring path = TempFolder() + std::wstring(150, L'r');
  dump_hlp::CreateReportFile(name.c_str());
  dump_hlp::CloseReportFile();
  EXPECT_TRUE(Exists(path));
  DeleteFileW(path.c_str());
}

TEST(Report, ANarrowNameThatCannotBeConvertedIsRaised) {
  EXPECT_EQ(CodeOf([] { dump_hlp::CreateReportFile(static_cast<const char*>(nullptr)); }),
            HResultFromError(ERROR_INVALID_PARAMETER));
}

TEST(Report, APathThatIsTooLongIsRefused) {
  const size_t room = MAX_PATH - TempFolder().size();
  // With its ending zero the longest path has 260 characters.
  const std::wstring longest(room - 1, L'p');
  dump_hlp::CreateReportFile((longest + L"p").c_str());
  Trace(L"lost\r\n");
  EXPECT_FALSE(Exists(TempFolder() + longest));
  EXPECT_FALSE(Exists(TempFolder() + longest + L"p"));
  dump_hlp::CreateReportFile(std::wstring(40000, L'p').c_str());
  Trace(L"lost\r\n");
  dump_hlp::CloseReportFile();
}

TEST(Report, AFileThatCannotBeMadeLeavesReportingOff) {
  dump_hlp::CreateReportFile(L"no such folder\\report.txt");
  EXPECT_NO_THROW(Trace(L"lost\r\n"));
  EXPECT_NO_THROW(dump_hlp::CreateReportFile(static_cast<const wchar_t*>(nullptr)));
  dump_hlp::CloseReportFile();
}

TEST(Report, ANullFormatIsRaisedAndTheLockLeft) {
  EXPECT_EQ(CodeOf([] { dump_hlp::DumpReportString(static_cast<const char*>(nullptr), nullptr); }),
            E_INVALIDARG);
  EXPECT_EQ(
      CodeOf([] { dump_hlp::DumpReportString(static_cast<const wchar_t*>(nullptr), nullptr); }),
      E_INVALIDARG);
  // If the lock were still held, another thread would wait for ever.
  std::thread([] { Trace(L"x\r\n"); }).join();
}

// As many bytes are written as the text has characters: in a single-byte code page that is the
// whole line.
TEST(Report, WritesAsManyBytesAsTheTextHasCharacters) {
  const ReportCapture report;
  const std::wstring text = L"\u00E4\u00F6\u00FC\r\n";
  Trace(L"%s", text.c_str());
  const std::string written = report.Text();
  const size_t stamp = written.rfind(' ') + 1;
  EXPECT_EQ(written.size() - stamp, text.size());
}

TEST(Report, EntriesOfThreadsDoNotMix) {
  constexpr int kThreads = 4;
  constexpr int kEntries = 200;
  const ReportCapture report;
  std::vector<std::thread> threads;
  for (int i = 0; i < kThreads; ++i) {
    threads.emplace_back([] {
      for (int k = 0; k < kEntries; ++k) Trace(L"an entry of some length [%u]\r\n", 12345u);
    });
  }
  for (std::thread& thread : threads) thread.join();
  const std::vector<std::string> lines = report.Lines();
  EXPECT_EQ(lines.size(), static_cast<size_t>(kThreads * kEntries));
  for (const std::string& line : lines) EXPECT_EQ(line, "an entry of some length [12345]");
}

}  // namespace
