// DownloadFile from a receiver on USB: whole, with every fault, aborted and unplugged.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <chrono>
#include <ostream>
#include <string>
#include <thread>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/support/content.h"
#include "tests/support/user_settings.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr size_t kSize = 2500;          // five blocks, the last of them number 4
constexpr size_t kSeveralMb = 3000000;  // 5860 blocks
constexpr DWORD kShortTimeoutMs = 3000;

std::vector<std::string> Arguments(const std::vector<std::string>& switches) {
  std::vector<std::string> arguments = {"quorin"};
  arguments.insert(arguments.end(), switches.begin(), switches.end());
  return arguments;
}

// The setting of the library's read time-out, for receivers that are made while this lives.
class ReadTimeout {
 public:
  explicit ReadTimeout(DWORD milliseconds, DWORD type = REG_DWORD) {
    settings_.SetValue(L"DownloadReadTimeout", type, &milliseconds, sizeof(milliseconds));
  }

 private:
  UserSettings settings_;
};

TEST(ApiUsbDownload, BringsTheFileWithoutTouchingAnySpeed) {
  const std::string content = Content(kSize);
  const bed::SimulatedUsb usb({"quorin"}, {{"A.log", content}});
  const host::UsbReceiver receiver(usb);
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_TRUE(stream.bytes == content);
  EXPECT_THAT(receiver.SentSince(),
              ElementsAre(R"(%#%\n)",
                          R"(%#%print,/log/A.log&size\r\n)",
                          R"(%#%get,"A.log":{500,512}\r\n)",
                          R"(\x15)",
                          R"(\x06)",
                          R"(\x06)",
                          R"(\x06)",
                          R"(\x06)",
                          "#"));
}

// Sizes that fill the last block and sizes that do not; fewer bytes than one block.
class ApiUsbDownloadOfSize : public testing::TestWithParam<size_t> {};

TEST_P(ApiUsbDownloadOfSize, BringsTheFile) {
  const std::string content = Content(GetParam());
  const bed::SimulatedUsb usb({"quorin"}, {{"A.log", content}});
  const host::UsbReceiver receiver(usb);
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_TRUE(stream.bytes == content);
}

INSTANTIATE_TEST_SUITE_P(Sizes,
                         ApiUsbDownloadOfSize,
                         testing::Values(1U, 511U, 512U, 513U, 1024U, 100000U));

// --- Several megabytes, each with a fault of the transfer

struct Fault {
  std::string name;
  std::vector<std::string> switches;
  std::string trace;  // the line of the report for it, which is there once
};

std::ostream& operator<<(std::ostream& out, const Fault& fault) { return out << fault.name; }

class ApiUsbDownloadOvercomes : public testing::TestWithParam<Fault> {};

TEST_P(ApiUsbDownloadOvercomes, ByAskingAgain) {
  const ReadTimeout timeout(kShortTimeoutMs);
  const std::string content = Content(kSeveralMb);
  const bed::SimulatedUsb usb(Arguments(GetParam().switches), {{"A.log", content}});
  const host::UsbReceiver receiver(usb);
  const host::Report report;
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_TRUE(stream.bytes == content);
  const std::string line = "CQuorinProtocol::DownloadOverUSB - " + GetParam().trace;
  EXPECT_EQ(report.LinesWith(line).size(), 1U);
  const host::Lines sent = receiver.SentSince();
  EXPECT_EQ(host::CountOf(sent, R"(\x15)"), 2U) << "the start, and once more";
  EXPECT_EQ(host::CountOf(sent, R"(\x06)"), kSeveralMb / 512);
  EXPECT_EQ(host::CountOf(sent, "#"), 1U);
}

INSTANTIATE_TEST_SUITE_P(
    Faults,
    ApiUsbDownloadOvercomes,
    testing::Values(Fault{"Crc", {"--bad-crc", "5000"}, "cheksum missmatch"},
                    Fault{"UnchainedCrc", {"--unchained-crc", "3000"}, "cheksum missmatch"},
                    Fault{"Sequence", {"--bad-sequence", "3000"}, "out of sequence"},
                    Fault{"EndByte", {"--bad-end", "3000"}, "eob character is missed"},
                    Fault{"LastBlock", {"--bad-end", "5859"}, "eob character is missed"},
                    Fault{"LostByte", {"--lost-byte", "3000"}, "read timeout."},
                    Fault{"Type", {"--bad-type", "3000"}, "recognisable byte is not recognised"},
                    Fault{"Silence", {"--block-silence", "3000:4"}, "read timeout."}),
    [](const auto& fault) { return fault.param.name; });

// Faults outside the blocks do not affect the transfer.
class ApiUsbDownloadIgnores : public testing::TestWithParam<Fault> {};

TEST_P(ApiUsbDownloadIgnores, WhatDoesNotTouchTheBlocks) {
  const std::string content = Content(kSeveralMb);
  const bed::SimulatedUsb usb(Arguments(GetParam().switches), {{"A.log", content}});
  const host::UsbReceiver receiver(usb);
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_TRUE(stream.bytes == content);
  const host::Lines sent = receiver.SentSince();
  EXPECT_EQ(host::CountOf(sent, R"(\x15)"), 1U);
  EXPECT_EQ(host::CountOf(sent, R"(\x06)"), kSeveralMb / 512);
  EXPECT_EQ(host::CountOf(sent, "#"), 1U);
}

INSTANTIATE_TEST_SUITE_P(
    Faults,
    ApiUsbDownloadIgnores,
    testing::Values(Fault{"Pieces", {"--pieces", "300", "--piece-gap", "0"}, ""},
                    Fault{"Garbage", {"--garbage", "17"}, ""},
                    Fault{"OtherTagFirst", {"--other-tag-first", "*"}, ""},
                    Fault{"Echo", {"--echo"}, ""}),
    [](const auto& fault) { return fault.param.name; });

TEST(ApiUsbDownload, TakesBlocksInPiecesOfAnySize) {
  const std::string content = Content(20000);
  for (const char* const length : {"1", "7", "64", "511", "513", "4096"}) {
    const bed::SimulatedUsb usb({"quorin", "--transfer", length}, {{"A.log", content}});
    const host::UsbReceiver receiver(usb);
    MemoryStream stream;
    EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK) << length;
    EXPECT_TRUE(stream.bytes == content) << length;
  }
}

// --- Time-outs

TEST(ApiUsbDownload, AllowsThreeTimeoutsInAll) {
  const ReadTimeout timeout(kShortTimeoutMs);
  const std::string content = Content(kSize);
  const bed::SimulatedUsb usb(
      {"quorin", "--lost-byte", "0", "--lost-byte", "2", "--lost-byte", "4"}, {{"A.log", content}});
  const host::UsbReceiver receiver(usb);
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_TRUE(stream.bytes == content);
}

TEST(ApiUsbDownload, TheFourthTimeoutEndsItWhereverItIs) {
  const ReadTimeout timeout(kShortTimeoutMs);
  const bed::SimulatedUsb usb(
      {"quorin", "--lost-byte", "0", "--lost-byte", "1", "--lost-byte", "3", "--lost-byte", "4"},
      {{"A.log", Content(kSize)}});
  const host::UsbReceiver receiver(usb);
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), host::kTimedOut);
  EXPECT_EQ(stream.bytes.size(), 4U * 512);
  EXPECT_EQ(receiver.SentSince().back(), "#");
}

TEST(ApiUsbDownloadSettings, TheRegistrySetsTheTimeout) {
  const host::Report report;
  const ReadTimeout timeout(1234);
  const bed::SimulatedUsb usb({"quorin"});
  const host::UsbReceiver receiver(usb);
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::CQuorinProtocol - file download read timeout "
                 "/DownloadReadTimeout/ - 1234"));
}

// Four bytes of another type are used without a line in the report.
TEST(ApiUsbDownloadSettings, AnotherTypeIsAcceptedWithoutALine) {
  const host::Report report;
  const ReadTimeout timeout(300, REG_BINARY);
  const bed::SimulatedUsb usb({"quorin", "--lost-byte", "0@4"}, {{"A.log", "a"}});
  const host::UsbReceiver receiver(usb);
  MemoryStream stream;
  const DWORD start = GetTickCount();
  EXPECT_EQ(receiver.Download(L"A.log", stream), host::kTimedOut);
  EXPECT_LT(GetTickCount() - start, 20000U) << "it waited for the usual 30 s";
  EXPECT_THAT(report.LinesWith("CQuorinProtocol::CQuorinProtocol - file download"), IsEmpty());
}

TEST(ApiUsbDownloadSettings, WithoutAValueNothingIsTraced) {
  const host::Report report;
  const UserSettings none;
  const bed::SimulatedUsb usb({"quorin"});
  const host::UsbReceiver receiver(usb);
  EXPECT_THAT(report.LinesWith("CQuorinProtocol::CQuorinProtocol - file download"), IsEmpty());
}

// --- Progress

TEST(ApiUsbDownload, ReportsAtMostTwiceASecond) {
  constexpr size_t kTwentyBlocks = 10000;
  const std::string content = Content(kTwentyBlocks);
  // Some blocks come more than half a second after the previous one.
  const bed::SimulatedUsb usb({"quorin", "--block-silence", "2:0.8", "--block-silence", "15:0.8"},
                              {{"A.log", content}});
  const host::UsbReceiver receiver(usb);
  MemoryStream stream;
  host::Progress progress;
  const DWORD start = GetTickCount();
  EXPECT_EQ(receiver.Download(L"A.log", stream, &progress), S_OK);
  const DWORD half_seconds = (GetTickCount() - start) / 500;
  const std::vector<int>& percents = progress.percents();
  // The steps before the transfer report the first two.
  ASSERT_GE(percents.size(), 4U);
  EXPECT_EQ(percents[0], 0);
  EXPECT_EQ(percents[1], 1);
  EXPECT_LE(percents.size() - 2, half_seconds);
  EXPECT_TRUE(std::ranges::is_sorted(percents));
}

// --- Endings

struct Ending {
  std::string name;
  std::vector<std::string> switches;
  HRESULT result;
  size_t blocks;  // delivered before the fault
};

std::ostream& operator<<(std::ostream& out, const Ending& ending) { return out << ending.name; }

class ApiUsbDownloadEnds : public testing::TestWithParam<Ending> {};

TEST_P(ApiUsbDownloadEnds, WithAClearResult) {
  const ReadTimeout timeout(kShortTimeoutMs);
  const bed::SimulatedUsb usb(Arguments(GetParam().switches),
                              {{"A.log", Content(kSeveralMb)}, {"B.log", "next"}});
  const host::UsbReceiver receiver(usb);
  const host::Report report;
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), GetParam().result);
  EXPECT_EQ(stream.bytes.size(), GetParam().blocks * 512);
  const size_t failed =
      report.LinesWith("CQuorinProtocol::DownloadFile - download [A.log] is failed").size();
  EXPECT_EQ(failed, FAILED(GetParam().result) ? 1U : 0U);
  MemoryStream next;
  EXPECT_EQ(receiver.Download(L"B.log", next), S_OK) << usb.Transcript();
  EXPECT_EQ(next.bytes, "next");
}

INSTANTIATE_TEST_SUITE_P(
    Endings,
    ApiUsbDownloadEnds,
    testing::Values(
        Ending{"EndBlock", {"--end-block", "3000"}, S_FALSE, 3000},
        // A single '#' is not a whole block: the block is requested until the last time-out.
        Ending{"EndByte", {"--end-byte", "3000"}, host::kTimedOut, 3000},
        Ending{"NegativeLength", {"--negative-length", "1"}, host::kNotConnected, kSeveralMb / 512},
        Ending{"Silence", {"--block-silence", "3000:60"}, host::kTimedOut, 3000},
        Ending{"ARefusedGet", {"--refuse", "get@1"}, host::kNotConnected, 0}),
    [](const auto& ending) { return ending.param.name; });

// Over USB a failure of the host's stream is returned, unlike on a serial port.
TEST(ApiUsbDownload, PassesOnAFailureOfTheStream) {
  const bed::SimulatedUsb usb({"quorin"}, {{"A.log", Content(kSize)}});
  const host::UsbReceiver receiver(usb);
  const host::Report report;
  MemoryStream stream;
  stream.fail_at_write = 2;
  EXPECT_EQ(receiver.Download(L"A.log", stream), STG_E_MEDIUMFULL);
  EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadOverUSB - write to stream failed [0x80030070]"));
  EXPECT_EQ(receiver.SentSince().back(), "#");
}

// --- Aborts

class ApiUsbDownloadAbort : public testing::TestWithParam<int> {};

// The download is stopped in its progress function while the abort comes.
TEST_P(ApiUsbDownloadAbort, EndsItAtAnyBlock) {
  const std::string content = Content(kSeveralMb);
  const bed::SimulatedUsb usb({"quorin"}, {{"A.log", content}, {"B.log", "next"}});
  const host::UsbReceiver receiver(usb);
  const host::Report report;
  host::GatedProgress held(GetParam());
  MemoryStream stream;
  auto download =
      host::OnThread([&] { return receiver.Download(L"A.log", stream, &held.progress); });
  ASSERT_TRUE(held.gate.WaitForArrival());
  EXPECT_EQ(devapi::Abort(receiver.get()), S_OK);
  held.gate.Open();
  EXPECT_EQ(download.get(), S_FALSE);
  EXPECT_LT(stream.bytes.size(), content.size());
  EXPECT_TRUE(content.starts_with(stream.bytes));
  MemoryStream next;
  EXPECT_EQ(receiver.Download(L"B.log", next), S_OK) << usb.Transcript();
  EXPECT_EQ(next.bytes, "next");
}

INSTANTIATE_TEST_SUITE_P(Percents, ApiUsbDownloadAbort, testing::Values(0, 1, 2));

// Waits for a block after that place of the transcript.
void WaitForBlock(const bed::SimulatedUsb& usb, size_t number, size_t place) {
  constexpr auto kPatience = std::chrono::seconds(20);
  const std::string text = " seq=" + std::to_string(number) + " ";
  const auto end = std::chrono::steady_clock::now() + kPatience;
  while (usb.Transcript().find(text, place) == std::string::npos) {
    ASSERT_LT(std::chrono::steady_clock::now(), end) << "no block " << number;
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
}

// At any moment: in the middle of a wait, of a write, or between two steps.
TEST(ApiUsbDownload, AnAbortAtManyMomentsEndsIt) {
  const std::string content = Content(kSeveralMb);
  const bed::SimulatedUsb usb({"quorin"}, {{"A.log", content}, {"B.log", "next"}});
  const host::UsbReceiver receiver(usb);
  for (size_t blocks = 1; blocks < 200; blocks += 9) {
    const size_t passed = usb.Transcript().size();
    MemoryStream stream;
    auto download = host::OnThread([&] { return receiver.Download(L"A.log", stream); });
    WaitForBlock(usb, blocks, passed);
    EXPECT_EQ(devapi::Abort(receiver.get()), S_OK);
    ASSERT_EQ(download.get(), S_FALSE) << blocks;
    EXPECT_TRUE(content.starts_with(stream.bytes));
    MemoryStream next;
    ASSERT_EQ(receiver.Download(L"B.log", next), S_OK) << blocks;
    ASSERT_EQ(next.bytes, "next");
  }
}

TEST(ApiUsbDownload, AnAbortEndsTheWaitForASilentReceiver) {
  const bed::SimulatedUsb usb({"quorin", "--block-silence", "1:3600"}, {{"A.log", Content(kSize)}});
  const host::UsbReceiver receiver(usb);
  const host::Report report;
  MemoryStream stream;
  const DWORD start = GetTickCount();
  auto download = host::OnThread([&] { return receiver.Download(L"A.log", stream); });
  usb.WaitForTranscript(R"(> \x06)");
  EXPECT_EQ(devapi::Abort(receiver.get()), S_OK);
  EXPECT_EQ(download.get(), S_FALSE);
  EXPECT_LT(GetTickCount() - start, 15000U) << "it waited for its time-out";
  EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadOverUSB - download is cancelled"));
  usb.WaitForTranscript("> #\n");
}

// --- Unplugged

class ApiUsbUnplugged : public testing::TestWithParam<int> {};

TEST_P(ApiUsbUnplugged, IsAFailure) {
  bed::SimulatedUsb usb({"quorin"}, {{"A.log", Content(kSeveralMb)}});
  const host::UsbReceiver receiver(usb);
  host::GatedProgress held(GetParam());
  MemoryStream stream;
  auto download =
      host::OnThread([&] { return receiver.Download(L"A.log", stream, &held.progress); });
  ASSERT_TRUE(held.gate.WaitForArrival());
  usb.Unplug();
  held.gate.Open();
  EXPECT_TRUE(FAILED(download.get()));
  EXPECT_LT(stream.bytes.size(), kSeveralMb);
  EXPECT_TRUE(FAILED(receiver.Identify().result)) << "it has gone for good";
  EXPECT_EQ(receiver.Check(), 0);
}

INSTANTIATE_TEST_SUITE_P(Percents, ApiUsbUnplugged, testing::Values(0, 1, 2));

TEST(ApiUsbDownload, EndsAtOnceWhenUnpluggedInAWait) {
  bed::SimulatedUsb usb({"quorin", "--block-silence", "1:3600"}, {{"A.log", Content(kSize)}});
  const host::UsbReceiver receiver(usb);
  MemoryStream stream;
  const DWORD start = GetTickCount();
  auto download = host::OnThread([&] { return receiver.Download(L"A.log", stream); });
  usb.WaitForTranscript(R"(> \x06)");
  usb.Unplug();
  EXPECT_TRUE(FAILED(download.get()));
  EXPECT_LT(GetTickCount() - start, 15000U) << "it waited for its time-out";
}

TEST(ApiUsbDownload, WorksWhenPluggedInAgain) {
  bed::SimulatedUsb usb({"quorin"}, {{"A.log", "a"}});
  {
    const host::UsbReceiver receiver(usb);
    usb.Unplug();
    EXPECT_TRUE(FAILED(receiver.Identify().result));
  }
  usb.Start({"quorin"});
  const host::UsbReceiver receiver(usb);
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
}

}  // namespace
