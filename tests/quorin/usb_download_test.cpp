// The block transfer over USB, against blocks made by hand.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <initializer_list>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/usb_download_fixture.h"
#include "tests/support/report_capture.h"
#include "tests/support/user_settings.h"

using testing::Each;
using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

namespace {

using QuorinUsbDownload = QuorinUsbDownloadTest;

TEST_F(QuorinUsbDownload, NeedsAStreamAndASize) {
  EXPECT_EQ(driver.DownloadOverUSB(nullptr, 100, 512), E_INVALIDARG);
  EXPECT_EQ(driver.DownloadOverUSB(&stream, 0, 512), E_INVALIDARG);
  EXPECT_EQ(driver.DownloadOverUSB(&stream, -1, 512), E_INVALIDARG);
  EXPECT_THAT(connection->calls, IsEmpty());
}

TEST_F(QuorinUsbDownload, KnowsOneLengthOfBlocks) {
  for (const DWORD length : std::initializer_list<DWORD>{0, 1, 511, 513, 1024, 0xFFFFFFFF}) {
    EXPECT_EQ(driver.DownloadOverUSB(&stream, 100, length), E_INVALIDARG) << length;
  }
  EXPECT_THAT(connection->calls, IsEmpty());
}

TEST_F(QuorinUsbDownload, TakesBlockAfterBlock) {
  const ReportCapture report;
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_THAT(connection->calls,
              ElementsAre(kFirstRead,
                          kSecondRead,
                          kAckWrite,
                          kFirstRead,
                          kSecondRead,
                          kAckWrite,
                          kFirstRead,
                          kSecondRead,
                          kEndWrite));
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST_F(QuorinUsbDownload, TakesASizeOfOne) {
  Give(blocks.Last("x"));
  EXPECT_EQ(Download(1), S_OK);
  EXPECT_EQ(stream.bytes, "x");
}

TEST_F(QuorinUsbDownload, WritesEachPayloadAtOnce) {
  GiveFile();
  Download();
  EXPECT_EQ(stream.writes, 3U);
  EXPECT_EQ(stream.references, 1U);
}

// How long a read is waited for is the user's to say.
TEST(QuorinUsbDownloadSettings, SayHowLongAReadMayTake) {
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

// Pieces.
struct Pieces {
  std::vector<size_t> sizes;  // how the block comes
  std::vector<size_t> asked;  // how it is asked for
};

class QuorinUsbPieces : public QuorinUsbDownload, public testing::WithParamInterface<Pieces> {
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
  GiveInPieces(blocks.Data(0, content.substr(0, 512)));
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

TEST_F(QuorinUsbDownload, TakesABlockByteByByte) {
  for (const char byte : blocks.Last(content.substr(0, 512))) Give(std::string(1, byte));
  EXPECT_EQ(Download(512), S_OK);
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_EQ(connection->calls.size(), 519U);
  EXPECT_EQ(connection->calls[6], kFirstRead);
  EXPECT_EQ(connection->calls[7], "read 511 30000");
  EXPECT_EQ(connection->calls[517], "read 1 30000");
}

// The last block.
class QuorinUsbLastBlock : public QuorinUsbDownload, public testing::WithParamInterface<size_t> {};

TEST_P(QuorinUsbLastBlock, GivesAsMuchAsItSays) {
  Give(blocks.Data(0, content.substr(0, 512)));
  Give(blocks.Next(0x04, static_cast<uint16_t>(GetParam()), content.substr(512, 512)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content.substr(0, 512 + GetParam()));
  EXPECT_EQ(Controls(), "\x06#");
}

INSTANTIATE_TEST_SUITE_P(Lengths, QuorinUsbLastBlock, testing::Values(0, 1, 2, 255, 256, 511, 512));

TEST_F(QuorinUsbDownload, MayConsistOfAnEmptyLastBlock) {
  Give(blocks.Last(""));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, "");
  EXPECT_EQ(stream.writes, 1U) << "a write of nothing is a write";
  EXPECT_EQ(Controls(), "#");
}

TEST_F(QuorinUsbDownload, FailsWhenAnEmptyLastBlockCannotBeWritten) {
  Give(blocks.Last(""));
  stream.fail_at_write = 0;
  EXPECT_EQ(Download(), stream.failure);
  EXPECT_EQ(Controls(), "#");
}

class QuorinUsbWrongLastBlock : public QuorinUsbDownload,
                                public testing::WithParamInterface<uint16_t> {};

TEST_P(QuorinUsbWrongLastBlock, EndsTheDownload) {
  const ReportCapture report;
  Give(blocks.Next(0x04, GetParam(), content.substr(0, 512)));
  EXPECT_EQ(Download(), kNotConnected);
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(connection->calls, ElementsAre(kFirstRead, kSecondRead));
  EXPECT_THAT(report.Lines(), IsEmpty());
}

// The length counts more than what else is wrong.
TEST_P(QuorinUsbWrongLastBlock, EndsTheDownloadThoughItIsDamaged) {
  std::string block = BlockStream::Make(0x04, GetParam(), "", 0x1111);
  block.back() = '?';
  Give(block);
  EXPECT_EQ(Download(), kNotConnected);
  EXPECT_EQ(Controls(), "");
}

INSTANTIATE_TEST_SUITE_P(Lengths,
                         QuorinUsbWrongLastBlock,
                         testing::Values(0xFFFF, 0x8000, 0xFE00, 513, 0x7FFF));

// The receiver's end, whatever else its block holds.
TEST_F(QuorinUsbDownload, IsEndedByTheReceiver) {
  const ReportCapture report;
  Give(blocks.Data(0, content.substr(0, 512)));
  Give("#" + std::string(517, '\xFF'));
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "\x06");
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_THAT(report.Lines(), ElementsAre(kEndLine));
}

TEST_F(QuorinUsbDownload, IsNotEndedByLessThanABlock) {
  const ReportCapture report;
  Give("#");
  connection->GiveResult(kTimedOut);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbTimeoutLine));
}

// Blocks that are asked for again.
struct WrongBlock {
  std::string name;
  std::function<std::string(std::string good)> spoil;
  std::string line;
};

std::function<std::string(std::string)> Put(size_t at, const std::string& bytes) {
  return [=](std::string block) { return block.replace(at, bytes.size(), bytes); };
}

class QuorinUsbWrongBlock : public QuorinUsbDownload,
                            public testing::WithParamInterface<WrongBlock> {};

TEST_P(QuorinUsbWrongBlock, IsAskedForAgain) {
  const ReportCapture report;
  const std::string first = blocks.Data(0, content.substr(0, 512));
  Give(first);
  const std::string good = blocks.Data(1, content.substr(512, 512));
  Give(GetParam().spoil(good));
  Give(good);
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_THAT(connection->calls,
              ElementsAre(kFirstRead,
                          kSecondRead,
                          kAckWrite,
                          kFirstRead,
                          kSecondRead,
                          "flush",
                          kNakWrite,
                          kFirstRead,
                          kSecondRead,
                          kAckWrite,
                          kFirstRead,
                          kSecondRead,
                          kEndWrite));
  EXPECT_THAT(report.Lines(), ElementsAre(GetParam().line));
}

std::string WrongBlockName(const testing::TestParamInfo<WrongBlock>& block) {
  return block.param.name;
}

std::string DamagedIn(std::string block, size_t at) {
  block[at] = static_cast<char>(block[at] ^ 0x40);
  return block;
}

INSTANTIATE_TEST_SUITE_P(Sequence,
                         QuorinUsbWrongBlock,
                         testing::Values(WrongBlock{"Before", Put(1, {0, 0}), kSequenceLine},
                                         WrongBlock{"Next", Put(1, {2, 0}), kSequenceLine},
                                         WrongBlock{"HighByte", Put(1, {1, 1}), kSequenceLine},
                                         WrongBlock{"Last", Put(1, "\xFF\xFF"), kSequenceLine},
                                         WrongBlock{"WithoutEndByte",
                                                    [](const std::string& block) {
                                                      return Put(1, {2, 0})(Put(517, "?")(block));
                                                    },
                                                    kSequenceLine}),
                         WrongBlockName);

INSTANTIATE_TEST_SUITE_P(Type,
                         QuorinUsbWrongBlock,
                         testing::Values(WrongBlock{"Zero", Put(0, {0}), kTypeLine},
                                         WrongBlock{"One", Put(0, {1}), kTypeLine},
                                         WrongBlock{"Three", Put(0, {3}), kTypeLine},
                                         WrongBlock{"Five", Put(0, {5}), kTypeLine},
                                         WrongBlock{"Ack", Put(0, {6}), kTypeLine},
                                         WrongBlock{"TopBit", Put(0, "\x82"), kTypeLine},
                                         WrongBlock{"BesidesTheEnd", Put(0, "$"), kTypeLine},
                                         // nor is its length looked at
                                         WrongBlock{"Unknown", Put(0, "~\xFF\xFF"), kTypeLine}),
                         WrongBlockName);

INSTANTIATE_TEST_SUITE_P(End,
                         QuorinUsbWrongBlock,
                         testing::Values(WrongBlock{"Byte", Put(517, {2}), kEndByteLine},
                                         WrongBlock{"ByteAndChecksum",
                                                    [](const std::string& block) {
                                                      return Put(517, {0})(DamagedIn(block, 515));
                                                    },
                                                    kEndByteLine},
                                         WrongBlock{"OfALastBlock", Put(517, {4}), kEndByteLine}),
                         WrongBlockName);

INSTANTIATE_TEST_SUITE_P(
    Checksum,
    QuorinUsbWrongBlock,
    testing::Values(WrongBlock{"OfAnotherPayload",
                               [](const std::string& block) { return DamagedIn(block, 3); },
                               kChecksumLine},
                    WrongBlock{"OfAnotherEndOfThePayload",
                               [](const std::string& block) { return DamagedIn(block, 514); },
                               kChecksumLine},
                    WrongBlock{"InItsLowByte",
                               [](const std::string& block) { return DamagedIn(block, 515); },
                               kChecksumLine},
                    WrongBlock{"InItsHighByte",
                               [](const std::string& block) { return DamagedIn(block, 516); },
                               kChecksumLine},
                    WrongBlock{"ForItselfAlone",
                               [](const std::string& block) {
                                 return BlockStream::Make(2, 1, block.substr(3, 512), 0);
                               },
                               kChecksumLine},
                    WrongBlock{
                        "OfAnEmptyLastBlock",
                        [](const std::string&) { return BlockStream::Make(4, 0, "", 0x1111); },
                        kChecksumLine}),
    WrongBlockName);

TEST_F(QuorinUsbDownload, ExpectsTheNextSequenceNumberAfterEachAcceptedBlockOnly) {
  const std::string first = blocks.Data(0, content.substr(0, 512));
  Give(first);
  Give(first);  // once more
  Give(blocks.Data(1, content.substr(512, 512)));
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x06\x15\x06#");
}

TEST_F(QuorinUsbDownload, ExpectsTheFirstBlockAsNumberZero) {
  const ReportCapture report;
  Give(BlockStream::Make(0x02, 1, content.substr(0, 512), 0));
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_THAT(report.Lines(), ElementsAre(kSequenceLine));
}

TEST_F(QuorinUsbDownload, KeepsTheChecksumOfTheLastAcceptedBlock) {
  Give(blocks.Data(0, content.substr(0, 512)));
  const uint16_t accepted = blocks.crc();
  // Rejected, though its own checksum would be a fine start for what follows.
  uint16_t bad_crc = 0;
  Give(BlockStream::Make(0x02, 1, TestContent(512), 0x5555, &bad_crc));
  Give(BlockStream::Make(0x02, 1, content.substr(512, 512), bad_crc));
  Give(BlockStream::Make(0x02, 1, content.substr(512, 512), accepted));
  Give(blocks.Next(0x23, 0, ""));
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "\x06\x15\x15\x06");
  EXPECT_EQ(stream.bytes, content.substr(0, 1024));
}

TEST_F(QuorinUsbDownload, StartsAnewWithEachDownload) {
  for (int i = 0; i < 2; ++i) {
    for (int silence = 0; silence < 3; ++silence) connection->GiveResult(kTimedOut);
    GiveFile();
    EXPECT_EQ(Download(), S_OK);
    blocks = BlockStream();
  }
  EXPECT_EQ(stream.bytes, content + content);
}

TEST_F(QuorinUsbDownload, DoesNotCountRejectedBlocks) {
  const ReportCapture report;
  for (int i = 0; i < 10; ++i) Give(BlockStream::Make(0x02, 0, "", 0x1111));
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(report.Lines().size(), 10U);
  EXPECT_THAT(report.Lines(), Each(kChecksumLine));
}

// The number in a block has sixteen bits, the one that is expected goes on.
TEST_F(QuorinUsbDownload, ExpectsNoSequenceNumberBehind65535) {
  uint32_t accepted = 0;
  uint32_t rejected = 0;
  connection->on_write = [&](std::string_view bytes) {
    connection->calls.clear();
    if (bytes == "\x06") {
      ++accepted;
      // Behind the last number it is 0 again.
      Give(blocks.Data(static_cast<uint16_t>(accepted), ""));
    } else {
      ++rejected;
    }
    return S_OK;
  };
  Give(blocks.Data(0, ""));
  EXPECT_EQ(Download(0x7FFFFFFF), kTimedOut);
  EXPECT_EQ(accepted, 65536U);
  EXPECT_EQ(rejected, 4U);  // the block, and three silences
}

// Silences.
TEST_F(QuorinUsbDownload, AsksAgainAfterASilence) {
  const ReportCapture report;
  connection->GiveResult(kTimedOut);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_EQ((std::vector<std::string>(connection->calls.begin(), connection->calls.begin() + 4)),
            (std::vector<std::string>{kFirstRead, "flush", kNakWrite, kFirstRead}));
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbTimeoutLine));
}

// What came of the block is forgotten: it comes again from its beginning.
class QuorinUsbSilence : public QuorinUsbDownload, public testing::WithParamInterface<size_t> {};

TEST_P(QuorinUsbSilence, WithinABlockIsAskedAgain) {
  const ReportCapture report;
  Give(BlockStream::Make(0x02, 0, content.substr(0, 512), 0).substr(0, GetParam()));
  connection->GiveResult(kTimedOut);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbTimeoutLine));
}

INSTANTIATE_TEST_SUITE_P(Behind, QuorinUsbSilence, testing::Values(1, 300, 512, 517));

TEST_F(QuorinUsbDownload, EndsWithTheFourthSilence) {
  const ReportCapture report;
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_THAT(connection->calls,
              ElementsAre(kFirstRead,
                          "flush",
                          kNakWrite,
                          kFirstRead,
                          "flush",
                          kNakWrite,
                          kFirstRead,
                          "flush",
                          kNakWrite,
                          kFirstRead));
  EXPECT_THAT(report.Lines(),
              ElementsAre(kUsbTimeoutLine, kUsbTimeoutLine, kUsbTimeoutLine, kUsbTimeoutLine));
}

TEST_F(QuorinUsbDownload, AllowsThreeSilencesAllInAll) {
  connection->GiveResult(kTimedOut);
  Give(blocks.Data(0, content.substr(0, 512)));
  connection->GiveResult(kTimedOut);
  Give(blocks.Data(1, content.substr(512, 512)));
  connection->GiveResult(kTimedOut);
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x15\x06\x15#");
}

TEST_F(QuorinUsbDownload, EndsWithTheFourthSilenceWhereverItIs) {
  for (int i = 0; i < 2; ++i) connection->GiveResult(kTimedOut);
  Give(blocks.Data(0, content.substr(0, 512)));
  connection->GiveResult(kTimedOut);
  Give(BlockStream::Make(0x02, 1, "", 0x1111));  // rejected
  Give(blocks.Data(1, content.substr(512, 512)));
  connection->GiveResult(kTimedOut);
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_EQ(stream.bytes, content.substr(0, 1024));
  EXPECT_EQ(Controls(), "\x15\x15\x06\x15\x15\x06");
  EXPECT_EQ(connection->AnswersLeft(), 1U);
}

}  // namespace
