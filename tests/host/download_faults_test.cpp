// DownloadFile with faults of the receiver and of the line.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <ostream>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/support/content.h"

namespace {

constexpr size_t kSize = 2500;  // five blocks, the last of them number 4

struct Fault {
  std::string name;
  std::vector<std::string> switches;
};

std::ostream& operator<<(std::ostream& out, const Fault& fault) { return out << fault.name; }

std::string FaultName(const testing::TestParamInfo<Fault>& fault) { return fault.param.name; }

// A receiver at full speed, so that no speed is changed.
class FaultyDownload : public testing::TestWithParam<Fault> {
 protected:
  static std::vector<std::string> Arguments(const std::vector<std::string>& switches) {
    std::vector<std::string> arguments = {"quorin", "--speed", "115200"};
    arguments.insert(arguments.end(), switches.begin(), switches.end());
    return arguments;
  }

  HRESULT Download() { return receiver_.Download(L"A.log", stream_, &progress_); }
  bool HasWholeFile() const { return stream_.bytes == content_; }
  size_t CountSent(const std::string& what) const {
    return host::CountOf(receiver_.SentSince(), what);
  }

  const std::string content_ = Content(kSize);
  const bed::SimulatedPort port_{Arguments(GetParam().switches), {{"A.log", content_}}};
  const host::Receiver receiver_{port_, CBR_115200};
  const host::Report report_;
  MemoryStream stream_;
  host::Progress progress_;
};

// A damaged block is requested again.
using ApiDownloadOvercomes = FaultyDownload;

TEST_P(ApiDownloadOvercomes, ByAskingAgain) {
  EXPECT_EQ(Download(), S_OK);
  EXPECT_TRUE(HasWholeFile());
  EXPECT_TRUE(std::ranges::is_sorted(progress_.percents()));
  EXPECT_EQ(progress_.percents().back(), 100);
  port_.WaitForTranscript("\n> #\n");
  EXPECT_GT(CountSent("\\x15"), 1U) << "it never asked again:\n" << port_.Transcript();
  EXPECT_EQ(CountSent("\\x06"), 4U);
  EXPECT_EQ(CountSent("#"), 1U);
}

INSTANTIATE_TEST_SUITE_P(
    Faults,
    ApiDownloadOvercomes,
    testing::Values(Fault{"Crc", {"--bad-crc", "0@2", "--bad-crc", "4"}},
                    Fault{"UnchainedCrc", {"--unchained-crc", "2"}},
                    Fault{"Sequence", {"--bad-sequence", "0", "--bad-sequence", "3"}},
                    Fault{"EndByte", {"--bad-end", "1"}},
                    Fault{"LostByte", {"--lost-byte", "2"}},
                    Fault{"Type", {"--bad-type", "3"}},
                    Fault{"Silence", {"--block-silence", "1:1"}},
                    // Two time-outs for each of two blocks, together more than one block may have.
                    Fault{"Silences", {"--block-silence", "1:2", "--block-silence", "2:2"}}),
    FaultName);

// Faults outside the blocks do not affect the transfer.
using ApiDownloadIgnores = FaultyDownload;

TEST_P(ApiDownloadIgnores, WhatDoesNotTouchTheBlocks) {
  EXPECT_EQ(Download(), S_OK);
  EXPECT_TRUE(HasWholeFile());
  port_.WaitForTranscript("\n> #\n");
  EXPECT_EQ(CountSent("\\x15"), 1U);
  EXPECT_EQ(CountSent("\\x06"), 4U);
  EXPECT_EQ(CountSent("#"), 1U);
}

INSTANTIATE_TEST_SUITE_P(Faults,
                         ApiDownloadIgnores,
                         testing::Values(Fault{"Pieces", {"--pieces", "100", "--piece-gap", "10"}},
                                         Fault{"Garbage", {"--garbage", "17"}},
                                         Fault{"OtherTagFirst", {"--other-tag-first", "*"}},
                                         Fault{"Echo", {"--echo"}}),
                         FaultName);

struct Ending {
  std::string name;
  std::vector<std::string> switches;
  DWORD speed;
  HRESULT result;
  size_t blocks;       // delivered before the fault
  size_t asked;        // the number of NAKs
  bool ends_transfer;  // whether # was sent
};

std::ostream& operator<<(std::ostream& out, const Ending& ending) { return out << ending.name; }

std::string EndingName(const testing::TestParamInfo<Ending>& ending) { return ending.param.name; }

class ApiDownloadEnds : public testing::TestWithParam<Ending> {};

TEST_P(ApiDownloadEnds, WithAClearResult) {
  const DWORD speed = GetParam().speed;
  std::vector<std::string> arguments = {"quorin", "--speed", std::to_string(speed)};
  arguments.insert(arguments.end(), GetParam().switches.begin(), GetParam().switches.end());
  const std::string content = Content(kSize);
  const bed::SimulatedPort port(arguments, {{"A.log", content}, {"B.log", "next"}});
  const host::Receiver receiver(port, speed);
  const host::Report report;
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), GetParam().result);

  EXPECT_TRUE(stream.bytes == content.substr(0, GetParam().blocks * 512));
  const size_t failed =
      report.LinesWith("CQuorinProtocol::DownloadFile - download [A.log] is failed").size();
  EXPECT_EQ(failed, FAILED(GetParam().result) ? 1U : 0U);
  if (speed == CBR_9600) {
    EXPECT_EQ(receiver.WireSince().back(), "= speed 9600") << "the speed was not put back";
  }

  MemoryStream next;
  EXPECT_EQ(receiver.Download(L"B.log", next), S_OK);
  EXPECT_EQ(next.bytes, "next");
  receiver.WaitForLastSent(speed == CBR_115200 ? "#" : R"(%#%set,cur/term/rate,9600\r\n)");

  // When the receiver has no transfer any more, the # comes before the next command.
  const host::Lines sent = receiver.SentSince();
  const size_t ended = host::CountOf(sent, "#") + host::CountStarting(sent, "#%");
  EXPECT_EQ(ended, GetParam().ends_transfer ? 2U : 1U) << port.Transcript();
  EXPECT_EQ(host::CountOf(sent, "\\x15"), GetParam().asked + 1) << port.Transcript();
}

INSTANTIATE_TEST_SUITE_P(
    Endings,
    ApiDownloadEnds,
    testing::Values(
        Ending{"EndBlock", {"--end-block", "2"}, CBR_115200, S_FALSE, 2, 1, false},
        // A single '#' is not a whole header: the block is requested again until the last time-out.
        Ending{"EndByte", {"--end-byte", "2"}, CBR_115200, host::kTimedOut, 2, 5, true},
        Ending{"NegativeLength",
               {"--negative-length", "1"},
               CBR_9600,
               host::kNotConnected,
               4,
               1,
               true},
        Ending{"Silence", {"--block-silence", "1:60"}, CBR_115200, host::kTimedOut, 1, 4, true}),
    EndingName);

}  // namespace
