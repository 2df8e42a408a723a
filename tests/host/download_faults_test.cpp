// DownloadFile from receivers and over lines that misbehave.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

namespace {

constexpr size_t kSize = 2500;  // five blocks, the last of them number 4

struct Fault {
  std::string name;
  std::vector<std::string> switches;
};

std::string FaultName(const testing::TestParamInfo<Fault>& fault) { return fault.param.name; }

// A receiver at full speed, so that nothing but the transfer passes.
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
  // The next download is not disturbed by what is left of this one.
  void ExpectNextOneWorks() {
    host::MemoryStream next;
    EXPECT_EQ(receiver_.Download(L"B.log", next), S_OK);
    EXPECT_EQ(next.bytes, "next");
  }

  const std::string content_ = host::Content(kSize);
  const bed::SimulatedPort port_{Arguments(GetParam().switches),
                                 {{"A.log", content_}, {"B.log", "next"}}};
  const host::Receiver receiver_{port_, CBR_115200};
  const host::Report report_;
  host::MemoryStream stream_;
  host::Progress progress_;
};

// A block that comes wrong is asked for again.
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
                    // Two silences for each of two blocks: more than a single block may have.
                    Fault{"Silences", {"--block-silence", "1:2", "--block-silence", "2:2"}}),
    FaultName);

// What does not touch the blocks does not touch the transfer either.
using ApiDownloadIgnores = FaultyDownload;

TEST_P(ApiDownloadIgnores, WhatIsNoneOfItsBusiness) {
  EXPECT_EQ(Download(), S_OK);
  EXPECT_TRUE(HasWholeFile());
  port_.WaitForTranscript("\n> #\n");
  EXPECT_EQ(CountSent("\\x15"), 1U);
  EXPECT_EQ(CountSent("\\x06"), 4U);
  EXPECT_EQ(CountSent("#"), 1U);
}

INSTANTIATE_TEST_SUITE_P(
    Faults,
    ApiDownloadIgnores,
    testing::Values(Fault{"Pieces", {"--pieces", "100", "--piece-gap", "10"}},
                    Fault{"Garbage", {"--garbage", "17"}},
                    Fault{"OtherTagFirst", {"--other-tag-first", "*"}},
                    Fault{"Echo", {"--echo"}}),
    FaultName);

struct Ending {
  std::string name;
  std::vector<std::string> switches;
  HRESULT result;
  size_t blocks;         // delivered before
  size_t asked;          // how often NAK was sent
  bool ends_transfer;    // whether # was sent
};

std::string EndingName(const testing::TestParamInfo<Ending>& ending) { return ending.param.name; }

class ApiDownloadEnds : public testing::TestWithParam<Ending> {};

TEST_P(ApiDownloadEnds, WithAClearResult) {
  std::vector<std::string> arguments = {"quorin"};
  arguments.insert(arguments.end(), GetParam().switches.begin(), GetParam().switches.end());
  const std::string content = host::Content(kSize);
  const bed::SimulatedPort port(arguments, {{"A.log", content}, {"B.log", "next"}});
  const host::Receiver receiver(port);
  const host::Report report;
  host::MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), GetParam().result);

  EXPECT_TRUE(stream.bytes == content.substr(0, GetParam().blocks * 512));
  const host::Lines sent = receiver.SentSince();
  EXPECT_EQ(host::CountOf(sent, "\\x15"), GetParam().asked) << port.Transcript();
  EXPECT_EQ(host::CountOf(sent, "#"), GetParam().ends_transfer ? 1U : 0U) << port.Transcript();
  const size_t failed =
      report.LinesWith("CQuorinProtocol::DownloadFile - download [A.log] is failed").size();
  EXPECT_EQ(failed, FAILED(GetParam().result) ? 1U : 0U);
  EXPECT_EQ(receiver.WireSince().back(), "= speed 9600") << "the speed was not put back";

  host::MemoryStream next;
  EXPECT_EQ(receiver.Download(L"B.log", next), S_OK);
  EXPECT_EQ(next.bytes, "next");
}

INSTANTIATE_TEST_SUITE_P(
    Endings,
    ApiDownloadEnds,
    testing::Values(
        Ending{"EndBlock", {"--end-block", "2"}, S_FALSE, 2, 1, false},
        // A lone '#' is no whole header: it is asked for again until the time-outs are spent.
        Ending{"EndByte", {"--end-byte", "2"}, host::kTimedOut, 2, 5, true},
        Ending{"NegativeLength", {"--negative-length", "1"}, host::kNotConnected, 4, 1, true},
        Ending{"Silence", {"--block-silence", "1:60"}, host::kTimedOut, 1, 4, true}),
    EndingName);

}  // namespace
