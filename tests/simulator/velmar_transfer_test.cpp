#include <gtest/gtest.h>

#include <algorithm>
#include <optional>
#include <string>
#include <utility>

#include "tests/simulator/velmar_session.h"

namespace sim {
namespace {

VelmarOptions InChunksOf(size_t length) {
  VelmarOptions options;
  options.chunk_length = length;
  return options;
}

class VelmarSizesTest : public testing::TestWithParam<std::pair<size_t, size_t>> {};

TEST_P(VelmarSizesTest, TheChunksMakeUpTheFile) {
  const auto [size, chunk_length] = GetParam();
  VelmarSession session(InChunksOf(chunk_length), OneFile(size));
  const auto chunks = ReadChunks(session.FetchFile());
  EXPECT_EQ(chunks.size(), std::max<size_t>(1, (size + chunk_length - 1) / chunk_length));
  EXPECT_EQ(Contents(chunks), TestPayload(size));
  uint32_t offset = 0;
  for (size_t i = 0; i < chunks.size(); ++i) {
    EXPECT_TRUE(chunks[i].good_sync);
    EXPECT_TRUE(chunks[i].good_crc);
    EXPECT_EQ(chunks[i].header_length, 28U);
    EXPECT_EQ(chunks[i].message_length, chunks[i].data.size() + 8);
    EXPECT_EQ(chunks[i].sequence, chunks.size() - 1 - i);
    EXPECT_EQ(chunks[i].offset, offset);
    EXPECT_EQ(chunks[i].length, chunks[i].data.size());
    offset += chunks[i].length;
  }
  EXPECT_FALSE(session.receiver.in_transfer());
  EXPECT_EQ(session.Ask("unlogall"), kOk);
}

INSTANTIATE_TEST_SUITE_P(Sizes,
                         VelmarSizesTest,
                         testing::Values(std::pair(0, 1024),
                                         std::pair(1, 1024),
                                         std::pair(1023, 1024),
                                         std::pair(1024, 1024),
                                         std::pair(1025, 1024),
                                         std::pair(5000, 1024),
                                         std::pair(1000, 100),
                                         std::pair(1001, 7),
                                         std::pair(300, 1),
                                         std::pair(5000, 1992),
                                         std::pair(200'000, 65527)));

// The whole log to the byte; its CRC was computed without the simulator's code.
TEST(VelmarTransferTest, ALogHasExactlyTheseBytes) {
  FileStore files;
  files.Add("A0101.log", ToBytes("0123456789abcdefghij"), 0);
  VelmarSession session({}, files);
  const Bytes expected = {0xAA, 0x44, 0x12, 0x1C, 0x4C, 0x02, 0x00, 0x20, 0x1C, 0x00, 0x00, 0x00,
                          0x7D, 0xB4, 0xF2, 0x08, 0x00, 0xB8, 0x4C, 0x0A, 0x00, 0x00, 0x00, 0x02,
                          0xF6, 0xB1, 0x78, 0x3F, 0x00, 0x00, 0x00, 0x00, 0x14, 0x00, 0x00, 0x00,
                          '0',  '1',  '2',  '3',  '4',  '5',  '6',  '7',  '8',  '9',  'a',  'b',
                          'c',  'd',  'e',  'f',  'g',  'h',  'i',  'j',  0x41, 0x3D, 0xE2, 0x6D};
  EXPECT_EQ(session.FetchFile(), expected);
}

TEST(VelmarTransferTest, ALogNamesThePortByANumber) {
  constexpr size_t kPortOffset = 7;
  for (const auto& [name, number] : {std::pair("COM1", 0x20),
                                     std::pair("COM3", 0x60),
                                     std::pair("COM4", 0xA0),
                                     std::pair("USB1", 0xA0)}) {
    VelmarOptions options;
    options.identity.port_name = name;
    VelmarSession session(options);
    session.Ask("currentfile A0101.log all");
    const Bytes reply = ToBytes(session.Ask("log filetransferb"));
    EXPECT_EQ(reply.at(kAcknowledged + kPortOffset), number) << name;
  }
}

TEST(VelmarTransferTest, TheSequenceStaysAtItsMostUntilItFits) {
  VelmarSession session(InChunksOf(1), OneFile(65'600));
  const auto chunks = ReadChunks(session.FetchFile());
  ASSERT_EQ(chunks.size(), 65'600U);
  EXPECT_EQ(chunks[0].sequence, 65'535U);
  EXPECT_EQ(chunks[64].sequence, 65'535U);
  EXPECT_EQ(chunks[65].sequence, 65'534U);
  EXPECT_EQ(chunks[65'598].sequence, 1U);
  EXPECT_EQ(chunks[65'599].sequence, 0U);
}

TEST(VelmarTransferTest, APiecewiseTransferIsTheSame) {
  VelmarSession whole;
  const Bytes expected = whole.FetchFile();
  for (const size_t size :
       {1U, 2U, 3U, 7U, 13U, 14U, 40U, 60U, 1063U, 1064U, 1065U, 2500U, 10'000U}) {
    VelmarOptions options;
    options.line.piece_size = size;
    VelmarSession session(options);
    EXPECT_EQ(session.FetchFile(), expected) << size;
  }
}

TEST(VelmarTransferTest, APieceContinuesIntoTheNextLog) {
  VelmarOptions options = InChunksOf(10);
  options.line.piece_size = 20;
  VelmarSession session(options, OneFile(30));
  session.Ask("currentfile A0101.log all");
  session.Say("log filetransferb");
  const Bytes first = session.port.Read(SIZE_MAX, 100);
  ASSERT_EQ(first.size(), 20U);
  EXPECT_EQ(first[12], ']');
  EXPECT_EQ(first[13], 0xAA);
  // 13 bytes of acknowledgement and prompt, then three logs of 50.
  session.port.Read(SIZE_MAX, 100);
  session.port.Read(SIZE_MAX, 100);
  const Bytes fourth = session.port.Read(SIZE_MAX, 100);
  ASSERT_EQ(fourth.size(), 20U);
  EXPECT_EQ(fourth[3], 0xAA);
}

TEST(VelmarTransferTest, APacedTransferFillsTheLine) {
  VelmarOptions options;
  options.line.paced = true;
  VelmarSession session(options);
  session.Ask("currentfile A0101.log all");
  const uint64_t start_ms = session.port.Now();
  session.Say("log filetransferb");
  const size_t size = 13 + 2 * (1024 + 40) + (52 + 40);
  EXPECT_EQ(session.port.ReadFull(size, 60'000).size(), size);
  // 2233 bytes at 960 bytes a second.
  EXPECT_NEAR(static_cast<double>(session.port.Now() - start_ms), 2326.0, 2.0);
}

class VelmarBusyTest : public testing::Test {
 protected:
  VelmarBusyTest() {
    VelmarOptions options;
    options.line.paced = true;
    Start(options);
  }
  void Start(const VelmarOptions& options) {
    session_.emplace(options, OneFile(10'000));
    session_->Ask("currentfile A0101.log all");
    session_->Say("log filetransferb");
    session_->port.Advance(500);
  }

  std::optional<VelmarSession> session_;
};

TEST_F(VelmarBusyTest, UnlogallEndsATransferAfterTheCurrentLog) {
  const std::string rest = session_->Ask("unlogall thisport", 60'000);
  EXPECT_FALSE(session_->receiver.in_transfer());
  EXPECT_EQ(rest.size(), 13U + 1064U + 13U);
  EXPECT_EQ(rest.substr(rest.size() - 13), kOk);
}

TEST_F(VelmarBusyTest, OtherCommandsAreAnsweredBetweenTwoLogs) {
  const std::string all = session_->Ask("COM 9600", 60'000);
  ASSERT_EQ(all.size(), 13U + 10'000U + 10 * 40U + 13U);
  EXPECT_EQ(all.substr(13 + 1064, 13), kOk);
  const Bytes logs = ToBytes(all.substr(13, 1064) + all.substr(13 + 1064 + 13));
  EXPECT_EQ(Contents(ReadChunks(logs)), TestPayload(10'000));
}

TEST_F(VelmarBusyTest, AnyCommandMayEndATransfer) {
  VelmarOptions options;
  options.line.paced = true;
  options.stops_for_commands = true;
  Start(options);
  const std::string rest = session_->Ask("log comconfiga once", 60'000);
  EXPECT_FALSE(session_->receiver.in_transfer());
  EXPECT_EQ(ReadLogs(rest.substr(13 + 1064)).size(), 1U);
}

TEST_F(VelmarBusyTest, ASecondTransferReplacesTheFirst) {
  const std::string rest = session_->Ask("log filetransferb", 60'000);
  const auto chunks = ReadChunks(ToBytes(rest.substr(13 + 1064 + 13)));
  EXPECT_EQ(Contents(chunks), TestPayload(10'000));
}

TEST_F(VelmarBusyTest, AFileThatIsDeletedEndsItsTransfer) {
  session_->Ask("del file A0101.log", 60'000);
  EXPECT_FALSE(session_->receiver.in_transfer());
  EXPECT_NE(session_->log.str().find("- file lost\n"), std::string::npos);
  EXPECT_EQ(session_->Ask("unlogall", 1000), kOk);
}

TEST(VelmarTransferTest, TheTranscriptDescribesLogs) {
  VelmarSession session({}, OneFile(1100));
  session.FetchFile();
  EXPECT_EQ(session.log.str(),
            "> currentfile A0101.log all\\r\n"
            "< \\r\\n<OK\\r\\n[COM1]\n"
            "> log filetransferb\\r\n"
            "< \\r\\n<OK\\r\\n[COM1]\n"
            "< log FILETRANSFERB seq=1 offset=0 len=1032 bytes=1064\n"
            "< log FILETRANSFERB seq=0 offset=1024 len=84 bytes=116\n");
}

}  // namespace
}  // namespace sim
