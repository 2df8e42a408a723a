#include "simulator/damaged_line.h"

#include <gtest/gtest.h>

#include <deque>
#include <sstream>

#include "tests/simulator/session.h"
#include "tests/simulator/velmar_session.h"

namespace sim {
namespace {

// Hears everything, and sends what it is told to.
class PlainReceiver : public Receiver {
 public:
  void Receive(std::span<const uint8_t> bytes, uint32_t, uint64_t) override {
    heard.insert(heard.end(), bytes.begin(), bytes.end());
  }
  std::optional<uint64_t> NextSendTime() const override {
    return pieces.empty() ? std::nullopt : std::optional<uint64_t>(0);
  }
  Bytes Send(uint64_t, uint32_t) override {
    if (pieces.empty()) return {};
    Bytes piece = pieces.front();
    pieces.pop_front();
    return piece;
  }
  bool gone() const override { return false; }
  uint32_t speed() const override { return kDefaultSpeed; }
  std::optional<uint64_t> last_block() const override { return block; }

  Bytes heard;
  std::deque<Bytes> pieces;
  std::optional<uint64_t> block;
};

class DamagedLineTest : public testing::Test {
 protected:
  // Sends the payload in pieces, and gives what arrives.
  static Bytes Carry(const DamageOptions& options, const Bytes& payload, size_t piece) {
    PlainReceiver receiver;
    for (size_t at = 0; at < payload.size(); at += piece) {
      const size_t end = std::min(at + piece, payload.size());
      receiver.pieces.emplace_back(payload.begin() + static_cast<std::ptrdiff_t>(at),
                                   payload.begin() + static_cast<std::ptrdiff_t>(end));
    }
    DamagedLine line(options, receiver);
    MemoryPort port(line);
    return port.ReadFull(SIZE_MAX, 1'000'000);
  }

  static DamageOptions Noisy(double rate, std::vector<NoiseKind> kinds, uint64_t seed = 1) {
    DamageOptions options;
    options.rate = rate;
    options.kinds = std::move(kinds);
    options.seed = seed;
    return options;
  }

  static DamageOptions With(const LineEvent& event) {
    DamageOptions options;
    options.events = {event};
    return options;
  }

  std::ostringstream log;
  Transcript transcript{log};
  PlainReceiver receiver;
};

TEST_F(DamagedLineTest, AGoodLineChangesNothing) {
  const Bytes payload = TestPayload(5000);
  EXPECT_TRUE(Carry({}, payload, 100) == payload);
}

TEST_F(DamagedLineTest, TheSameSeedGivesTheSameDamage) {
  const Bytes payload = TestPayload(20'000);
  const DamageOptions options = Noisy(0.01, AllNoiseKinds(), 5);
  const Bytes arrived = Carry(options, payload, 512);
  EXPECT_FALSE(arrived == payload);
  EXPECT_TRUE(Carry(options, payload, 512) == arrived);
  EXPECT_FALSE(Carry(Noisy(0.01, AllNoiseKinds(), 6), payload, 512) == arrived);
}

TEST_F(DamagedLineTest, ItDoesNotMatterHowBytesAreCut) {
  const Bytes payload = TestPayload(20'000);
  const DamageOptions options =
      Noisy(0.01, {NoiseKind::kFlip, NoiseKind::kDrop, NoiseKind::kInsert, NoiseKind::kStall}, 5);
  EXPECT_TRUE(Carry(options, payload, 512) == Carry(options, payload, 7));
}

TEST_F(DamagedLineTest, EachKindDoesWhatItSays) {
  const Bytes payload = {10, 20};
  EXPECT_EQ(Carry(Noisy(1, {NoiseKind::kDrop}), payload, 2), Bytes{});
  EXPECT_EQ(Carry(Noisy(1, {NoiseKind::kDouble}), payload, 2), (Bytes{10, 10, 20, 20}));
  const Bytes inserted = Carry(Noisy(1, {NoiseKind::kInsert}), payload, 2);
  ASSERT_EQ(inserted.size(), 4U);
  EXPECT_EQ(inserted[1], 10);
  EXPECT_EQ(inserted[3], 20);
  const Bytes flipped = Carry(Noisy(1, {NoiseKind::kFlip}), payload, 2);
  ASSERT_EQ(flipped.size(), 2U);
  EXPECT_NE(flipped[0], 10);
  EXPECT_NE(flipped[1], 20);
}

TEST_F(DamagedLineTest, AStallDelaysWhatFollows) {
  receiver.pieces = {{1, 2}};
  DamagedLine line(Noisy(1, {NoiseKind::kStall}), receiver, &transcript);
  MemoryPort port(line);
  EXPECT_EQ(port.Read(10, 0), Bytes{1});
  EXPECT_EQ(port.Read(10, 0), Bytes{});
  EXPECT_EQ(port.Read(10, 10'000), Bytes{2});
  EXPECT_GE(port.Now(), 50U);
  EXPECT_EQ(log.str().substr(0, log.str().find("- noise", 1)),
            "- noise stall at byte 0 to the host\n- silent\n");
}

TEST_F(DamagedLineTest, AnUnpluggedLineIsDeadInBothDirections) {
  receiver.pieces = {{1, 2, 3}};
  DamagedLine line(Noisy(1, {NoiseKind::kUnplug}), receiver, &transcript);
  MemoryPort port(line);
  EXPECT_EQ(port.Read(10, 0), Bytes{});
  EXPECT_FALSE(line.plugged());
  port.Write("abc", 0);
  EXPECT_TRUE(receiver.heard.empty());
  port.Advance(5000);
  EXPECT_TRUE(line.plugged());
  port.Write("abc", 0);
  EXPECT_EQ(ToText(receiver.heard), "abc");
  EXPECT_EQ(log.str(), "- noise unplug at byte 0 to the host\n- unplugged\n- plugged in\n");
}

TEST_F(DamagedLineTest, CommandsHaveTheirOwnNoise) {
  DamageOptions options = Noisy(0, {NoiseKind::kFlip});
  options.command_rate = 1;
  receiver.pieces = {{1, 2, 3}};
  DamagedLine line(options, receiver, &transcript);
  MemoryPort port(line);
  EXPECT_EQ(port.Read(10, 0), (Bytes{1, 2, 3}));
  port.Write("abc", 0);
  EXPECT_EQ(receiver.heard.size(), 3U);
  EXPECT_NE(ToText(receiver.heard), "abc");
  EXPECT_EQ(log.str().substr(0, log.str().find('\n')), "- noise flip at byte 0 to the receiver");
}

TEST_F(DamagedLineTest, AnEventCutsTheLineAtAByte) {
  DamagedLine line(With({LineEventKind::kUnplug, LineEventStart::kByte, 4, 2000}), receiver);
  MemoryPort port(line);
  receiver.pieces = {{1, 2, 3}, {4, 5, 6}, {7}};
  EXPECT_EQ(port.ReadFull(10, 0), (Bytes{1, 2, 3, 4}));
  port.Advance(1999);
  EXPECT_FALSE(line.plugged());
  port.Advance(1);
  EXPECT_TRUE(line.plugged());
  receiver.pieces = {{8, 9}};
  EXPECT_EQ(port.ReadFull(10, 0), (Bytes{8, 9}));
}

TEST_F(DamagedLineTest, ATimeCountsFromTheFirstByteOfAHost) {
  DamagedLine line(With({LineEventKind::kUnplug, LineEventStart::kTime, 1000, std::nullopt}),
                   receiver);
  MemoryPort port(line);
  port.Advance(5000);
  port.Write("a", 0);
  port.Advance(999);
  EXPECT_TRUE(line.plugged());
  port.Advance(1);
  EXPECT_FALSE(line.plugged());
  // For ever.
  port.Advance(100'000'000);
  EXPECT_FALSE(line.plugged());
}

TEST_F(DamagedLineTest, ASilenceLosesNothing) {
  DamagedLine line(With({LineEventKind::kSilence, LineEventStart::kByte, 1, 700}), receiver);
  MemoryPort port(line);
  receiver.pieces = {{1, 2, 3}};
  EXPECT_EQ(port.Read(10, 0), Bytes{1});
  port.Write("abc", 0);
  EXPECT_EQ(ToText(receiver.heard), "abc");
  EXPECT_EQ(port.Read(10, 1000), (Bytes{2, 3}));
  EXPECT_EQ(port.Now(), 700U);
}

TEST_F(DamagedLineTest, AnEventHappensOnce) {
  DamagedLine line(With({LineEventKind::kSilence, LineEventStart::kBlock, 2, 700}), receiver);
  MemoryPort port(line);
  receiver.block = 1;
  receiver.pieces = {{1}};
  EXPECT_EQ(port.Read(10, 0), Bytes{1});
  receiver.block = 2;
  receiver.pieces = {{2}};
  EXPECT_EQ(port.Read(10, 0), Bytes{});
  EXPECT_EQ(port.Read(10, 1000), Bytes{2});
  receiver.pieces = {{3}};
  EXPECT_EQ(port.Read(10, 0), Bytes{3});
}

TEST_F(DamagedLineTest, AnEventOfABlockLosesThatBlock) {
  QuorinReceiver quorin({}, OneFile(3000), &transcript);
  DamagedLine line(With({LineEventKind::kUnplug, LineEventStart::kBlock, 2, 1000}), quorin);
  MemoryPort port(line);
  port.Write("%1%get,\"A0101.log\":{500,512}\r\n", kHostSpeed);
  port.Read(SIZE_MAX, 10);
  port.Write(kNak, kHostSpeed);
  EXPECT_EQ(port.ReadFull(kBlockSize, 100).size(), kBlockSize);
  port.Write(kAck, kHostSpeed);
  EXPECT_EQ(port.ReadFull(kBlockSize, 100).size(), kBlockSize);
  port.Write(kAck, kHostSpeed);
  EXPECT_TRUE(port.ReadFull(kBlockSize, 999).empty());
  EXPECT_TRUE(port.Read(SIZE_MAX, 1).empty());
  // It comes when the host asks again.
  port.Write(kNak, kHostSpeed);
  EXPECT_EQ(SeenBlock(port.ReadFull(kBlockSize, 100)).field, 2U);
}

TEST_F(DamagedLineTest, AVelmarChunkIsABlock) {
  VelmarReceiver velmar({}, OneFile(5000), &transcript);
  DamagedLine line(With({LineEventKind::kUnplug, LineEventStart::kBlock, 1, std::nullopt}), velmar);
  MemoryPort port(line);
  port.Write("currentfile A0101.log all\r", kHostSpeed);
  port.Write("log filetransferb\r", kHostSpeed);
  const Bytes arrived = port.ReadFull(SIZE_MAX, 1000);
  EXPECT_EQ(arrived.size(), 2 * kAcknowledged + 28 + 8 + 1024 + 4);
}

}  // namespace
}  // namespace sim
