// What a host does with a Velmar receiver: identity, files, settings, and unsupported operations.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <chrono>
#include <cstring>
#include <filesystem>
#include <future>
#include <map>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/file_list.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/velmar.h"
#include "tests/support/content.h"

using host::Velmar;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr unsigned kFilled = 0xCDCDCDCD;

TEST(ApiVelmarInfo, FillsTheRecordAndNothingElse) {
  const Velmar receiver({"--id", "VM7", "--model", "VR9 X"});
  CReceiverInfo info;
  std::memset(&info, static_cast<int>(kFilled & 0xFF), sizeof(info));
  const wchar_t* const untouched = info.bstrReserved;
  ASSERT_EQ(devapi::GetReceiverInfo(receiver.get(), nullptr, &info), S_OK);
  EXPECT_EQ(info.dwFeatures, 13U);
  EXPECT_EQ(info.dwProtocol, 2U);
  EXPECT_EQ(info.dwVariant, 2U);
  EXPECT_STREQ(info.bstrReceiverId, L"VM7");
  EXPECT_STREQ(info.bstrModel, L"VR9 X");
  EXPECT_EQ(info.dwPadding, kFilled);
  EXPECT_EQ(info.bstrReserved, untouched);
  SysFreeString(info.bstrReceiverId);
  SysFreeString(info.bstrModel);
  EXPECT_THAT(receiver.Sent(), ElementsAre(R"(log versiona once\r)"));
}

void SetModified(const std::filesystem::path& path, const SYSTEMTIME& time) {
  FILETIME modified{};
  ASSERT_TRUE(SystemTimeToFileTime(&time, &modified));
  const HANDLE file = CreateFileW(
      path.c_str(), FILE_WRITE_ATTRIBUTES, FILE_SHARE_READ, nullptr, OPEN_EXISTING, 0, nullptr);
  EXPECT_TRUE(SetFileTime(file, nullptr, nullptr, &modified)) << path;
  CloseHandle(file);
}

TEST(ApiVelmarFileList, HasNamesSizesAndTimes) {
  // Year, month, no day of the week, day, hour, minute, second, no milliseconds.
  const SYSTEMTIME times[] = {{2024, 2, 0, 29, 23, 59, 58, 0}, {2023, 12, 0, 1, 0, 2, 3, 0}};
  const bed::TempFolder folder;
  folder.Write("A.log", Content(1025));
  folder.Write("B.log", "");
  SetModified(folder / "A.log", times[0]);
  SetModified(folder / "B.log", times[1]);
  const Velmar receiver({"--folder", folder.unix_path()});

  const host::FileList list(receiver.get());
  ASSERT_EQ(list.result(), S_OK);
  ASSERT_EQ(list.Count(), 2);
  const unsigned sizes[] = {1025, 0};
  const std::wstring names[] = {L"A.log", L"B.log"};
  for (size_t i = 0; i < 2; ++i) {
    SCOPED_TRACE(i);
    const host::FileList::Entry entry = list.At(static_cast<long>(i));
    EXPECT_EQ(entry.name, names[i]);
    EXPECT_EQ(entry.info.dwSize, sizes[i]);
    EXPECT_EQ(std::memcmp(&entry.info.stTime1, &times[i], sizeof(SYSTEMTIME)), 0);
    EXPECT_EQ(std::memcmp(&entry.info.stTime2, &times[i], sizeof(SYSTEMTIME)), 0);
  }
  EXPECT_THAT(receiver.Sent(), ElementsAre(R"(log direnta once\r)"));
}

constexpr const char* kFilePieces[] = {"< log FILETRANSFERB seq=2 offset=0 len=1032 bytes=1064",
                                       "< log FILETRANSFERB seq=1 offset=1024 len=1032 bytes=1064",
                                       "< log FILETRANSFERB seq=0 offset=2048 len=960 bytes=992"};

TEST(ApiVelmarDownload, RaisesTheSpeedAndPutsItBack) {
  const std::string content = Content(3000);
  Velmar receiver({}, {{"A.log", content}});
  MemoryStream stream;
  host::Progress progress;
  EXPECT_EQ(receiver.Download(L"A.log", stream, &progress), S_OK);
  EXPECT_TRUE(stream.bytes == content);
  EXPECT_EQ(stream.writes, 3U);
  EXPECT_EQ(stream.other_calls, 2U) << "a reference is taken and given back";
  EXPECT_EQ(stream.references, 1U);
  EXPECT_THAT(progress.percents(), ElementsAre(0, 34, 68, 100, 100));
  receiver.port.WaitForTranscript("= speed 9600\n");
  EXPECT_THAT(receiver.SentAndMoved(),
              ElementsAre(R"(> log comconfiga once\r)",
                          R"(> COM 115200 N 8 1 N\r)",
                          "= speed 115200",
                          R"(> currentfile A.log all\r)",
                          R"(> log filehdra\r)",
                          R"(> log filetransferb\r)",
                          kFilePieces[0],
                          kFilePieces[1],
                          kFilePieces[2],
                          R"(> log comconfiga once\r)",
                          R"(> COM 9600 N 8 1 N\r)",
                          "= speed 9600"));
  EXPECT_THAT(receiver.Names(), ElementsAre(L"A.log")) << "it is not heard any more";
}

TEST(ApiVelmarDownload, LeavesFullSpeedAlone) {
  const std::string content = Content(3000);
  Velmar receiver({}, {{"A.log", content}}, CBR_115200);
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_TRUE(stream.bytes == content);
  EXPECT_THAT(receiver.SentAndMoved(),
              ElementsAre(R"(> currentfile A.log all\r)",
                          R"(> log filehdra\r)",
                          R"(> log filetransferb\r)",
                          kFilePieces[0],
                          kFilePieces[1],
                          kFilePieces[2]));
}

TEST(ApiVelmarDownload, OfAnUnknownFileIsASuccessWithoutBytes) {
  Velmar receiver({}, {{"A.log", "a"}}, CBR_115200);
  MemoryStream stream;
  host::Progress progress;
  EXPECT_EQ(receiver.Download(L"B.log", stream, &progress), S_OK);
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(progress.percents(), ElementsAre(0, 100));
  EXPECT_THAT(receiver.Sent(), ElementsAre(R"(currentfile B.log all\r)"));
}

// The download does not clear the abort: the next operation sends its command and then ends, once.
TEST(ApiVelmarDownload, AbortEndsItAndTheNextOperation) {
  constexpr size_t kHalfAMinuteAndMore = 600000;
  constexpr auto kMuchLess = std::chrono::seconds(10);
  const std::string content = Content(kHalfAMinuteAndMore);
  Velmar receiver({"--pieces", "1000", "--piece-gap", "85", "--stop-for-commands"},
                  {{"A.log", content}, {"B.log", "b"}, {"C.log", "c"}},
                  CBR_115200);
  MemoryStream stream;
  auto download = host::OnThread([&] { return receiver.Download(L"A.log", stream); });
  receiver.port.WaitForTranscript(" offset=2048 ");
  EXPECT_EQ(devapi::Abort(receiver.get()), S_OK);
  EXPECT_EQ(download.wait_for(kMuchLess), std::future_status::ready);
  EXPECT_EQ(download.get(), S_FALSE);
  EXPECT_LT(stream.bytes.size(), content.size());
  EXPECT_TRUE(content.starts_with(stream.bytes));

  EXPECT_EQ(receiver.Delete(L"B.log"), S_FALSE);
  EXPECT_EQ(receiver.Sent().back(), R"(del file B.log\r)");
  EXPECT_EQ(receiver.Delete(L"C.log"), S_OK);
  EXPECT_THAT(receiver.Names(), ElementsAre(L"A.log"));
}

TEST(ApiVelmarFiles, AreRenamedAndDeleted) {
  const Velmar receiver({}, {{"A.log", "a"}, {"B.log", "b"}});
  wchar_t old_name[] = L"A.log";
  wchar_t new_name[] = L"C.log";
  EXPECT_EQ(devapi::RenameFile(receiver.get(), old_name, new_name), S_OK);
  EXPECT_EQ(receiver.Delete(L"B.log"), S_OK);
  EXPECT_THAT(receiver.Sent(), ElementsAre(R"(rename A.log C.log\r)", R"(del file B.log\r)"));
  EXPECT_THAT(receiver.Names(), ElementsAre(L"C.log"));
}

TEST(ApiVelmarFiles, RefusalsAreSuccesses) {
  const Velmar receiver({"--refuse", "del", "--refuse-bare", "rename"}, {{"A.log", "a"}});
  wchar_t old_name[] = L"A.log";
  wchar_t new_name[] = L"C.log";
  EXPECT_EQ(receiver.Delete(L"A.log"), S_OK);
  EXPECT_EQ(devapi::RenameFile(receiver.get(), old_name, new_name), S_OK);
  EXPECT_THAT(receiver.Names(), ElementsAre(L"A.log"));
}

// Each changes one value and keeps the others as the receiver reports them.
TEST(ApiVelmarSettings, ChangeOneValueOfThePort) {
  const Velmar receiver({});
  const char* const question = R"(log comconfiga once\r)";
  EXPECT_EQ(devapi::DCSetRcvParity(receiver.get(), 1), S_OK);
  EXPECT_EQ(devapi::DCSetRcvStopbits(receiver.get(), 2), S_OK);
  EXPECT_EQ(devapi::DCSetRcvParity(receiver.get(), 2), S_OK);
  EXPECT_EQ(devapi::DCSetRcvParity(receiver.get(), 3), S_OK);
  EXPECT_THAT(receiver.Sent(),
              ElementsAre(question,
                          R"(COM 9600 E 8 1 N\r)",
                          question,
                          R"(COM 9600 E 8 2 N\r)",
                          question,
                          R"(COM 9600 O 8 2 N\r)",
                          question,
                          R"(COM 9600 N 8 2 N\r)"));
}

TEST(ApiVelmarUnoffered, OperationsAreRefusedWithoutACommand) {
  const Velmar receiver({});
  CFileInfo info{};
  MemoryStream stream;
  EXPECT_EQ(devapi::DCSetRcvRTSControl(receiver.get(), 1), E_NOTIMPL);
  EXPECT_EQ(devapi::UploadFile(receiver.get(), &info, &stream, nullptr), E_NOTIMPL);
  EXPECT_THAT(receiver.Sent(), IsEmpty());
  EXPECT_EQ(stream.writes + stream.other_calls, 0U);
}

}  // namespace
