// File lists as a host reads them.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <climits>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <ostream>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/file_list.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/support/content.h"

using testing::ElementsAre;

namespace {

constexpr __time64_t kTime = 1'600'000'000;
constexpr __time64_t kTimeStep = 37 * 86400 + 3661;  // through the seasons

void SetModified(const std::filesystem::path& path, __time64_t time) {
  constexpr long long kTicksPerSecond = 10'000'000;
  constexpr long long kSecondsBefore1970 = 11'644'473'600;
  ULARGE_INTEGER ticks;
  ticks.QuadPart = static_cast<ULONGLONG>((time + kSecondsBefore1970) * kTicksPerSecond);
  const FILETIME modified{ticks.LowPart, ticks.HighPart};
  const HANDLE file = CreateFileW(
      path.c_str(), FILE_WRITE_ATTRIBUTES, FILE_SHARE_READ, nullptr, OPEN_EXISTING, 0, nullptr);
  EXPECT_TRUE(SetFileTime(file, nullptr, nullptr, &modified)) << path;
  CloseHandle(file);
}

void ExpectTime(const SYSTEMTIME& told, __time64_t time) {
  std::tm local{};
  ASSERT_EQ(_localtime64_s(&local, &time), 0);
  EXPECT_EQ(told.wYear, local.tm_year + 1900);
  EXPECT_EQ(told.wMonth, local.tm_mon + 1);
  EXPECT_EQ(told.wDayOfWeek, local.tm_wday);
  EXPECT_EQ(told.wDay, local.tm_mday);
  EXPECT_EQ(told.wHour, local.tm_hour);
  EXPECT_EQ(told.wMinute, local.tm_min);
  EXPECT_EQ(told.wSecond, local.tm_sec);
  EXPECT_EQ(told.wMilliseconds, 0);
}

std::string NumberedName(size_t number) {
  return "file" + std::to_string(number / 10) + std::to_string(number % 10) + ".log";
}

struct Amount {
  size_t files;
  std::vector<std::string> switches;
};

std::ostream& operator<<(std::ostream& out, const Amount& amount) { return out << amount.files; }

class ApiFileListOf : public testing::TestWithParam<Amount> {};

TEST_P(ApiFileListOf, HasNamesSizesAndTimes) {
  bed::TempFolder folder;
  for (size_t i = 0; i < GetParam().files; ++i) {
    folder.Write(NumberedName(i), Content(i * i * 7));
    SetModified(folder / NumberedName(i), kTime + static_cast<__time64_t>(i) * kTimeStep);
  }
  std::vector<std::string> arguments = {"quorin", "--folder", folder.unix_path()};
  arguments.insert(arguments.end(), GetParam().switches.begin(), GetParam().switches.end());
  const bed::SimulatedPort port(arguments);
  const host::Receiver receiver(port);

  const host::FileList list(receiver.get());
  ASSERT_EQ(list.result(), S_OK);
  ASSERT_EQ(list.Count(), static_cast<long>(GetParam().files));
  for (size_t i = 0; i < GetParam().files; ++i) {
    SCOPED_TRACE(i);
    const host::FileList::Entry entry = list.At(static_cast<long>(i));
    EXPECT_EQ(host::Narrow(entry.name), NumberedName(i));
    EXPECT_EQ(entry.info.dwSize, i * i * 7);
    EXPECT_EQ(entry.info.dwPadding, 0U);
    EXPECT_EQ(entry.info.qwReserved, 0U);
    ExpectTime(entry.info.stTime1, kTime + static_cast<__time64_t>(i) * kTimeStep);
    EXPECT_EQ(std::memcmp(&entry.info.stTime1, &entry.info.stTime2, sizeof(SYSTEMTIME)), 0);
  }
  EXPECT_THAT(receiver.SentSince(), ElementsAre(R"(%#%print,/log/&[name,size,time]\r\n)"));
}

INSTANTIATE_TEST_SUITE_P(
    Amounts,
    ApiFileListOf,
    testing::Values(Amount{0, {}},
                    Amount{1, {}},
                    Amount{50, {}},
                    Amount{50, {"--pieces", "23", "--piece-gap", "1"}},
                    Amount{3, {"--garbage", "9", "--other-tag-first", "print,/log"}}));

TEST(ApiFileList, TracesItsSteps) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", "abc"}});
  const host::Receiver receiver(port);
  const host::Report report;
  const host::FileList list(receiver.get());
  list.At(0);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CAbstractReceiver::GetFiles",
                          "CGetFileListCmd::CGetFileListCmd",
                          "CQuorinProtocol::GetFiles - connection is locked [HANDLE]",
                          "CSerialConnection::Flush",
                          "CQuorinCommand::Execute - start reading. Timeout is [30000 msec]",
                          "CQuorinProtocol::GetFiles - connection is unlocked [HANDLE]",
                          "CQuorinProtocol::GetFiles - OK",
                          "GetFileInfo - [A.log] [3]"));
}

// Names are sent as bytes of the thread's code page.
TEST(ApiFileList, NamesBeyondAsciiAreConverted) {
  const std::u8string utf8 = u8"Gr\u00F6\u00DFe.log";
  const std::string bytes(utf8.begin(), utf8.end());
  const std::string content = Content(700);
  const bed::SimulatedPort port({"quorin", "--speed", "115200"}, {{bytes, content}});
  const host::Receiver receiver(port, CBR_115200);

  const host::FileList list(receiver.get());
  ASSERT_EQ(list.Count(), 1);
  std::wstring expected(bytes.size(), L'\0');
  const int length = MultiByteToWideChar(CP_THREAD_ACP,
                                         0,
                                         bytes.data(),
                                         static_cast<int>(bytes.size()),
                                         expected.data(),
                                         static_cast<int>(expected.size()));
  expected.resize(static_cast<size_t>(length));
  EXPECT_EQ(list.At(0).name, expected);

  MemoryStream stream;
  EXPECT_EQ(receiver.Download(list.At(0).name, stream), S_OK);
  EXPECT_EQ(stream.bytes, content);
}

TEST(ApiFileList, LongNamesAreCut) {
  const bed::SimulatedPort port({"quorin", "--long-names"}, {{"A.log", "abc"}});
  const host::Receiver receiver(port);
  const host::FileList list(receiver.get());
  ASSERT_EQ(list.Count(), 1);
  EXPECT_EQ(list.At(0).name, L"A.log" + std::wstring(32 - 5, L'_'));
  EXPECT_EQ(list.At(0).info.dwSize, 3U);
}

TEST(ApiFileList, OutlivesItsReceiver) {
  void* handle = nullptr;
  {
    const bed::SimulatedPort port({"quorin"}, {{"A.log", "abc"}, {"B.log", ""}});
    const host::Receiver receiver(port);
    ASSERT_EQ(devapi::OpenFileList(receiver.get(), &handle), S_OK);
  }
  const host::FileList list = host::FileList::Take(handle);
  EXPECT_EQ(list.Count(), 2);
  EXPECT_EQ(list.At(1).name, L"B.log");
}

TEST(ApiFileList, RefusalMakesNoList) {
  const bed::SimulatedPort port({"quorin", "--refuse", "print,/log/&"}, {{"A.log", "abc"}});
  const host::Receiver receiver(port);
  int something = 0;
  void* list = &something;
  EXPECT_EQ(devapi::OpenFileList(receiver.get(), &list), host::kNotConnected);
  EXPECT_EQ(list, &something);
  EXPECT_EQ(receiver.Identify().result, S_OK) << "the lock is still held";
}

TEST(ApiFileList, AbortMakesAnEmptyListOnce) {
  bed::SimulatedPort port({"quorin"}, {{"A.log", "abc"}});
  const host::Receiver receiver(port);
  devapi::Abort(receiver.get());
  {
    const host::FileList list(receiver.get());
    EXPECT_EQ(list.result(), S_FALSE);
    EXPECT_EQ(list.Count(), 0);
    EXPECT_TRUE(receiver.SentSince().empty());
  }

  const host::Report report;
  port.Pause();
  auto reading = host::OnThread([&] { return host::FileList(receiver.get()).result(); });
  report.WaitFor("CQuorinCommand::Execute - start reading");
  devapi::Abort(receiver.get());
  EXPECT_EQ(reading.get(), S_FALSE);
  port.Resume();

  const host::FileList list(receiver.get());
  EXPECT_EQ(list.result(), S_OK);
  EXPECT_EQ(list.Count(), 1);
}

TEST(ApiFileList, UnknownListsAreRefused) {
  int something = 0;
  long count = -7;
  CFileInfo info{};
  for (void* const list : {static_cast<void*>(nullptr), static_cast<void*>(&something)}) {
    EXPECT_EQ(devapi::GetFilesCount(list, &count), E_INVALIDARG);
    EXPECT_EQ(devapi::GetFileInfo(list, 0, &info), E_INVALIDARG);
    EXPECT_EQ(devapi::GetFileInfo(list, -1, &info), E_INVALIDARG);
    EXPECT_EQ(devapi::CloseFileList(list), E_INVALIDARG);
  }
  EXPECT_EQ(count, -7);
}

// The structured exception that GetFileInfo raises; code 0 for none.
struct Raised {
  void* list;
  long index;
  DWORD code;
  DWORD flags;
};

// The call runs on a thread of its own, which the exception ends. The handler stays installed for
// ever, so it handles only the calls made here.
Raised CallGetFileInfo(void* list, long index) {
  static Raised* current = nullptr;
  static thread_local bool calling = false;
  Raised raised{list, index, 0, 0};
  current = &raised;
  static void* const handler = AddVectoredExceptionHandler(1, [](EXCEPTION_POINTERS* at) -> LONG {
    if (!calling) return EXCEPTION_CONTINUE_SEARCH;
    current->code = at->ExceptionRecord->ExceptionCode;
    current->flags = at->ExceptionRecord->ExceptionFlags;
    ExitThread(0);
  });
  EXPECT_NE(handler, nullptr);
  const HANDLE thread = CreateThread(
      nullptr,
      0,
      [](void*) -> DWORD {
        calling = true;
        CFileInfo info{};
        devapi::GetFileInfo(current->list, current->index, &info);
        SysFreeString(info.bstrName);
        calling = false;
        return 0;
      },
      nullptr,
      0,
      nullptr);
  WaitForSingleObject(thread, INFINITE);
  CloseHandle(thread);
  return raised;
}

TEST(ApiFileList, EntriesAreReadWithinBoundsOnly) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", "abc"}});
  const host::Receiver receiver(port);
  void* list = nullptr;
  ASSERT_EQ(devapi::OpenFileList(receiver.get(), &list), S_OK);

  CFileInfo info{};
  EXPECT_EQ(devapi::GetFileInfo(list, 1, &info), E_INVALIDARG);
  EXPECT_EQ(devapi::GetFileInfo(list, LONG_MAX, &info), E_INVALIDARG);
  EXPECT_EQ(devapi::GetFileInfo(list, 0, nullptr), E_INVALIDARG);
  EXPECT_EQ(devapi::GetFilesCount(list, nullptr), E_INVALIDARG);
  EXPECT_EQ(info.bstrName, nullptr);

  EXPECT_EQ(CallGetFileInfo(list, 0).code, 0U);
  for (const long index : {-1L, LONG_MIN}) {
    const Raised raised = CallGetFileInfo(list, index);
    EXPECT_EQ(raised.code, 0xC000008CU);
    EXPECT_EQ(raised.flags, DWORD{EXCEPTION_NONCONTINUABLE});
  }

  CFileInfo again{};
  EXPECT_EQ(devapi::GetFileInfo(list, 0, &info), S_OK);
  EXPECT_EQ(devapi::GetFileInfo(list, 0, &again), S_OK);
  EXPECT_NE(info.bstrName, again.bstrName);
  SysFreeString(info.bstrName);
  EXPECT_STREQ(again.bstrName, L"A.log");
  EXPECT_EQ(SysStringLen(again.bstrName), 5U);
  EXPECT_EQ(devapi::CloseFileList(list), S_OK);
  EXPECT_STREQ(again.bstrName, L"A.log") << "the copy went with the list";
  SysFreeString(again.bstrName);
  EXPECT_EQ(devapi::CloseFileList(list), E_INVALIDARG);
}

}  // namespace
