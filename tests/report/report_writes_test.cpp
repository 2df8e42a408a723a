// The writes of a line of the report, counted. Replaces an import of the whole program, so it is only in unit_tests.
#include <gtest/gtest.h>

#include <atomic>
#include <string>

#include "report/report_file.h"
#include "tests/support/report_capture.h"

namespace {

std::atomic<size_t> writes = 0;

BOOL WINAPI
CountWrite(HANDLE file, const void* bytes, DWORD size, DWORD* written, OVERLAPPED* block) {
  static const auto write = reinterpret_cast<decltype(&CountWrite)>(
      reinterpret_cast<void*>(GetProcAddress(GetModuleHandleW(L"kernel32"), "WriteFile")));
  ++writes;
  return write(file, bytes, size, written, block);
}

}  // namespace

// What the code of a program calls through; the linker takes it before that of the import library.
extern "C" {
extern decltype(CountWrite)* const __imp_WriteFile;
decltype(CountWrite)* const __imp_WriteFile = CountWrite;
}

namespace {

template <typename Act>
size_t CountWrites(Act act) {
  writes = 0;
  act();
  return writes;
}

// Another program that reads the report meanwhile finds whole lines.
TEST(ReportWrites, ALineIsOneWrite) {
  const ReportCapture report;
  std::wstring longer(5000, L'x');
  EXPECT_EQ(CountWrites([] { rcvlink::Trace(L"port %u\r\n", 7); }), 1U);
  EXPECT_EQ(CountWrites([] { rcvlink::Trace("port %u\r\n", 7); }), 1U);
  EXPECT_EQ(CountWrites([&] { rcvlink::Trace(L"%s\r\n", longer.data()); }), 1U);
}

TEST(ReportWrites, ALineIsNoneWithoutAReport) {
  EXPECT_EQ(CountWrites([] { rcvlink::Trace(L"port %u\r\n", 7); }), 0U);
}

}  // namespace
