// Whole downloads from the simulated receiver, with each of its faults.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <initializer_list>
#include <string>

#include "platform/hresult.h"
#include "tests/quorin/simulated_download.h"

using rcvlink::kNotConnected;
using rcvlink::kTimedOut;

using sim::BlockFaultKind;
using sim::ReplyFaultKind;

namespace {

constexpr size_t kSize = SimulatedDownload::kUsualSize;
constexpr DWORD kUsb = 0;           // a link without a speed
constexpr uint32_t kLastBlock = 2;  // its number

struct FaultCase {
  std::string name;
  std::function<void(sim::QuorinOptions&)> make;
};

std::string FaultCaseName(const testing::TestParamInfo<FaultCase>& fault) {
  return fault.param.name;
}

std::function<void(sim::QuorinOptions&)> BlockFault(BlockFaultKind kind,
                                                    uint32_t block,
                                                    uint32_t times = 1,
                                                    uint32_t silence_ms = 0) {
  return [=](sim::QuorinOptions& options) {
    options.faults.blocks.push_back({kind, block, times, silence_ms});
  };
}

std::function<void(sim::QuorinOptions&)> ReplyFault(ReplyFaultKind kind,
                                                    const std::string& command = "*",
                                                    uint32_t times = sim::kAlways,
                                                    int32_t amount = 0) {
  return [=](sim::QuorinOptions& options) {
    options.faults.replies.push_back({kind, command, times, amount});
  };
}

// Faults after which a download still succeeds.
class QuorinOvercomes : public testing::TestWithParam<FaultCase> {};

TEST_P(QuorinOvercomes, WithTheWholeFile) {
  sim::QuorinOptions options;
  GetParam().make(options);
  SimulatedDownload download(options);
  EXPECT_EQ(download.Run(), S_OK);
  EXPECT_TRUE(download.HasWholeFile());
  EXPECT_EQ(download.receiver.speed(), 9600U);
  EXPECT_EQ(download.connection->Speed(), 9600U);
  EXPECT_FALSE(download.receiver.in_transfer());
  EXPECT_FALSE(download.receiver.echoes());
  if (HasFailure()) FAIL() << download.Log();
}

TEST_P(QuorinOvercomes, WithTheWholeFileOverUsb) {
  sim::QuorinOptions options;
  GetParam().make(options);
  SimulatedDownload download(options, kSize, kUsb);
  EXPECT_EQ(download.Run(), S_OK);
  EXPECT_TRUE(download.HasWholeFile());
  EXPECT_FALSE(download.receiver.in_transfer());
  EXPECT_EQ(download.CountInLog("rate,"), 0U);
  if (HasFailure()) FAIL() << download.Log();
}

// Whether the fault happened: the transcript differs from that of a download without faults.
TEST_P(QuorinOvercomes, WhatIsReallyThere) {
  sim::QuorinOptions options;
  GetParam().make(options);
  SimulatedDownload download(options);
  SimulatedDownload good({});
  const uint64_t start = download.connection->Now();
  download.Run();
  good.Run();
  const bool took_longer = download.connection->Now() - start > good.connection->Now();
  EXPECT_TRUE(took_longer || download.Log().size() != good.Log().size());
}

INSTANTIATE_TEST_SUITE_P(
    BlockFaults,
    QuorinOvercomes,
    testing::Values(
        FaultCase{"CrcOfTheFirst", BlockFault(BlockFaultKind::kDamagedCrc, 0)},
        FaultCase{"CrcOfTheSecond", BlockFault(BlockFaultKind::kDamagedCrc, 1, 20)},
        FaultCase{"CrcOfTheLast", BlockFault(BlockFaultKind::kDamagedCrc, kLastBlock, 3)},
        FaultCase{"Unchained", BlockFault(BlockFaultKind::kUnchainedCrc, 1, 2)},
        FaultCase{"UnchainedLast", BlockFault(BlockFaultKind::kUnchainedCrc, kLastBlock)},
        FaultCase{"SequenceOfTheFirst", BlockFault(BlockFaultKind::kWrongSequence, 0)},
        FaultCase{"SequenceOfTheSecond", BlockFault(BlockFaultKind::kWrongSequence, 1, 2)},
        FaultCase{"End", BlockFault(BlockFaultKind::kWrongEnd, 0)},
        FaultCase{"EndOfTheLast", BlockFault(BlockFaultKind::kWrongEnd, kLastBlock, 2)},
        FaultCase{"LostByte", BlockFault(BlockFaultKind::kLostByte, 1)},
        FaultCase{"LostByteOfTheLast", BlockFault(BlockFaultKind::kLostByte, kLastBlock)},
        FaultCase{"Type", BlockFault(BlockFaultKind::kUnknownType, 0, 2)},
        FaultCase{"TypeOfTheLast", BlockFault(BlockFaultKind::kUnknownType, kLastBlock)},
        FaultCase{"SilenceOfTwelveSeconds", BlockFault(BlockFaultKind::kSilence, 1, 1, 11900)},
        FaultCase{"SilencesAheadOfAll",
                  [](sim::QuorinOptions& options) {
                    for (uint32_t block = 0; block <= kLastBlock; ++block) {
                      BlockFault(BlockFaultKind::kSilence, block, 1, 10000)(options);
                    }
                  }},
        FaultCase{"ManyAtOnce",
                  [](sim::QuorinOptions& options) {
                    BlockFault(BlockFaultKind::kDamagedCrc, 0)(options);
                    BlockFault(BlockFaultKind::kLostByte, 0)(options);
                    BlockFault(BlockFaultKind::kWrongEnd, 1)(options);
                    BlockFault(BlockFaultKind::kUnknownType, 2)(options);
                    BlockFault(BlockFaultKind::kSilence, 1, 1, 5000)(options);
                  }}),
    FaultCaseName);

INSTANTIATE_TEST_SUITE_P(
    ReplyFaults,
    QuorinOvercomes,
    testing::Values(
        FaultCase{"SlowReplies", ReplyFault(ReplyFaultKind::kSilence, "*", sim::kAlways, 7000)},
        FaultCase{"Garbage", ReplyFault(ReplyFaultKind::kGarbageBefore, "*", sim::kAlways, 5000)},
        FaultCase{"MuchGarbage",
                  ReplyFault(ReplyFaultKind::kGarbageBefore, "print,/log", 1, 65000)},
        FaultCase{"OtherTagFirst", ReplyFault(ReplyFaultKind::kOtherTagBefore)},
        FaultCase{"PortRefused", ReplyFault(ReplyFaultKind::kRefused, "print,/cur/term")},
        FaultCase{"PortMute", ReplyFault(ReplyFaultKind::kMute, "print,/cur/term")},
        FaultCase{"PortWithAnotherTag",
                  ReplyFault(ReplyFaultKind::kOtherTagOnly, "print,/cur/term")},
        FaultCase{"PortWithoutALetter",
                  [](sim::QuorinOptions& options) { options.identity.port_name = "ttyX"; }}),
    FaultCaseName);

// Kinds of receiver and line that make no difference to the file.
class QuorinDownloads : public testing::TestWithParam<FaultCase> {};

TEST_P(QuorinDownloads, TheWholeFile) {
  sim::QuorinOptions options;
  GetParam().make(options);
  for (const size_t size : std::initializer_list<size_t>{1, 511, 512, 513, 1024, 1300, 5120}) {
    SimulatedDownload download(options, size);
    EXPECT_EQ(download.Run(), S_OK) << size;
    EXPECT_TRUE(download.HasWholeFile()) << size;
    EXPECT_EQ(download.receiver.speed(), 9600U) << size;
    EXPECT_EQ(download.connection->Speed(), 9600U) << size;
    EXPECT_EQ(download.CountInLog("> \\x15"), 1U) << size;
    if (HasFailure()) FAIL() << download.Log();
  }
}

INSTANTIATE_TEST_SUITE_P(
    Receivers,
    QuorinDownloads,
    testing::Values(
        FaultCase{"Plain", [](sim::QuorinOptions&) {}},
        FaultCase{"WithAnEmptyLastBlock",
                  [](sim::QuorinOptions& options) { options.empty_last_block = true; }},
        FaultCase{"OnPortD",
                  [](sim::QuorinOptions& options) { options.identity.port_letter = 'd'; }},
        FaultCase{"Paced", [](sim::QuorinOptions& options) { options.line.paced = true; }},
        FaultCase{"InPieces",
                  [](sim::QuorinOptions& options) {
                    options.line.piece_size = 7;
                    options.line.piece_gap_ms = 20;
                  }},
        FaultCase{"BytewiseWithPauses",
                  [](sim::QuorinOptions& options) {
                    options.line.piece_size = 1;
                    options.line.piece_gap_ms = 3;
                  }},
        FaultCase{"Garbling", [](sim::QuorinOptions& options) { options.line.garbled = true; }}),
    FaultCaseName);

TEST(QuorinSimulatedDownload, AtFullSpeedChangesNothing) {
  sim::QuorinOptions options;
  options.line.speed = 115200;
  SimulatedDownload download(options, kSize, 115200);
  EXPECT_EQ(download.Run(), S_OK);
  EXPECT_TRUE(download.HasWholeFile());
  EXPECT_EQ(download.CountInLog("rate"), 0U);
  EXPECT_EQ(download.connection->Speed(), 115200U);
}

TEST(QuorinSimulatedDownload, RunsAtFullSpeed) {
  SimulatedDownload download({});
  download.Run();
  const size_t raised = download.Log().find("= speed 115200");
  const size_t first_block = download.Log().find("< block");
  const size_t put_back = download.Log().find("= speed 9600");
  ASSERT_NE(put_back, std::string::npos);
  EXPECT_LT(raised, first_block);
  EXPECT_LT(first_block, put_back);
}

// Faults that end a download.
struct FatalCase {
  std::string name;
  std::function<void(sim::QuorinOptions&)> make;
  HRESULT result;
  size_t bytes;  // of the file that arrived
  bool speed_is_back = true;
};

std::string FatalCaseName(const testing::TestParamInfo<FatalCase>& fault) {
  return fault.param.name;
}

class QuorinFailsOn : public testing::TestWithParam<FatalCase> {};

TEST_P(QuorinFailsOn, AFault) {
  sim::QuorinOptions options;
  GetParam().make(options);
  SimulatedDownload download(options);
  EXPECT_EQ(download.Run(), GetParam().result);
  EXPECT_TRUE(download.stream.bytes == download.content.substr(0, GetParam().bytes));
  EXPECT_TRUE(IsFreeForOthers(download.driver));
  if (GetParam().speed_is_back) {
    EXPECT_EQ(download.receiver.speed(), 9600U);
    EXPECT_EQ(download.connection->Speed(), 9600U);
    EXPECT_FALSE(download.receiver.in_transfer());
  }
  if (HasFailure()) FAIL() << download.Log();
}

INSTANTIATE_TEST_SUITE_P(
    InTheTransfer,
    QuorinFailsOn,
    testing::Values(
        FatalCase{"ForcedEnd", BlockFault(BlockFaultKind::kEndBlock, 1), S_FALSE, 512},
        FatalCase{"ForcedEndAtOnce", BlockFault(BlockFaultKind::kEndBlock, 0), S_FALSE, 0},
        // Too short for a header, and then the receiver is silent.
        FatalCase{"EndByte", BlockFault(BlockFaultKind::kEndByte, 1), kTimedOut, 512},
        FatalCase{
            "NegativeLength", BlockFault(BlockFaultKind::kNegativeLength, 0), kNotConnected, 1024},
        FatalCase{"LongSilence", BlockFault(BlockFaultKind::kSilence, 1, 1, 13000), kTimedOut, 512},
        FatalCase{"Vanished",
                  [](sim::QuorinOptions& options) { options.faults.vanish_after_block = 0; },
                  kTimedOut,
                  512,
                  false}),
    FatalCaseName);

INSTANTIATE_TEST_SUITE_P(
    BeforeTheTransfer,
    QuorinFailsOn,
    testing::Values(
        FatalCase{
            "SizeRefused", ReplyFault(ReplyFaultKind::kRefused, "print,/log/"), kNotConnected, 0},
        FatalCase{"SizeMute", ReplyFault(ReplyFaultKind::kMute, "print,/log/"), kTimedOut, 0},
        FatalCase{"SizeWithAnotherTag",
                  ReplyFault(ReplyFaultKind::kOtherTagOnly, "print,/log/"),
                  kTimedOut,
                  0},
        FatalCase{"SizeWithTooLongALength",
                  ReplyFault(ReplyFaultKind::kWrongLength, "print,/log/", 1, 20),
                  kTimedOut,
                  0},
        FatalCase{"SizeTooLate",
                  ReplyFault(ReplyFaultKind::kSilence, "print,/log/", 1, 40000),
                  kTimedOut,
                  0},
        FatalCase{"GetRefused", ReplyFault(ReplyFaultKind::kRefused, "get,"), kNotConnected, 0},
        FatalCase{"GetMute", ReplyFault(ReplyFaultKind::kMute, "get,"), kTimedOut, 0},
        FatalCase{"PingMute", ReplyFault(ReplyFaultKind::kMute, "ping"), kTimedOut, 0},
        FatalCase{"SizeZero",
                  [](sim::QuorinOptions& options) {
                    options.faults.sizes = {{"A0101.log", 0}};
                  },
                  E_FAIL,
                  0}),
    FatalCaseName);

INSTANTIATE_TEST_SUITE_P(
    OfTheSpeed,
    QuorinFailsOn,
    testing::Values(
        // The receiver does not follow, so neither side hears the other.
        FatalCase{"Kept",
                  [](sim::QuorinOptions& options) { options.faults.keeps_speed = true; },
                  kTimedOut,
                  0,
                  false},
        // "/dev/ser" is taken for port d, which is not the port in use.
        FatalCase{"OfAnotherPort",
                  ReplyFault(ReplyFaultKind::kWrongLength, "print,/cur/term", 1, -2),
                  kTimedOut,
                  0,
                  false},
        FatalCase{"PutBackRefused",
                  ReplyFault(ReplyFaultKind::kRefused, "set,cur/term/rate"),
                  kNotConnected,
                  kSize,
                  false},
        FatalCase{"PutBackMute",
                  ReplyFault(ReplyFaultKind::kMute, "set,cur/term/rate"),
                  kTimedOut,
                  kSize,
                  false}),
    FatalCaseName);

// A wrong size affects the progress only.
TEST(QuorinSimulatedDownload, DownloadsAllOfAFileThatIsLargerThanItsSize) {
  sim::QuorinOptions options;
  options.faults.sizes = {{"A0101.log", 700}};
  SimulatedDownload download(options);
  ProgressRecorder progress;
  download.driver.SetCallback(&progress);
  EXPECT_EQ(download.Run(), S_OK);
  EXPECT_TRUE(download.HasWholeFile());
  // 512, 1024 and 1300 bytes of 700
  EXPECT_THAT(progress.percents, testing::ElementsAre(0, 1, 73, 100, 100));
}

TEST(QuorinSimulatedDownload, DownloadsAllOfAFileThatIsSmallerThanItsSize) {
  sim::QuorinOptions options;
  options.faults.sizes = {{"A0101.log", 13000}};
  SimulatedDownload download(options);
  ProgressRecorder progress;
  download.driver.SetCallback(&progress);
  EXPECT_EQ(download.Run(), S_OK);
  EXPECT_TRUE(download.HasWholeFile());
  EXPECT_THAT(progress.percents, testing::ElementsAre(0, 1, 4, 8, 10));
}

}  // namespace
