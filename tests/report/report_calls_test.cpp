// What the report asks of Windows. Replaces imports of the whole program, so it is only in unit_tests.
#include <gtest/gtest.h>

#include <atomic>
#include <string>

#include "platform/win32.h"
#include "report/report_file.h"
#include "tests/support/report_capture.h"
#include "tests/support/system_call.h"

namespace {

// The thread whose writes are counted; 0 for none. Only that thread uses the count.
std::atomic<DWORD> counted_thread = 0;
size_t writes = 0;
std::atomic<bool> has_temp_folder = true;

BOOL WINAPI
CountWrite(HANDLE file, const void* bytes, DWORD size, DWORD* written, OVERLAPPED* block) {
  static const auto write = SystemCall<decltype(CountWrite)>(L"kernel32", "WriteFile");
  if (counted_thread == GetCurrentThreadId()) ++writes;
  return write(file, bytes, size, written, block);
}

DWORD WINAPI FindTempFolder(DWORD size, wchar_t* path) {
  static const auto find = SystemCall<decltype(FindTempFolder)>(L"kernel32", "GetTempPathW");
  return has_temp_folder ? find(size, path) : 0;
}

}  // namespace

// What the code of a program calls through; the linker takes these before those of the import
// library.
extern "C" {
extern decltype(CountWrite)* const __imp_WriteFile;
extern decltype(FindTempFolder)* const __imp_GetTempPathW;
decltype(CountWrite)* const __imp_WriteFile = CountWrite;
decltype(FindTempFolder)* const __imp_GetTempPathW = FindTempFolder;
}

namespace {

template <typename Act>
size_t CountWrites(Act act) {
  writes = 0;
  counted_thread = GetCurrentThreadId();
  act();
  counted_thread = 0;
  return writes;
}

// Another program that reads the report meanwhile finds whole lines.
TEST(ReportCalls, ALineIsOneWrite) {
  const ReportCapture report;
  std::wstring longer(5000, L'x');
  EXPECT_EQ(CountWrites([] { rcvlink::Trace(L"port %u\r\n", 7); }), 1U);
  EXPECT_EQ(CountWrites([] { rcvlink::Trace("port %u\r\n", 7); }), 1U);
  EXPECT_EQ(CountWrites([&] { rcvlink::Trace(L"%s\r\n", longer.data()); }), 1U);
}

TEST(ReportCalls, ALineIsNoneWithoutAReport) {
  EXPECT_EQ(CountWrites([] { rcvlink::Trace(L"port %u\r\n", 7); }), 0U);
}

// Its name alone would be a file in the folder that the host happens to be in.
TEST(ReportCalls, NoReportWithoutAFolderForIt) {
  constexpr wchar_t kName[] = L"report_without_a_folder.txt";
  has_temp_folder = false;
  dump_hlp::CreateReportFile(kName);
  has_temp_folder = true;
  EXPECT_FALSE(rcvlink::IsReportOpen());
  dump_hlp::CloseReportFile();
  EXPECT_FALSE(DeleteFileW(kName));
}

}  // namespace
