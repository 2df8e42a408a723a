#include <gtest/gtest.h>

#include <string>

#include "tests/simulator/velmar_session.h"

namespace sim {
namespace {

using Kind = VelmarChunkFaultKind;

constexpr size_t kFullBody = 1032;

// The three chunks of 2100 bytes, the faulty one being the second.
Bytes FetchWith(const VelmarChunkFault& fault) {
  VelmarSession session(WithChunkFault(fault));
  return session.FetchFile();
}

TEST(VelmarChunkFaultsTest, ADamagedCrcIsTheOnlyDamage) {
  VelmarSession session(WithChunkFault({Kind::kDamagedCrc, 1}));
  const auto chunks = ReadChunks(session.FetchFile());
  ASSERT_EQ(chunks.size(), 3U);
  EXPECT_TRUE(chunks[0].good_crc);
  EXPECT_FALSE(chunks[1].good_crc);
  EXPECT_TRUE(chunks[2].good_crc);
  EXPECT_EQ(Contents(chunks), TestPayload(2100));
  EXPECT_TRUE(ReadChunks(session.FetchFile()).at(1).good_crc);
}

TEST(VelmarChunkFaultsTest, AFlippedBitDoesNotFitTheCrc) {
  const auto chunks = ReadChunks(FetchWith({Kind::kFlippedBit, 1}));
  ASSERT_EQ(chunks.size(), 3U);
  EXPECT_FALSE(chunks[1].good_crc);
  Bytes expected = TestPayload(2100);
  expected.at(2 * 1024 - 1) ^= 1;
  EXPECT_EQ(Contents(chunks), expected);
}

TEST(VelmarChunkFaultsTest, AForgedBitFitsTheCrc) {
  VelmarSession session(WithChunkFault({Kind::kForgedBit, 1}));
  const auto chunks = ReadChunks(session.FetchFile());
  ASSERT_EQ(chunks.size(), 3U);
  EXPECT_TRUE(chunks[1].good_crc);
  Bytes expected = TestPayload(2100);
  expected.at(2 * 1024 - 1) ^= 1;
  EXPECT_EQ(Contents(chunks), expected);
  EXPECT_NE(session.log.str().find("bytes=1064 fault=forged\n"), std::string::npos);
  EXPECT_EQ(Contents(ReadChunks(session.FetchFile())), TestPayload(2100));
}

TEST(VelmarChunkFaultsTest, AnEmptyFileHasNoBitToForge) {
  VelmarSession session(WithChunkFault({Kind::kForgedBit, 0, kAlways}), OneFile(0));
  const auto chunks = ReadChunks(session.FetchFile());
  ASSERT_EQ(chunks.size(), 1U);
  EXPECT_EQ(chunks[0].length, 0U);
}

TEST(VelmarChunkFaultsTest, AFaultMayHappenEveryTime) {
  VelmarSession session(WithChunkFault({Kind::kDamagedCrc, 1, kAlways}));
  EXPECT_FALSE(ReadChunks(session.FetchFile()).at(1).good_crc);
  EXPECT_FALSE(ReadChunks(session.FetchFile()).at(1).good_crc);
}

TEST(VelmarChunkFaultsTest, SyncBytesMayBeWrongButForTheFirst) {
  const Bytes bytes = FetchWith({Kind::kWrongSync, 1});
  const auto chunks = ReadChunks(bytes);
  EXPECT_TRUE(chunks.at(0).good_sync);
  EXPECT_FALSE(chunks.at(1).good_sync);
  EXPECT_EQ(bytes.at(1064), 0xAA);
  EXPECT_TRUE(chunks.at(1).good_crc);
}

TEST(VelmarChunkFaultsTest, AWrongMessageLengthDoesNotChangeTheBody) {
  for (const uint32_t length : {0U, 4U, 7U, 2000U, 65535U}) {
    const Bytes bytes = FetchWith({Kind::kMessageLength, 1, kOnce, length});
    const auto all = ReadChunks(Bytes(bytes.begin(), bytes.begin() + 2 * 1064), kFullBody);
    ASSERT_EQ(all.size(), 2U);
    EXPECT_EQ(all[1].message_length, length);
    EXPECT_TRUE(all[1].good_crc);
    EXPECT_EQ(bytes.size(), 2U * 1064 + 92);
  }
}

TEST(VelmarChunkFaultsTest, AnotherBodyLengthIsTrue) {
  const Bytes longer = FetchWith({Kind::kBodyLength, 1, kOnce, 2000});
  const auto chunks = ReadChunks(longer);
  ASSERT_EQ(chunks.size(), 3U);
  EXPECT_EQ(chunks[1].message_length, 2000U);
  EXPECT_EQ(chunks[1].data.size(), 1992U);
  EXPECT_EQ(chunks[1].data.at(1024), 0U);
  EXPECT_TRUE(chunks[1].good_crc);
  EXPECT_EQ(chunks[2].offset, 2048U);

  const Bytes shorter = FetchWith({Kind::kBodyLength, 1, kOnce, 4});
  ASSERT_EQ(shorter.size(), 1064U + 36 + 92);
  EXPECT_EQ(shorter.at(1064 + 8), 4U);
  EXPECT_EQ(shorter.at(1064 + 36), 0xAA);
  const Bytes crc(shorter.begin() + 1064 + 32, shorter.begin() + 1064 + 36);
  const uint32_t expected = HostCrc32(Bytes(shorter.begin() + 1064, shorter.begin() + 1064 + 32));
  EXPECT_EQ(crc[0] + crc[1] * 0x100U + crc[2] * 0x10000U + crc[3] * 0x1000000U, expected);
}

TEST(VelmarChunkFaultsTest, TheHeaderLengthMayBeWrong) {
  for (const uint32_t length : {0U, 255U}) {
    const auto chunks = ReadChunks(FetchWith({Kind::kHeaderLength, 1, kOnce, length}));
    ASSERT_EQ(chunks.size(), 3U);
    EXPECT_EQ(chunks[0].header_length, 28U);
    EXPECT_EQ(chunks[1].header_length, length);
    EXPECT_TRUE(chunks[1].good_crc);
    EXPECT_EQ(Contents(chunks), TestPayload(2100));
  }
}

TEST(VelmarChunkFaultsTest, FaultsOfAChunkAddUp) {
  VelmarOptions options;
  options.faults.chunks = {{Kind::kHeaderLength, 0, kOnce, 255},
                           {Kind::kMessageLength, 0, kOnce, 65535}};
  VelmarSession session(options, OneFile(1024));
  const auto chunks = ReadChunks(session.FetchFile(), kFullBody);
  EXPECT_EQ(chunks.at(0).header_length, 255U);
  EXPECT_EQ(chunks.at(0).message_length, 65535U);
  EXPECT_NE(session.log.str().find("fault=message-length fault=header-length"), std::string::npos);
}

TEST(VelmarChunkFaultsTest, AChunkMayComeLate) {
  VelmarSession session(WithChunkFault({Kind::kSilence, 1, kOnce, 9000}));
  session.Ask("currentfile A0101.log all");
  const uint64_t start_ms = session.port.Now();
  session.Say("log filetransferb");
  EXPECT_EQ(session.port.Read(SIZE_MAX, 0).size(), kAcknowledged + 1064);
  EXPECT_EQ(session.port.Read(SIZE_MAX, 8999).size(), 0U);
  EXPECT_EQ(session.port.Read(SIZE_MAX, 1).size(), 1064U + 92);
  EXPECT_EQ(session.port.Now() - start_ms, 9000U);
}

TEST(VelmarChunkFaultsTest, SilenceOnAPacedLineBeginsWhenTheLineIsFree) {
  VelmarOptions options = WithChunkFault({Kind::kSilence, 1, kOnce, 9000});
  options.line.paced = true;
  VelmarSession session(options);
  session.Ask("currentfile A0101.log all");
  session.Say("log filetransferb");
  ASSERT_EQ(session.port.ReadFull(kAcknowledged + 1064, 2000).size(), kAcknowledged + 1064);
  const uint64_t start_ms = session.port.Now();
  session.port.ReadFull(1064, 20'000);
  // 1064 bytes at 960 bytes a second.
  EXPECT_NEAR(static_cast<double>(session.port.Now() - start_ms), 9000.0 + 1108.0, 2.0);
}

TEST(VelmarChunkFaultsTest, APieceEndsBeforeTheSilence) {
  VelmarOptions options = WithChunkFault({Kind::kSilence, 1, kOnce, 9000});
  options.line.piece_size = 5000;
  VelmarSession session(options);
  session.Ask("currentfile A0101.log all");
  session.Say("log filetransferb");
  EXPECT_EQ(session.port.Read(SIZE_MAX, 100).size(), kAcknowledged + 1064);
  EXPECT_EQ(session.port.Read(SIZE_MAX, 8000).size(), 0U);
  EXPECT_EQ(session.port.Read(SIZE_MAX, 1000).size(), 1064U + 92);
}

TEST(VelmarChunkFaultsTest, ASilentReceiverStillListens) {
  VelmarSession session(WithChunkFault({Kind::kSilence, 0, kOnce, 3'600'000}));
  session.Ask("currentfile A0101.log all");
  EXPECT_EQ(session.Ask("log filetransferb"), kOk);
  EXPECT_EQ(session.Ask("unlogall thisport"), kOk);
  EXPECT_EQ(session.Ask("unlogall thisport", 4'000'000), kOk);
}

TEST(VelmarChunkFaultsTest, ALaterTransferIsNotLate) {
  VelmarSession session(WithChunkFault({Kind::kSilence, 0, kOnce, 60'000}));
  session.Ask("currentfile A0101.log all");
  session.Ask("log filetransferb");
  session.Ask("unlogall");
  EXPECT_EQ(session.FetchFile().size(), 2U * 1064 + 92);
}

TEST(VelmarChunkFaultsTest, TheSequenceMayNotReachZero) {
  VelmarOptions options;
  options.faults.endless_sequence = true;
  VelmarSession session(options);
  const auto chunks = ReadChunks(session.FetchFile());
  ASSERT_EQ(chunks.size(), 3U);
  EXPECT_EQ(chunks[0].sequence, 2U);
  EXPECT_EQ(chunks[1].sequence, 1U);
  EXPECT_EQ(chunks[2].sequence, 1U);
  EXPECT_EQ(session.Ask("unlogall"), kOk);
}

TEST(VelmarChunkFaultsTest, AReceiverMayVanishAfterAChunk) {
  VelmarOptions options;
  options.faults.vanish_after_chunk = 1;
  VelmarSession session(options);
  EXPECT_EQ(session.FetchFile(10).size(), 2U * 1064);
  EXPECT_FALSE(session.receiver.gone());
  session.port.Advance(1000);
  EXPECT_TRUE(session.receiver.gone());
  EXPECT_EQ(session.Ask("unlogall", 60'000), "");
}

TEST(VelmarChunkFaultsTest, AReceiverVanishesAfterTheLastChunkToo) {
  VelmarOptions options;
  options.faults.vanish_after_chunk = 2;
  VelmarSession session(options);
  EXPECT_EQ(session.FetchFile(1000).size(), 2U * 1064 + 92);
  EXPECT_TRUE(session.receiver.gone());
}

}  // namespace
}  // namespace sim
