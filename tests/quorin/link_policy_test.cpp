// How a block transfer differs over a serial link; over USB in link_policy_usb_test.cpp.
#include "quorin/link_policy.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <numeric>
#include <string>
#include <string_view>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/block_download_fixture.h"

using rcvlink::AbortSwitch;
using rcvlink::kTimedOut;
using rcvlink::LinkPolicy;
using rcvlink::SerialPolicy;
using rcvlink::UsbPolicy;

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

// Serial: a block is read in two steps, its header first.
class QuorinSerialBlocks : public QuorinBlockDownloadTest {
 protected:
  QuorinSerialBlocks() : QuorinBlockDownloadTest(kSerialLink) {}
};

TEST_F(QuorinSerialBlocks, AreEndedByAHeaderAlone) {
  Give(std::string("#\0\0", 3));
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_THAT(connection->calls, ElementsAre(link.first_read));
}

// Fewer bytes than a header are ignored, even the end. The rest is not read.
class QuorinShortHeader : public QuorinSerialBlocks,
                          public testing::WithParamInterface<std::string> {};

TEST_P(QuorinShortHeader, IsAskedForAgain) {
  Give(GetParam());
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_EQ((std::vector<std::string>(connection->calls.begin(), connection->calls.begin() + 4)),
            (std::vector<std::string>{link.first_read, "flush", kNakWrite, link.first_read}));
  EXPECT_THAT(report.Lines(), IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(Headers,
                         QuorinShortHeader,
                         testing::Values(std::string(),
                                         std::string("\x02"),
                                         std::string("\x02\0", 2),
                                         std::string("\x04\x01", 2),
                                         std::string("#")));

// The part of a second block that comes with the second read.
class QuorinShortRest : public QuorinSerialBlocks, public testing::WithParamInterface<size_t> {};

TEST_P(QuorinShortRest, IsAskedForAgain) {
  Give(FirstBlock());
  const std::string good = blocks.Data(1, content.substr(512, 512));
  Give(good.substr(0, 3));
  Give(good.substr(3, GetParam()));
  Give(good);
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x06\x15\x06#");
  EXPECT_THAT(report.Lines(), IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(Lengths, QuorinShortRest, testing::Values(0, 1, 512, 514));

TEST_F(QuorinSerialBlocks, AreAskedForAgainWhenTheReadOfTheRestWasInterrupted) {
  Give(FirstBlock().substr(0, 3));
  connection->GiveResult(S_FALSE);
  blocks = BlockStream();
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
}

TEST_F(QuorinSerialBlocks, AreAcceptedWhateverTheReadsReturned) {
  connection->Give({kPositive, blocks.Last("x"), {}});
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, "x");
}

TEST_F(QuorinSerialBlocks, AllowThreeSilencesEach) {
  GiveSilences(3);
  Give(FirstBlock());
  GiveSilences(3);
  Give(blocks.Data(1, content.substr(512, 512)));
  GiveSilences(3);
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x15\x15\x06\x15\x15\x15\x06\x15\x15\x15#");
}

// The stream is the host's own, so the host already knows of the failure.
TEST_F(QuorinSerialBlocks, DoNotReturnAFailureOfTheStream) {
  GiveFile();
  stream.fail_at_write = 1;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST_F(QuorinSerialBlocks, DoNotReturnAFailureOfTheStreamAtAnEmptyLastOne) {
  Give(blocks.Last(""));
  stream.fail_at_write = 0;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_TRUE(progress.percents.empty());
  EXPECT_EQ(Controls(), "#");
}

TEST_F(QuorinSerialBlocks, DoNotReturnTheStreamsResultForTheLastOne) {
  GiveFile();
  stream.fail_at_write = 2;
  stream.failure = kPositive;
  EXPECT_EQ(Download(), S_OK);
}

TEST_F(QuorinSerialBlocks, EndWithoutAFailureWhenTheAckWasInterrupted) {
  for (const HRESULT result : {S_FALSE, kPositive}) {
    blocks = BlockStream();
    connection->DropAnswers();
    GiveFile();
    connection->on_write = [=](std::string_view) { return result; };
    EXPECT_EQ(Download(), S_OK);
  }
  EXPECT_EQ(Controls(), "\x06\x06");
}

// The failed read has priority over the abort.
TEST_F(QuorinSerialBlocks, AreAbortedAfterASilence) {
  connection->Give({kTimedOut, "", [this] { driver.Abort(); }});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "\x15#");
  EXPECT_THAT(report.Lines(), ElementsAre(TimeoutLine(), CancelLine()));
}

TEST_F(QuorinSerialBlocks, EndWithAFailedReadThoughTheAbortCameWithIt) {
  connection->Give({E_HANDLE, "", [this] { driver.Abort(); }});
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_EQ(Controls(), "");
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST_F(QuorinSerialBlocks, AreAcceptedThoughTheAbortCameWithTheRest) {
  GiveInTwo(FirstBlock(), [this] { driver.Abort(); });
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
}

TEST_F(QuorinSerialBlocks, AreCompleteThoughTheAbortCameWithTheLast) {
  GiveInTwo(blocks.Last(content.substr(0, 100)), [this] { driver.Abort(); });
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(stream.bytes, content.substr(0, 100));
}

// The arithmetic is in 32 bits, so larger files wrap.
TEST(QuorinSerialPolicy, CountsThePercentInArithmeticThatWraps) {
  const SerialPolicy policy(nullptr);
  constexpr uint32_t kLargestProduct = 43383508;  // times 99
  EXPECT_EQ(policy.Percent(kLargestProduct, kLargestProduct), 99 + 1);
  EXPECT_EQ(policy.Percent(kLargestProduct + 1, kLargestProduct + 1), 0 + 1);
  EXPECT_EQ(policy.Percent(80000000, 100000000), (7920000000 - 4294967296) / 100000000 + 1);
}

// The largest sequence number.
TEST(QuorinLinkPolicies, CountUpThroughTheLargestTransfer) {
  AbortSwitch abort(nullptr);
  const SerialPolicy serial(nullptr);
  const UsbPolicy usb(nullptr, abort, 0);
  for (const LinkPolicy* policy : std::initializer_list<const LinkPolicy*>{&serial, &usb}) {
    constexpr uint32_t kBlocks = 0x10000;
    std::vector<int> percents = {1};
    for (uint32_t i = 1; i <= kBlocks; ++i) {
      const int percent = policy->Percent(i * 512, kBlocks * 512);
      if (percent != percents.back()) percents.push_back(percent);
    }
    std::vector<int> all(100);
    std::iota(all.begin(), all.end(), 1);
    EXPECT_EQ(percents, all);
  }
}

}  // namespace
