// The block transfer over a serial link, against blocks made by hand.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/serial_download_fixture.h"
#include "tests/support/report_capture.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

using QuorinSerialDownload = QuorinSerialDownloadTest;

TEST_F(QuorinSerialDownload, NeedsAStreamAndASize) {
  EXPECT_EQ(driver.DownloadOverSerial(nullptr, 100), E_INVALIDARG);
  EXPECT_EQ(driver.DownloadOverSerial(&stream, 0), E_INVALIDARG);
  EXPECT_EQ(driver.DownloadOverSerial(&stream, -1), E_INVALIDARG);
  EXPECT_THAT(connection->calls, IsEmpty());
}

TEST_F(QuorinSerialDownload, TakesBlockAfterBlock) {
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_THAT(connection->calls,
              ElementsAre(kHeaderRead,
                          kRestRead,
                          kAckWrite,
                          kHeaderRead,
                          kRestRead,
                          kAckWrite,
                          kHeaderRead,
                          kRestRead,
                          kEndWrite));
}

TEST_F(QuorinSerialDownload, WritesEachPayloadAtOnce) {
  GiveFile();
  Download();
  EXPECT_EQ(stream.writes, 3U);
  EXPECT_EQ(stream.references, 1U);
}

class QuorinLastBlock : public QuorinSerialDownload, public testing::WithParamInterface<size_t> {};

TEST_P(QuorinLastBlock, GivesAsMuchAsItSays) {
  Give(blocks.Data(0, content.substr(0, 512)));
  Give(blocks.Last(content.substr(512, GetParam())));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content.substr(0, 512 + GetParam()));
  EXPECT_EQ(Controls(), "\x06#");
}

INSTANTIATE_TEST_SUITE_P(Lengths, QuorinLastBlock, testing::Values(0, 1, 2, 255, 256, 511, 512));

TEST_F(QuorinSerialDownload, MayConsistOfAnEmptyLastBlock) {
  Give(blocks.Last(""));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, "");
  EXPECT_EQ(stream.writes, 1U) << "a write of nothing is a write";
  EXPECT_EQ(Controls(), "#");
}

// As any other failure of the stream: the receiver is told, and the host knows already.
TEST_F(QuorinSerialDownload, EndsWhenAnEmptyLastBlockCannotBeWritten) {
  Give(blocks.Last(""));
  stream.fail_at_write = 0;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_TRUE(progress.percents.empty());
  EXPECT_EQ(Controls(), "#");
}

// Lengths that a last block cannot have.
class QuorinWrongLastBlock : public QuorinSerialDownload,
                             public testing::WithParamInterface<uint16_t> {};

TEST_P(QuorinWrongLastBlock, EndsTheDownloadWithoutBeingRead) {
  Give(blocks.Next(0x04, GetParam(), content.substr(0, 512)));
  EXPECT_EQ(Download(), kNotConnected);
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(connection->calls, ElementsAre(kHeaderRead));
}

INSTANTIATE_TEST_SUITE_P(Lengths,
                         QuorinWrongLastBlock,
                         testing::Values(0xFFFF, 0x8000, 0xFE00, 513, 0x7FFF));

// Blocks whose header says enough: the rest is not waited for.
struct WrongHeader {
  std::string name;
  std::string bytes;
};

class QuorinWrongHeader : public QuorinSerialDownload,
                          public testing::WithParamInterface<WrongHeader> {};

TEST_P(QuorinWrongHeader, IsAskedForAgain) {
  Give(GetParam().bytes);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_EQ((std::vector<std::string>(connection->calls.begin(), connection->calls.begin() + 4)),
            (std::vector<std::string>{kHeaderRead, "flush", kNakWrite, kHeaderRead}));
}

std::string HeaderName(const testing::TestParamInfo<WrongHeader>& header) {
  return header.param.name;
}

INSTANTIATE_TEST_SUITE_P(All,
                         QuorinWrongHeader,
                         testing::Values(WrongHeader{"NextSequence", {0x02, 0x01, 0x00}},
                                         WrongHeader{"HighByteOfSequence", {0x02, 0x00, 0x01}},
                                         WrongHeader{"LastSequence", {0x02, '\xFF', '\xFF'}},
                                         WrongHeader{"UnknownType", {0x7E, 0x00, 0x00}},
                                         WrongHeader{"TypeZero", {0x00, 0x00, 0x00}},
                                         WrongHeader{"TypeThree", {0x03, 0x00, 0x00}},
                                         WrongHeader{"AckAsType", {0x06, 0x00, 0x00}},
                                         WrongHeader{"OneByte", {0x02}},
                                         WrongHeader{"TwoBytes", {0x02, 0x00}},
                                         WrongHeader{"EndAlone", {'#'}},
                                         WrongHeader{"Nothing", {}}),
                         HeaderName);

TEST_F(QuorinSerialDownload, ExpectsTheNextSequenceNumberAfterEachAcceptedBlockOnly) {
  const std::string first = blocks.Data(0, content.substr(0, 512));
  Give(first);
  Give(first.substr(0, 3));  // once more
  Give(blocks.Data(1, content.substr(512, 512)));
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x06\x15\x06#");
}

TEST_F(QuorinSerialDownload, IsEndedByTheReceiver) {
  Give(blocks.Data(0, content.substr(0, 512)));
  Give(std::string("#\0\0", 3));
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "\x06");
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
}

// Second blocks that prove wrong at their end.
class QuorinWrongRest : public QuorinSerialDownload {
 protected:
  // Takes the bad block for the second of the file.
  void ExpectAskedAgain(const std::function<std::string(const std::string& good)>& spoil) {
    Give(blocks.Data(0, content.substr(0, 512)));
    const std::string good = blocks.Data(1, content.substr(512, 512));
    Give(spoil(good));
    Give(good);
    Give(blocks.Last(content.substr(1024)));
    EXPECT_EQ(Download(), S_OK);
    EXPECT_EQ(stream.bytes, content);
    EXPECT_EQ(Controls(), "\x06\x15\x06#");
    EXPECT_THAT(connection->calls,
                ElementsAre(kHeaderRead,
                            kRestRead,
                            kAckWrite,
                            kHeaderRead,
                            kRestRead,
                            "flush",
                            kNakWrite,
                            kHeaderRead,
                            kRestRead,
                            kAckWrite,
                            kHeaderRead,
                            kRestRead,
                            kEndWrite));
  }
};

TEST_F(QuorinWrongRest, OfAnotherEndByte) {
  ExpectAskedAgain([](std::string block) {
    block.back() = '\x02';
    return block;
  });
}

TEST_F(QuorinWrongRest, OfADamagedPayload) {
  ExpectAskedAgain([](std::string block) {
    block[300] = static_cast<char>(block[300] ^ 1);
    return block;
  });
}

TEST_F(QuorinWrongRest, OfADamagedChecksum) {
  ExpectAskedAgain([](std::string block) {
    block[515] = static_cast<char>(block[515] ^ 0x80);
    return block;
  });
}

TEST_F(QuorinWrongRest, OfAChecksumForItselfAlone) {
  ExpectAskedAgain(
      [](const std::string& block) { return BlockStream::Make(0x02, 1, block.substr(3, 512), 0); });
}

TEST_F(QuorinWrongRest, OfAMissingByte) {
  ExpectAskedAgain([](const std::string& block) { return block.substr(0, 517); });
}

TEST_F(QuorinWrongRest, OfAHeaderAlone) {
  Give(blocks.Data(0, content.substr(0, 512)));
  const std::string good = blocks.Data(1, content.substr(512, 512));
  Give(good.substr(0, 3));
  Give("");
  Give(good);
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x06\x15\x06#");
}

TEST_F(QuorinSerialDownload, KeepsTheChecksumOfTheLastAcceptedBlock) {
  Give(blocks.Data(0, content.substr(0, 512)));
  const uint16_t accepted = blocks.crc();
  // Rejected, though its own checksum would be a fine start for what follows.
  std::string bad = BlockStream::Make(0x02, 1, TestContent(512), 0x5555);
  uint16_t bad_crc = 0;
  BlockStream::Make(0x02, 1, TestContent(512), 0x5555, &bad_crc);
  Give(bad);
  Give(BlockStream::Make(0x02, 1, content.substr(512, 512), bad_crc));
  Give(BlockStream::Make(0x02, 1, content.substr(512, 512), accepted));
  Give(blocks.Next(0x23, 0, ""));
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "\x06\x15\x15\x06");
  EXPECT_EQ(stream.bytes, content.substr(0, 1024));
}

TEST_F(QuorinSerialDownload, StartsTheChecksumAnewWithEachDownload) {
  GiveFile();
  Download();
  blocks = BlockStream();
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content + content);
}

// Silences.
TEST_F(QuorinSerialDownload, AsksAgainAfterASilence) {
  const ReportCapture report;
  connection->GiveResult(kTimedOut);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_EQ(connection->calls[1], "flush");
  EXPECT_THAT(report.Lines(), ElementsAre(kTimeoutLine));
}

TEST_F(QuorinSerialDownload, AsksAgainAfterASilenceWithinABlock) {
  const ReportCapture report;
  Give(blocks.Data(0, content.substr(0, 512)).substr(0, 3));
  connection->GiveResult(kTimedOut);
  blocks = BlockStream();
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_THAT(report.Lines(), ElementsAre(kTimeoutLine));
}

TEST_F(QuorinSerialDownload, EndsWithTheFourthSilenceOfABlock) {
  const ReportCapture report;
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_EQ(Controls(), "\x15\x15\x15");
  EXPECT_THAT(connection->calls,
              ElementsAre(kHeaderRead,
                          "flush",
                          kNakWrite,
                          kHeaderRead,
                          "flush",
                          kNakWrite,
                          kHeaderRead,
                          "flush",
                          kNakWrite,
                          kHeaderRead));
  EXPECT_THAT(report.Lines(), ElementsAre(kTimeoutLine, kTimeoutLine, kTimeoutLine, kTimeoutLine));
}

TEST_F(QuorinSerialDownload, AllowsThreeSilencesForEachBlock) {
  const auto give_silences = [this] {
    for (int i = 0; i < 3; ++i) connection->GiveResult(kTimedOut);
  };
  give_silences();
  Give(blocks.Data(0, content.substr(0, 512)));
  give_silences();
  Give(blocks.Data(1, content.substr(512, 512)));
  give_silences();
  Give(blocks.Last(content.substr(1024)));
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x15\x15\x06\x15\x15\x15\x06\x15\x15\x15#");
}

TEST_F(QuorinSerialDownload, CountsTheSilencesOfHeaderAndRestTogether) {
  const std::string header = BlockStream::Make(0x02, 0, "", 0).substr(0, 3);
  for (int i = 0; i < 2; ++i) {
    connection->GiveResult(kTimedOut);
    Give(header);
    connection->GiveResult(kTimedOut);
  }
  GiveFile();
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_EQ(Controls(), "\x15\x15\x15");
}

TEST_F(QuorinSerialDownload, DoesNotForgetSilencesWithARejectedBlock) {
  for (int i = 0; i < 3; ++i) {
    connection->GiveResult(kTimedOut);
    Give(BlockStream::Make(0x02, 0, "", 0x1111));
  }
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_EQ(Controls(), "\x15\x15\x15\x15\x15\x15");
}

TEST_F(QuorinSerialDownload, DoesNotCountRejectedBlocks) {
  for (int i = 0; i < 10; ++i) Give(BlockStream::Make(0x02, 0, "", 0x1111));
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
}

// The number in a block has sixteen bits, the one that is expected goes on.
TEST_F(QuorinSerialDownload, ExpectsNoSequenceNumberBehind65535) {
  uint32_t accepted = 0;
  uint32_t rejected = 0;
  connection->on_write = [&](std::string_view bytes) {
    connection->calls.clear();
    if (bytes == "\x06") {
      ++accepted;
      // Behind the last number it is 0 again; only the header is looked at.
      const std::string block = blocks.Data(static_cast<uint16_t>(accepted), "");
      Give(accepted <= 0xFFFF ? block : block.substr(0, 3));
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

}  // namespace
