// The block transfer of a download with blocks made by hand, as far as both links agree.
#include "quorin/block_download.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <tuple>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/block_download_fixture.h"
#include "tests/support/content.h"

using rcvlink::kNotConnected;
using rcvlink::kTimedOut;

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

namespace {

using QuorinBlockDownload = QuorinBothLinksTest;

INSTANTIATE_TEST_SUITE_P(Over, QuorinBlockDownload, BothLinks(), LinkName);

TEST_P(QuorinBlockDownload, NeedsAStreamAndASize) {
  EXPECT_EQ(DownloadInto(nullptr, 100), E_INVALIDARG);
  EXPECT_EQ(Download(0), E_INVALIDARG);
  EXPECT_EQ(Download(-1), E_INVALIDARG);
  EXPECT_THAT(connection->calls, IsEmpty());
}

TEST_P(QuorinBlockDownload, TakesBlockAfterBlock) {
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_THAT(
      connection->calls,
      ElementsAreArray(Joined(
          {BlockReads(), {kAckWrite}, BlockReads(), {kAckWrite}, BlockReads(), {kEndWrite}})));
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST_P(QuorinBlockDownload, TakesASizeOfOne) {
  Give(blocks.Last("x"));
  EXPECT_EQ(Download(1), S_OK);
  EXPECT_EQ(stream.bytes, "x");
}

TEST_P(QuorinBlockDownload, WritesEachPayloadAtOnce) {
  GiveFile();
  Download();
  EXPECT_EQ(stream.writes, 3U);
  EXPECT_EQ(stream.references, 1U);
}

TEST_P(QuorinBlockDownload, StartsAnewWithEachDownload) {
  for (int i = 0; i < 2; ++i) {
    GiveSilences(3);
    GiveFile();
    EXPECT_EQ(Download(), S_OK);
    blocks = BlockStream();
  }
  EXPECT_EQ(stream.bytes, content + content);
}

// The last block.
using QuorinLastBlock = QuorinBothLinksTestWith<size_t>;

TEST_P(QuorinLastBlock, GivesAsManyBytesAsItsLength) {
  Give(FirstBlock());
  Give(blocks.Next(0x04, static_cast<uint16_t>(Param()), content.substr(512, 512)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content.substr(0, 512 + Param()));
  EXPECT_EQ(Controls(), "\x06#");
}

INSTANTIATE_TEST_SUITE_P(Lengths,
                         QuorinLastBlock,
                         testing::Combine(BothLinks(),
                                          testing::Values(0, 1, 2, 255, 256, 511, 512)));

TEST_P(QuorinBlockDownload, MayConsistOfAnEmptyLastBlock) {
  Give(blocks.Last(""));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, "");
  EXPECT_EQ(stream.writes, 1U) << "a write of nothing is a write";
  EXPECT_EQ(Controls(), "#");
}

// Lengths that a last block cannot have.
using QuorinWrongLastBlock = QuorinBothLinksTestWith<uint16_t>;

TEST_P(QuorinWrongLastBlock, EndsTheDownload) {
  Give(blocks.Next(0x04, Param(), content.substr(0, 512)));
  EXPECT_EQ(Download(), kNotConnected);
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(connection->calls, ElementsAreArray(HeaderReads()));
  EXPECT_THAT(report.Lines(), IsEmpty());
}

// The length has priority over any other damage.
TEST_P(QuorinWrongLastBlock, EndsTheDownloadThoughItIsDamaged) {
  std::string block = BlockStream::Make(0x04, Param(), "", 0x1111);
  block.back() = '?';
  Give(block);
  EXPECT_EQ(Download(), kNotConnected);
  EXPECT_EQ(Controls(), "");
}

INSTANTIATE_TEST_SUITE_P(Lengths,
                         QuorinWrongLastBlock,
                         testing::Combine(BothLinks(),
                                          testing::Values(0xFFFF, 0x8000, 0xFE00, 513, 0x7FFF)));

// The receiver's end byte, whatever else the block holds.
TEST_P(QuorinBlockDownload, IsEndedByTheReceiver) {
  Give(FirstBlock());
  Give("#" + std::string(517, '\xFF'));
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "\x06");
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_THAT(report.Lines(), ElementsAreArray(Why({kEndText})));
}

// Second blocks that are asked for again.
struct WrongBlock {
  std::string name;
  std::function<std::string(std::string good)> spoil;
};

std::function<std::string(std::string)> Put(size_t at, const std::string& bytes) {
  return [=](std::string block) { return block.replace(at, bytes.size(), bytes); };
}

std::function<std::string(std::string)> DamagedAt(size_t at) {
  return [=](std::string block) {
    block[at] = static_cast<char>(block[at] ^ 0x40);
    return block;
  };
}

class QuorinWrongBlock : public QuorinBothLinksTestWith<WrongBlock> {
 protected:
  // The error is in the header, or only in the rest.
  void ExpectAskedAgain(bool in_header, const char* text) {
    Give(FirstBlock());
    const std::string good = blocks.Data(1, content.substr(512, 512));
    const std::string bad = Param().spoil(good);
    if (in_header) {
      GiveHeaderOf(bad);
    } else {
      Give(bad);
    }
    Give(good);
    Give(blocks.Last(content.substr(1024)));
    EXPECT_EQ(Download(), S_OK);
    EXPECT_EQ(stream.bytes, content);
    EXPECT_THAT(connection->calls,
                ElementsAreArray(Joined({BlockReads(),
                                         {kAckWrite},
                                         in_header ? HeaderReads() : BlockReads(),
                                         {"flush", kNakWrite},
                                         BlockReads(),
                                         {kAckWrite},
                                         BlockReads(),
                                         {kEndWrite}})));
    EXPECT_THAT(report.Lines(), ElementsAreArray(Why({text})));
  }
};

using QuorinWrongParameters = testing::TestParamInfo<std::tuple<Link, WrongBlock>>;

std::string WrongBlockName(const QuorinWrongParameters& block) {
  return std::get<0>(block.param).name + std::get<1>(block.param).name;
}

class QuorinWrongSequence : public QuorinWrongBlock {};

TEST_P(QuorinWrongSequence, IsAskedForAgain) { ExpectAskedAgain(true, kSequenceText); }

INSTANTIATE_TEST_SUITE_P(
    Over,
    QuorinWrongSequence,
    testing::Combine(BothLinks(),
                     testing::Values(WrongBlock{"Before", Put(1, {0, 0})},
                                     WrongBlock{"Next", Put(1, {2, 0})},
                                     WrongBlock{"HighByte", Put(1, {1, 1})},
                                     WrongBlock{"Last", Put(1, "\xFF\xFF")},
                                     WrongBlock{"WithoutEndByte",
                                                [](const std::string& block) {
                                                  return Put(1, {2, 0})(Put(517, "?")(block));
                                                }})),
    WrongBlockName);

class QuorinWrongType : public QuorinWrongBlock {};

TEST_P(QuorinWrongType, IsAskedForAgain) { ExpectAskedAgain(true, kTypeText); }

INSTANTIATE_TEST_SUITE_P(Over,
                         QuorinWrongType,
                         testing::Combine(BothLinks(),
                                          testing::Values(WrongBlock{"Zero", Put(0, {0})},
                                                          WrongBlock{"One", Put(0, {1})},
                                                          WrongBlock{"Three", Put(0, {3})},
                                                          WrongBlock{"Five", Put(0, {5})},
                                                          WrongBlock{"Ack", Put(0, {6})},
                                                          WrongBlock{"TopBit", Put(0, "\x82")},
                                                          WrongBlock{"BesidesTheEnd", Put(0, "$")},
                                                          // nor is its length checked
                                                          WrongBlock{"Unknown",
                                                                     Put(0, "~\xFF\xFF")})),
                         WrongBlockName);

class QuorinWrongEnd : public QuorinWrongBlock {};

TEST_P(QuorinWrongEnd, IsAskedForAgain) { ExpectAskedAgain(false, kEndByteText); }

INSTANTIATE_TEST_SUITE_P(
    Over,
    QuorinWrongEnd,
    testing::Combine(BothLinks(),
                     testing::Values(WrongBlock{"Byte", Put(517, {2})},
                                     WrongBlock{"ByteAndChecksum",
                                                [](const std::string& block) {
                                                  return Put(517, {0})(DamagedAt(515)(block));
                                                }},
                                     WrongBlock{"OfALastBlock", Put(517, {4})})),
    WrongBlockName);

class QuorinWrongChecksum : public QuorinWrongBlock {};

TEST_P(QuorinWrongChecksum, IsAskedForAgain) { ExpectAskedAgain(false, kChecksumText); }

INSTANTIATE_TEST_SUITE_P(
    Over,
    QuorinWrongChecksum,
    testing::Combine(BothLinks(),
                     testing::Values(WrongBlock{"OfAnotherPayload", DamagedAt(3)},
                                     WrongBlock{"OfAnotherEndOfThePayload", DamagedAt(514)},
                                     WrongBlock{"InItsLowByte", DamagedAt(515)},
                                     WrongBlock{"InItsHighByte", DamagedAt(516)},
                                     WrongBlock{"ForItselfAlone",
                                                [](const std::string& block) {
                                                  return BlockStream::Make(
                                                      2, 1, block.substr(3, 512), 0);
                                                }},
                                     WrongBlock{"OfAnEmptyLastBlock",
                                                [](const std::string&) {
                                                  return BlockStream::Make(4, 0, "", 0x1111);
                                                }})),
    WrongBlockName);

TEST_P(QuorinBlockDownload, ExpectsTheNextSequenceNumberAfterEachAcceptedBlockOnly) {
  const std::string first = FirstBlock();
  Give(first);
  GiveHeaderOf(first);  // once more
  Give(blocks.Data(1, content.substr(512, 512)));
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x06\x15\x06#");
}

TEST_P(QuorinBlockDownload, ExpectsTheFirstBlockAsNumberZero) {
  GiveHeaderOf(BlockStream::Make(0x02, 1, content.substr(0, 512), 0));
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_THAT(report.Lines(), ElementsAreArray(Why({kSequenceText})));
}

TEST_P(QuorinBlockDownload, KeepsTheChecksumOfTheLastAcceptedBlock) {
  Give(FirstBlock());
  const uint16_t accepted = blocks.crc();
  // Rejected, although the next block would fit its checksum.
  uint16_t bad_crc = 0;
  Give(BlockStream::Make(0x02, 1, Content(512), 0x5555, &bad_crc));
  Give(BlockStream::Make(0x02, 1, content.substr(512, 512), bad_crc));
  Give(BlockStream::Make(0x02, 1, content.substr(512, 512), accepted));
  Give(blocks.Next(0x23, 0, ""));
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "\x06\x15\x15\x06");
  EXPECT_EQ(stream.bytes, content.substr(0, 1024));
}

TEST_P(QuorinBlockDownload, DoesNotCountRejectedBlocks) {
  constexpr size_t kMany = 10;
  for (size_t i = 0; i < kMany; ++i) Give(BlockStream::Make(0x02, 0, "", 0x1111));
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_THAT(report.Lines(),
              ElementsAreArray(Why(std::vector<std::string>(kMany, kChecksumText))));
}

// The number in a block has sixteen bits, but the expected number has more.
TEST_P(QuorinBlockDownload, ExpectsNoSequenceNumberAfter65535) {
  constexpr uint32_t kNumbers = 0x10000;
  uint32_t accepted = 0;
  uint32_t rejected = 0;
  connection->on_write = [&](std::string_view bytes) {
    connection->calls.clear();
    if (bytes == "\x06") {
      ++accepted;
      const std::string block = blocks.Data(static_cast<uint16_t>(accepted), "");
      if (accepted < kNumbers) Give(block);
      if (accepted == kNumbers) GiveHeaderOf(block);  // its number is 0 again
    } else {
      ++rejected;
    }
    return S_OK;
  };
  Give(blocks.Data(0, ""));
  EXPECT_EQ(Download(0x7FFFFFFF), kTimedOut);
  EXPECT_EQ(accepted, kNumbers);
  EXPECT_EQ(rejected, 4U);  // the block, and three silences
}

// Silences.
TEST_P(QuorinBlockDownload, AsksAgainAfterASilence) {
  GiveSilences(1);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_EQ((std::vector<std::string>(connection->calls.begin(), connection->calls.begin() + 4)),
            (std::vector<std::string>{link.first_read, "flush", kNakWrite, link.first_read}));
  EXPECT_THAT(report.Lines(), ElementsAre(TimeoutLine()));
}

// The part that arrived is discarded: the block is sent again from its beginning.
TEST_P(QuorinBlockDownload, AsksAgainAfterASilenceWithinABlock) {
  Give(FirstBlock().substr(0, link.first_size));
  GiveSilences(1);
  blocks = BlockStream();
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_THAT(report.Lines(), ElementsAre(TimeoutLine()));
}

TEST_P(QuorinBlockDownload, EndsWithTheFourthSilence) {
  EXPECT_EQ(Download(), kTimedOut);
  const std::vector<std::string> silence = {link.first_read, "flush", kNakWrite};
  EXPECT_THAT(connection->calls,
              ElementsAreArray(Joined({silence, silence, silence, {link.first_read}})));
  EXPECT_THAT(report.Lines(),
              ElementsAre(TimeoutLine(), TimeoutLine(), TimeoutLine(), TimeoutLine()));
}

TEST_P(QuorinBlockDownload, AllowsThreeSilencesAllInAll) {
  GiveSilences(1);
  Give(FirstBlock());
  GiveSilences(1);
  Give(blocks.Data(1, content.substr(512, 512)));
  GiveSilences(1);
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x15\x06\x15#");
}

TEST_P(QuorinBlockDownload, CountsTheSilencesOfBothReadsTogether) {
  const std::string beginning = BlockStream::Make(0x02, 0, "", 0).substr(0, link.first_size);
  for (int i = 0; i < 2; ++i) {
    GiveSilences(1);
    Give(beginning);
    GiveSilences(1);
  }
  GiveFile();
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_EQ(Controls(), "\x15\x15\x15");
}

TEST_P(QuorinBlockDownload, DoesNotForgetSilencesWithARejectedBlock) {
  for (int i = 0; i < 3; ++i) {
    GiveSilences(1);
    Give(BlockStream::Make(0x02, 0, "", 0x1111));
  }
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_EQ(Controls(), "\x15\x15\x15\x15\x15\x15");
}

}  // namespace
