// Lines with characters of several bytes, in the code page of the thread that writes them.
#include <gtest/gtest.h>

#include <array>
#include <optional>
#include <string>
#include <thread>

#include "platform/win32.h"
#include "report/report_file.h"
#include "tests/support/report_capture.h"

using rcvlink::Trace;

namespace {

constexpr LCID kJapanese = 0x0411;
constexpr UINT kCodePage = 932;

// The code page of the thread.
std::optional<UINT> ThreadCodePage() {
  CPINFOEXW info{};
  if (!GetCPInfoExW(CP_THREAD_ACP, 0, &info)) return std::nullopt;
  return info.CodePage;
}

// The text after the stamp of the report's only line.
std::string Entry(const ReportCapture& report) {
  constexpr size_t kStampTime = 14;  // "hh:mm:ss.mmmm ", then the thread in six columns or more
  const std::string text = report.Text();
  const size_t number = text.find_first_not_of(' ', kStampTime);
  const size_t blank = text.find(' ', number);
  return blank == std::string::npos ? text : text.substr(blank + 1);
}

// A thread's locale lasts as long as the thread.
template <typename Action>
void OnThreadOf(LCID locale, Action action) {
  std::thread([&] {
    ASSERT_TRUE(SetThreadLocale(locale));
    action();
  }).join();
}

const std::wstring kNihongo = L"\u65E5\u672C\u8A9E";
const std::string kNihongoIn932 = "\x93\xFA\x96\x7B\x8C\xEA";

class ReportInJapanese : public testing::Test {
 protected:
  void SetUp() override {
    std::optional<UINT> code_page;
    OnThreadOf(kJapanese, [&] { code_page = ThreadCodePage(); });
    if (code_page != kCodePage) GTEST_SKIP() << "this system has no threads in code page 932";
  }
  // The line of a wide and of a narrow entry.
  static std::string Wide(const std::wstring& text) {
    const ReportCapture report;
    OnThreadOf(kJapanese, [&] { Trace(L"%s", text.c_str()); });
    return Entry(report);
  }
  static std::string Narrow(const std::string& text) {
    const ReportCapture report;
    OnThreadOf(kJapanese, [&] { Trace("%s", text.c_str()); });
    return Entry(report);
  }
};

// As many bytes are written as the text has characters, so the rest and the line end are cut.
TEST_F(ReportInJapanese, AWideEntryIsCutToAsManyBytesAsItHasCharacters) {
  EXPECT_EQ(Wide(kNihongo + L" [COM7]\r\n"), kNihongoIn932 + " [COM7");
  EXPECT_EQ(Wide(L"[" + kNihongo + L"]"), "[" + kNihongoIn932.substr(0, 4));
  EXPECT_EQ(Wide(kNihongo), kNihongoIn932.substr(0, 3)) << "in the middle of a character";
}

// These characters are single bytes in this code page.
TEST_F(ReportInJapanese, AWideEntryOfLettersAndHalfWidthKanaIsWhole) {
  EXPECT_EQ(Wide(L"\uFF76\uFF85 [COM7]\r\n"), "\xB6\xC5 [COM7]\r\n");
}

TEST_F(ReportInJapanese, AWideEntryThatIsLongIsCutToo) {
  std::wstring text;
  std::string bytes;
  for (int i = 0; i < 1000; ++i) {
    text += kNihongo;
    bytes += kNihongoIn932;
  }
  EXPECT_TRUE(Wide(text) == bytes.substr(0, text.size()));
}

TEST_F(ReportInJapanese, ANarrowEntryIsWhole) {
  EXPECT_EQ(Narrow(kNihongoIn932 + " [COM7]\r\n"), kNihongoIn932 + " [COM7]\r\n");
  EXPECT_EQ(Narrow(kNihongoIn932), kNihongoIn932);
}

// The narrow name of a report is converted in this code page, too.
TEST_F(ReportInJapanese, ANarrowNameIsOfTheThreadsCodePage) {
  std::array<wchar_t, MAX_PATH> folder{};
  GetTempPathW(MAX_PATH, folder.data());
  const std::wstring number = std::to_wstring(GetCurrentProcessId());
  const std::string name = kNihongoIn932 + "-" + std::string(number.begin(), number.end());
  const std::wstring path = folder.data() + kNihongo + L"-" + number;
  OnThreadOf(kJapanese, [&] { dump_hlp::CreateReportFile(name.c_str()); });
  dump_hlp::CloseReportFile();
  EXPECT_TRUE(DeleteFileW(path.c_str()));
}

// Each thread writes in its own code page.
TEST(ReportOfThreads, EachWritesInItsCodePage) {
  constexpr LCID kGerman = 0x0407;
  constexpr LCID kRussian = 0x0419;
  const std::wstring text = L"\u0416\r\n";
  {
    const ReportCapture report;
    OnThreadOf(kRussian, [&] { Trace(L"%s", text.c_str()); });
    EXPECT_EQ(Entry(report), "\xC6\r\n");
  }
  const ReportCapture report;
  OnThreadOf(kGerman, [&] { Trace(L"%s", text.c_str()); });
  EXPECT_EQ(Entry(report), "?\r\n");
}

}  // namespace
