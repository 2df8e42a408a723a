#include "simulator/line.h"

#include <gtest/gtest.h>

#include <string>

#include "tests/simulator/session.h"

namespace sim {
namespace {

TEST(LineTest, APacedLineCarriesTenBitsAByte) {
  QuorinOptions options;
  options.line.paced = true;
  Session session(options);
  session.Ask("%1%get,\"A0101.log\":{500,512}\r\n");
  const uint64_t start_ms = session.port.Now();
  EXPECT_EQ(session.NextBlock(kNak, 10'000).size(), kBlockSize);
  // 518 bytes at 960 bytes a second.
  EXPECT_EQ(session.port.Now() - start_ms, 540U);
}

TEST(LineTest, APacedLineHandsOutWhatHasArrivedByNow) {
  QuorinOptions options;
  options.line.paced = true;
  options.line.speed = 115200;
  Session session(options);
  session.host_speed = 115200;
  session.Ask("%1%get,\"A0101.log\":{500,512}\r\n");
  session.Say(kNak);
  session.port.Advance(10);
  EXPECT_EQ(session.port.Read(SIZE_MAX, 0).size(), 115U);
}

TEST(LineTest, AnIdleLineDoesNotSendFasterLater) {
  QuorinOptions options;
  options.line.paced = true;
  Session session(options);
  session.Ask("%1%\r\n");
  session.port.Advance(100'000);
  session.Say("%1%\r\n");
  session.port.Advance(5);
  EXPECT_EQ(session.port.Read(SIZE_MAX, 0).size(), 4U);
}

TEST(LineTest, PiecesComeOneByOneWithAPause) {
  QuorinOptions options;
  options.line.piece_size = 4;
  Session session(options);
  session.Say("%1%\r\n");
  EXPECT_EQ(ToText(session.port.Read(SIZE_MAX, 100)), "RE00");
  EXPECT_EQ(session.port.Now(), 0U);
  EXPECT_EQ(ToText(session.port.Read(SIZE_MAX, 100)), "3%1%");
  EXPECT_EQ(session.port.Now(), kDefaultPieceGapMs);
  EXPECT_EQ(ToText(session.port.Read(SIZE_MAX, 100)), "\r\n");
  EXPECT_EQ(session.port.Now(), 2 * kDefaultPieceGapMs);
}

TEST(LineTest, APieceGoesOnIntoTheNextMessage) {
  QuorinOptions options;
  options.line.piece_size = 12;
  Session session(options);
  session.Say("%1%\r\n%2%\r\n");
  EXPECT_EQ(ToText(session.port.Read(SIZE_MAX, 100)), "RE003%1%\r\nRE");
  EXPECT_EQ(ToText(session.port.Read(SIZE_MAX, 100)), "003%2%\r\n");
}

TEST(LineTest, APieceDoesNotGoOnBeyondAChangeOfSpeed) {
  QuorinOptions options;
  options.line.piece_size = 100;
  Session session(options);
  session.Say("%1%set,cur/term/rate,115200\r\n%2%\r\n");
  EXPECT_EQ(ToText(session.port.ReadFull(100, 100)), "RE003%1%\r\n");
}

TEST(LineTest, APieceDoesNotTakeWhatIsNotDue) {
  QuorinOptions options;
  options.line.piece_size = 100;
  options.faults.replies = {{ReplyFaultKind::kSilence, "print", kAlways, 1000}};
  Session session(options);
  session.Say("%1%\r\n%2%print,/par/rcvid\r\n");
  EXPECT_EQ(ToText(session.port.Read(SIZE_MAX, 100)), "RE003%1%\r\n");
  EXPECT_EQ(ToText(session.port.Read(SIZE_MAX, 2000)), "RE00A%2%QR00421\r\n");
  EXPECT_EQ(session.port.Now(), 1000U);
}

TEST(LineTest, PacedPiecesComeWhenTheirLastByteHas) {
  QuorinOptions options;
  options.line.paced = true;
  options.line.piece_size = 48;
  Session session(options);
  session.Ask("%1%get,\"A0101.log\":{500,512}\r\n");
  const uint64_t start_ms = session.port.Now();
  session.Say(kNak);
  EXPECT_EQ(session.port.Read(SIZE_MAX, 1000).size(), 48U);
  EXPECT_EQ(session.port.Now() - start_ms, 50U);
}

TEST(LineTest, ATransferInPiecesIsTheSame) {
  Session whole;
  const Bytes first = whole.StartTransfer();
  QuorinOptions options;
  options.line.piece_size = 7;
  Session pieces(options);
  EXPECT_EQ(pieces.StartTransfer(), first);
  EXPECT_EQ(pieces.NextBlock(kAck), whole.NextBlock(kAck));
}

// A host that finds a block's first bytes wrong answers while the rest is still on the wire.
TEST(LineTest, ANakBeforeTheBlockHasLeftIsNotActedOn) {
  QuorinOptions options;
  options.line.paced = true;
  Session session(options);
  session.Ask("%1%get,\"A0101.log\":{500,512}\r\n");
  session.Say(kNak);
  session.port.Advance(100);
  session.Say(kNak);
  session.Say(kNak);
  EXPECT_EQ(session.Ask("", 3000).size(), kBlockSize);
  EXPECT_EQ(session.Ask(kNak, 3000).size(), kBlockSize);
}

TEST(MemoryPortTest, ReadWaitsNoLongerThanItMust) {
  Session session;
  EXPECT_TRUE(session.port.Read(10, 250).empty());
  EXPECT_EQ(session.port.Now(), 250U);
  session.Say("%1%\r\n");
  EXPECT_EQ(ToText(session.port.Read(5, 1000)), "RE003");
  EXPECT_EQ(session.port.Now(), 250U);
  EXPECT_EQ(ToText(session.port.ReadFull(100, 1000)), "%1%\r\n");
  EXPECT_EQ(session.port.Now(), 1250U);
}

TEST(MemoryPortTest, PurgeDiscardsReceivedBytesButNotLaterOnes) {
  QuorinOptions options;
  options.line.piece_size = 4;
  Session session(options);
  session.Say("%1%\r\n");
  session.port.Purge();
  EXPECT_EQ(session.Ask(""), "3%1%\r\n");
}

}  // namespace
}  // namespace sim
