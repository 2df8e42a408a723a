// A block transfer over USB: a block is read whole, in pieces.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <initializer_list>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/hresult.h"
#include "quorin/link_policy.h"
#include "tests/quorin/block_download_fixture.h"
#include "tests/support/user_settings.h"

using rcvlink::AbortSwitch;
using rcvlink::kNotConnected;
using rcvlink::kTimedOut;
using rcvlink::UsbPolicy;

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

namespace {

class QuorinUsbBlocks : public QuorinBlockDownloadTest {
 protected:
  QuorinUsbBlocks() : QuorinBlockDownloadTest(kUsbLink) {}
};

TEST_F(QuorinUsbBlocks, AreOfOneLength) {
  for (const DWORD length : std::initializer_list<DWORD>{0, 1, 511, 513, 1024, 0xFFFFFFFF}) {
    EXPECT_EQ(driver.DownloadOverUSB(&stream, 100, length), E_INVALIDARG) << length;
  }
  EXPECT_THAT(connection->calls, IsEmpty());
}

// The user can set the time-out of a read.
TEST(QuorinUsbBlocksSettings, LimitTheTimeOfARead) {
  UserSettings settings;
  const DWORD timeout_ms = 1234;
  settings.SetValue(L"DownloadReadTimeout", REG_DWORD, &timeout_ms, sizeof(timeout_ms));
  auto owned = std::make_unique<ScriptedConnection>();
  ScriptedConnection* const connection = owned.get();
  QuorinDriver driver(std::move(owned));
  MemoryStream stream;
  BlockStream blocks;
  connection->GiveRead(blocks.Last("x"));
  EXPECT_EQ(driver.DownloadOverUSB(&stream, 1, 512), S_OK);
  EXPECT_THAT(connection->calls, ElementsAre("read 512 1234", "read 6 1234", kEndWrite));
}

struct Pieces {
  std::vector<size_t> sizes;  // the parts in which the block arrives
  std::vector<size_t> asked;  // the sizes of the reads
};

class QuorinUsbPieces : public QuorinUsbBlocks, public testing::WithParamInterface<Pieces> {
 protected:
  void GiveInPieces(std::string block) {
    for (const size_t size : GetParam().sizes) {
      Give(block.substr(0, size));
      block.erase(0, size);
    }
    ASSERT_EQ(block, "");
  }
};

TEST_P(QuorinUsbPieces, AreOneBlock) {
  GiveInPieces(FirstBlock());
  GiveInPieces(blocks.Last(content.substr(512, 512)));
  EXPECT_EQ(Download(1024), S_OK);
  EXPECT_EQ(stream.bytes, content.substr(0, 1024));
  std::vector<std::string> calls;
  for (const char* answer : {kAckWrite, kEndWrite}) {
    for (const size_t size : GetParam().asked) {
      calls.push_back("read " + std::to_string(size) + " 30000");
    }
    calls.push_back(answer);
  }
  EXPECT_THAT(connection->calls, ElementsAreArray(calls));
}

INSTANTIATE_TEST_SUITE_P(Sizes,
                         QuorinUsbPieces,
                         testing::Values(Pieces{{512, 6}, {512, 6}},
                                         Pieces{{6, 512}, {512, 512}},
                                         Pieces{{5, 513}, {512, 512, 1}},
                                         Pieces{{7, 511}, {512, 511}},
                                         Pieces{{511, 7}, {512, 7}},
                                         Pieces{{3, 512, 3}, {512, 512, 3}},
                                         Pieces{{512, 1, 5}, {512, 6, 5}},
                                         Pieces{{64, 64, 390}, {512, 454, 390}},
                                         Pieces{{0, 512, 0, 0, 6}, {512, 512, 6, 6, 6}}));

TEST_F(QuorinUsbBlocks, AreAcceptedByteByByte) {
  for (const char byte : blocks.Last(content.substr(0, 512))) Give(std::string(1, byte));
  EXPECT_EQ(Download(512), S_OK);
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_EQ(connection->calls.size(), 519U);
  EXPECT_EQ(connection->calls[6], link.first_read);
  EXPECT_EQ(connection->calls[7], "read 511 30000");
  EXPECT_EQ(connection->calls[517], "read 1 30000");
}

TEST_F(QuorinUsbBlocks, AreNotEndedByLessThanABlock) {
  Give("#");
  GiveSilences(1);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_THAT(report.Lines(), ElementsAre(TimeoutLine()));
}

// The part that arrived is discarded: the block is sent again from its beginning.
class QuorinUsbSilence : public QuorinUsbBlocks, public testing::WithParamInterface<size_t> {};

TEST_P(QuorinUsbSilence, WithinABlockIsAskedAgain) {
  Give(BlockStream::Make(0x02, 0, content.substr(0, 512), 0).substr(0, GetParam()));
  GiveSilences(1);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_THAT(report.Lines(), ElementsAre(TimeoutLine()));
}

INSTANTIATE_TEST_SUITE_P(After, QuorinUsbSilence, testing::Values(1, 300, 517));

TEST_F(QuorinUsbBlocks, EndWithTheFourthSilenceWhereverItIs) {
  GiveSilences(2);
  Give(FirstBlock());
  GiveSilences(1);
  Give(BlockStream::Make(0x02, 1, "", 0x1111));  // rejected
  Give(blocks.Data(1, content.substr(512, 512)));
  GiveSilences(1);
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_EQ(stream.bytes, content.substr(0, 1024));
  EXPECT_EQ(Controls(), "\x15\x15\x06\x15\x15\x06");
  EXPECT_EQ(connection->AnswersLeft(), 1U);
}

TEST_F(QuorinUsbBlocks, EndWithTheResultOfTheAck) {
  for (const HRESULT result : {S_FALSE, kPositive}) {
    blocks = BlockStream();
    connection->DropAnswers();
    GiveFile();
    connection->on_write = [=](std::string_view) { return result; };
    EXPECT_EQ(Download(), result);
  }
  EXPECT_EQ(Controls(), "\x06\x06");
  EXPECT_THAT(report.Lines(), IsEmpty());
}

// Reads that end with a success code other than S_OK.
TEST_F(QuorinUsbBlocks, EndWithTheResultOfTheRead) {
  connection->Give({kPositive, FirstBlock().substr(0, 512), {}});
  EXPECT_EQ(Download(), kPositive);
  EXPECT_THAT(connection->calls, ElementsAre(link.first_read));
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST_F(QuorinUsbBlocks, EndWithTheResultOfTheReadOfTheRestWhateverIsWrongWithThem) {
  Give(FirstBlock().substr(0, 512));
  connection->Give({kPositive, std::string(6, '?'), {}});
  EXPECT_EQ(Download(), kPositive);
  EXPECT_EQ(Controls(), "");
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(report.Lines(), IsEmpty());
}

// The abort that ended the read may have been cleared by another call.
TEST_F(QuorinUsbBlocks, EndTheReceiversTransferTooWhenTheReadOfTheRestWasInterrupted) {
  Give(FirstBlock().substr(0, 512));
  connection->GiveResult(S_FALSE);
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
}

// The header is checked first.
TEST_F(QuorinUsbBlocks, AreEndedByTheReceiverHoweverTheReadEnded) {
  connection->Give({kPositive, "#", {}});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_THAT(report.Lines(), ElementsAreArray(Why({kEndText})));
}

TEST_F(QuorinUsbBlocks, AreAskedForAgainForAWrongHeaderHoweverTheReadEnded) {
  connection->Give({kPositive, BlockStream::Make(0x02, 5, "", 0).substr(0, 512), {}});
  connection->Give({kPositive, BlockStream::Make(0x7F, 0, "", 0).substr(0, 512), {}});
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x15\x06\x06#");
  EXPECT_THAT(report.Lines(), ElementsAreArray(Why({kSequenceText, kTypeText})));
}

TEST_F(QuorinUsbBlocks, FailWithALastOneOfNoLengthHoweverTheReadEnded) {
  connection->Give({kPositive, BlockStream::Make(0x04, 0xFFFF, "", 0).substr(0, 512), {}});
  EXPECT_EQ(Download(), kNotConnected);
}

TEST_F(QuorinUsbBlocks, PassAFailureOfTheStreamOn) {
  GiveFile();
  stream.fail_at_write = 1;
  EXPECT_EQ(Download(), static_cast<HRESULT>(0x80030070));
  EXPECT_THAT(report.Lines(), ElementsAre(Line("write to stream failed [0x80030070]")));
}

TEST_F(QuorinUsbBlocks, PassAFailureOfTheStreamOnAtAnEmptyLastOne) {
  Give(blocks.Last(""));
  stream.fail_at_write = 0;
  EXPECT_EQ(Download(), stream.failure);
  EXPECT_EQ(Controls(), "#");
}

TEST_F(QuorinUsbBlocks, PassAFailureOfTheStreamOnThoughTheEndCannotBeWritten) {
  GiveFile();
  stream.fail_at_write = 0;
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(Download(), STG_E_MEDIUMFULL);
}

TEST_F(QuorinUsbBlocks, EndWithTheStreamsResultForTheLastOne) {
  GiveFile();
  stream.fail_at_write = 2;
  stream.failure = kPositive;
  EXPECT_EQ(Download(), kPositive);
  EXPECT_EQ(Controls(), "\x06\x06#");
}

TEST_F(QuorinUsbBlocks, GoOnAfterAStreamResultThatIsNoFailure) {
  GiveFile();
  stream.fail_at_write = 0;
  stream.failure = S_FALSE;
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(stream.writes, 3U);
  EXPECT_EQ(Controls(), "\x06\x06#");
}

// The abort has priority over the result of the read and over its data.
TEST_F(QuorinUsbBlocks, AreAbortedThoughTheReadFailed) {
  for (const HRESULT failure : {kTimedOut, E_HANDLE}) {
    connection->Give({failure, "", [this] { driver.Abort(); }});
    EXPECT_EQ(Download(), S_FALSE);
  }
  EXPECT_EQ(Controls(), "##");
  EXPECT_THAT(report.Lines(), ElementsAre(CancelLine(), CancelLine()));
}

TEST_F(QuorinUsbBlocks, AreNotAcceptedWhenTheAbortCameWithTheRest) {
  GiveInTwo(FirstBlock(), [this] { driver.Abort(); });
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(report.Lines(), ElementsAre(CancelLine()));
}

TEST_F(QuorinUsbBlocks, AreAbortedThoughTheReceiverEndsThemWithTheRest) {
  GiveInTwo("#" + std::string(517, '\0'), [this] { driver.Abort(); });
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_THAT(report.Lines(), ElementsAre(CancelLine()));
}

TEST(QuorinUsbPolicy, CountsThePercentOfFilesOfAnySize) {
  AbortSwitch abort(nullptr);
  const UsbPolicy policy(nullptr, abort, 0);
  EXPECT_EQ(policy.Percent(80000000, 100000000), 80);  // 80.2
  EXPECT_EQ(policy.Percent(0x7FFFFFFF, 0x7FFFFFFF), 100);
}

}  // namespace
