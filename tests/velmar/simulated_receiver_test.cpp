// The driver with the simulated receiver, which answers like a real one: in pieces, late, or
// wrongly.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <vector>

#include "platform/hresult.h"
#include "platform/text.h"
#include "simulator/velmar/receiver.h"
#include "tests/support/content.h"
#include "tests/support/simulated_connection.h"
#include "tests/support/simulated_driver.h"
#include "velmar/velmar_protocol.h"

using rcvlink::UniqueBstr;

namespace {

using testing::ElementsAre;

// The receiver serves "A.log" and "B.log".
struct Bench : SimulatedDriver<CVelmarProtocol, sim::VelmarReceiver, SimulatedConnection>,
               CIProtocolCallback {
  explicit Bench(const sim::VelmarOptions& options, size_t size = 3000, DWORD host_speed = 9600)
      : SimulatedDriver(options, Files(Content(size)), host_speed), content(Content(size)) {
    driver.SetCallback(this);
  }

  static sim::FileStore Files(const std::string& bytes) {
    sim::FileStore files;
    files.Add("A.log", sim::ToBytes(bytes), 600000000);
    files.Add("B.log", sim::ToBytes("second"), 700000000);
    return files;
  }
  void OnProgress(BYTE percent) override { percents.push_back(percent); }

  HRESULT Download(const wchar_t* name = L"A.log") {
    return driver.DownloadFile(name, &stream, nullptr);
  }
  bool HasWholeFile() const { return stream.bytes == content; }
  bool IsFound() {
    short answer = 99;
    EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
    return answer == VARIANT_TRUE;
  }

  const std::string content;
  std::vector<int> percents;
};

sim::VelmarOptions WithFault(const sim::VelmarReplyFault& fault) {
  sim::VelmarOptions options;
  options.faults.replies = {fault};
  return options;
}

sim::VelmarOptions WithFault(const sim::VelmarChunkFault& fault) {
  sim::VelmarOptions options;
  options.faults.chunks = {fault};
  return options;
}

TEST(VelmarSimulatedReceiver, DoesAllInPiecesOfAnySize) {
  for (const size_t piece_size : std::initializer_list<size_t>{0, 1, 2, 3, 7, 64, 1000}) {
    SCOPED_TRACE(piece_size);
    sim::VelmarOptions options;
    options.line.piece_size = piece_size;
    options.line.paced = piece_size != 0;
    Bench bench(options);
    EXPECT_TRUE(bench.IsFound()) << bench.log.str();
    CReceiverInfo info{};
    EXPECT_EQ(bench.driver.GetReceiverInfo(nullptr, &info), S_OK);
    EXPECT_STREQ(info.bstrReceiverId, L"VM00731");
    EXPECT_STREQ(info.bstrModel, L"VR4-L1L2");
    SysFreeString(info.bstrReceiverId);
    SysFreeString(info.bstrModel);
    CFileList files;
    EXPECT_EQ(bench.driver.GetFiles(&files), S_OK);
    ASSERT_EQ(files.Count(), 2);
    EXPECT_STREQ(files.At(0).bstrName, L"A.log");
    EXPECT_EQ(files.At(0).dwSize, 3000u);
    EXPECT_STREQ(files.At(1).bstrName, L"B.log");
    EXPECT_EQ(bench.Download(), S_OK);
    EXPECT_TRUE(bench.HasWholeFile());
    EXPECT_EQ(bench.connection->Speed(), 9600u);
    EXPECT_EQ(bench.receiver.speed(), 9600u);
    EXPECT_EQ(bench.driver.DeleteFile(L"A.log"), S_OK);
    EXPECT_EQ(bench.driver.RenameFile(L"B.log", L"C.log"), S_OK);
    CFileList rest;
    EXPECT_EQ(bench.driver.GetFiles(&rest), S_OK);
    ASSERT_EQ(rest.Count(), 1);
    EXPECT_STREQ(rest.At(0).bstrName, L"C.log");
  }
}

TEST(VelmarSimulatedReceiver, IsNotFoundAtAnotherSpeed) {
  for (const bool garbled : {false, true}) {
    sim::VelmarOptions options;
    options.line.speed = 57600;
    options.line.garbled = garbled;
    Bench bench(options);
    EXPECT_FALSE(bench.IsFound());
  }
}

TEST(VelmarSimulatedReceiver, IsFoundInTheMiddleOfATransfer) {
  sim::VelmarOptions options;
  options.line.paced = true;
  Bench bench(options, 100000);
  constexpr std::string_view kStart = "currentfile A.log all\rlog filetransferb\r";
  bench.connection->Write(kStart.data(), static_cast<DWORD>(kStart.size()), 500);
  ASSERT_TRUE(bench.receiver.in_transfer());
  // Bytes of the log come before the answer, the first time.
  bench.IsFound();
  EXPECT_FALSE(bench.receiver.in_transfer());
  EXPECT_TRUE(bench.IsFound());
}

TEST(VelmarSimulatedReceiver, TakesItsPortSettings) {
  Bench bench({});
  EXPECT_EQ(bench.driver.DCSetRcvParity(1), S_OK);
  EXPECT_EQ(bench.driver.DCSetRcvStopbits(2), S_OK);
  EXPECT_EQ(bench.driver.DCSetRcvBaudrate(57600), S_OK);
  EXPECT_EQ(bench.receiver.speed(), 57600u);
  EXPECT_NE(bench.log.str().find("> COM 57600 E 8 2 N\\r\n"), std::string::npos);
}

TEST(VelmarSimulatedReceiver, ThatHidesItsPortKeepsItsSpeed) {
  sim::VelmarOptions options;
  options.faults.hides_own_port = true;
  Bench bench(options);
  EXPECT_EQ(bench.driver.DCSetRcvBaudrate(57600), S_OK);
  EXPECT_EQ(bench.receiver.speed(), 9600u);
  EXPECT_EQ(bench.log.str().find("> COM "), std::string::npos);
  EXPECT_EQ(bench.Download(), S_OK);
  EXPECT_TRUE(bench.HasWholeFile());
}

TEST(VelmarSimulatedReceiver, WhoseDirectoryHasAGapIsListedAsFarAsItGoes) {
  Bench bench(WithFault({.kind = sim::VelmarReplyFaultKind::kSequenceGap,
                         .command = "log direnta",
                         .times = sim::kAlways,
                         .amount = 1}));
  CFileList files;
  EXPECT_EQ(bench.driver.GetFiles(&files), S_OK);
  EXPECT_EQ(files.Count(), 2);
}

TEST(VelmarSimulatedReceiver, WhoseDirectoryNeverEndsIsListedAfterTheTimeOut) {
  Bench bench(WithFault({.kind = sim::VelmarReplyFaultKind::kSequenceOpen,
                         .command = "log direnta",
                         .times = sim::kAlways,
                         .amount = 0}));
  CFileList files;
  EXPECT_EQ(bench.driver.GetFiles(&files), S_OK);
  EXPECT_EQ(files.Count(), 2);
  EXPECT_GE(bench.connection->Now(), 30000u);
}

struct Answer {
  sim::VelmarReplyFaultKind kind;
  int64_t amount;
  HRESULT result;
};

// What GetReceiverInfo makes of each.
TEST(VelmarSimulatedReceiver, WhoseVersionIsSpoiled) {
  using Kind = sim::VelmarReplyFaultKind;
  for (const Answer& answer : {Answer{Kind::kRefused, 0, S_FALSE},
                               Answer{Kind::kRefusedBare, 0, S_FALSE},
                               Answer{Kind::kMute, 0, S_FALSE},
                               Answer{Kind::kSilence, 29000, S_OK},
                               Answer{Kind::kSilence, 31000, S_FALSE},
                               Answer{Kind::kLatePrompt, 29000, S_OK},
                               Answer{Kind::kLateLog, 29000, S_OK},
                               Answer{Kind::kLateLog, 30900, S_OK},  // after the last byte
                               Answer{Kind::kLateLog, 31100, S_FALSE},
                               Answer{Kind::kGarbageBefore, 1, S_FALSE},
                               Answer{Kind::kGarbageBefore, 20000, S_FALSE},
                               Answer{Kind::kEndlessPrompt, 3000000, S_FALSE},
                               Answer{Kind::kLineEndAfterPrompt, 0, S_FALSE},
                               Answer{Kind::kAbbreviatedLog, 0, E_NOTIMPL},
                               Answer{Kind::kDamagedCrc, 0, S_OK},
                               Answer{Kind::kCount, 0, S_OK},
                               Answer{Kind::kCount, -1, S_OK},
                               Answer{Kind::kCount, -2147483648LL, S_OK}}) {
    SCOPED_TRACE(testing::Message() << static_cast<int>(answer.kind) << " " << answer.amount);
    Bench bench(WithFault({.kind = answer.kind,
                           .command = "log versiona",
                           .times = sim::kAlways,
                           .amount = answer.amount}));
    CReceiverInfo info{};
    EXPECT_EQ(bench.driver.GetReceiverInfo(nullptr, &info), answer.result) << bench.log.str();
    const UniqueBstr id(info.bstrReceiverId);
    const UniqueBstr model(info.bstrModel);
    EXPECT_EQ(info.bstrModel != nullptr, answer.result == S_OK);
    bench.IsFound();  // a late answer may be taken for its own, but only once
    EXPECT_TRUE(bench.IsFound());
  }
}

// Missing fields do not change the result: they are empty.
TEST(VelmarSimulatedReceiver, WhoseVersionIsCutHasAnEmptyIdentity) {
  using Kind = sim::VelmarReplyFaultKind;
  for (const Answer& answer : {Answer{Kind::kOpenQuotes, 0, S_OK},
                               Answer{Kind::kFewerFields, 5, S_OK},
                               Answer{Kind::kCount, 2147483647, S_OK}}) {
    SCOPED_TRACE(static_cast<int>(answer.kind));
    Bench bench(WithFault({.kind = answer.kind,
                           .command = "log versiona",
                           .times = sim::kAlways,
                           .amount = answer.amount}));
    CReceiverInfo info{};
    EXPECT_EQ(bench.driver.GetReceiverInfo(nullptr, &info), answer.result) << bench.log.str();
    const UniqueBstr id(info.bstrReceiverId);
    const UniqueBstr model(info.bstrModel);
    EXPECT_STREQ(info.bstrModel, L"");
    EXPECT_GE(bench.connection->Now(), 30000u);
  }
}

TEST(VelmarSimulatedReceiver, SendsAFileAtFullSpeed) {
  sim::VelmarOptions options;
  options.line.paced = true;
  Bench bench(options, 30720);
  EXPECT_EQ(bench.Download(), S_OK);
  EXPECT_TRUE(bench.HasWholeFile());
  // At 9600 it would have taken half a minute.
  EXPECT_LT(bench.connection->Now(), 15000u);
}

// Files of each length: some end in a chunk that is too short to be accepted, and no result shows
// that it is missing.
TEST(VelmarSimulatedReceiver, FilesOfAnyLength) {
  for (const size_t size : std::initializer_list<size_t>{
           0, 1, 3, 4, 5, 1023, 1024, 1025, 1027, 1028, 2048, 8192, 9000}) {
    SCOPED_TRACE(size);
    sim::VelmarOptions fast;
    fast.line.speed = 115200;
    Bench link(fast, size, 115200);
    EXPECT_EQ(link.Download(), S_OK);
    const size_t last = size % 1024;
    const bool lost = last < 4 && (last != 0 || size == 0);
    EXPECT_EQ(link.stream.bytes, link.content.substr(0, lost ? size - last : size));
    EXPECT_EQ(link.connection->Now() >= 30000, lost);
    EXPECT_EQ(link.percents.back(), 100);
  }
}

TEST(VelmarSimulatedReceiver, WithAWrongSizeStillSendsTheFile) {
  for (const uint32_t told : {0u, 1u, 1000000u}) {
    sim::VelmarOptions options;
    options.faults.sizes = {{"A.log", told}};
    Bench bench(options);
    EXPECT_EQ(bench.Download(), S_OK);
    EXPECT_TRUE(bench.HasWholeFile()) << told;
  }
}

// Only its first byte, its lengths and its number are checked.
TEST(VelmarSimulatedReceiver, DamagedChunksAreTakenAsTheyAre) {
  using Kind = sim::VelmarChunkFaultKind;
  for (const Kind kind : {Kind::kDamagedCrc, Kind::kWrongSync}) {
    for (const uint32_t chunk : {0u, 1u, 2u}) {
      Bench bench(WithFault({.kind = kind, .chunk = chunk, .times = 1, .amount = 0}));
      EXPECT_EQ(bench.Download(), S_OK);
      EXPECT_TRUE(bench.HasWholeFile());
    }
  }
}

// Whatever its lengths are, the download ends, the speed is the old one, and the next download is
// complete.
TEST(VelmarSimulatedReceiver, WithWrongLengthsIsLeftInOrder) {
  using Kind = sim::VelmarChunkFaultKind;
  for (const Kind kind : {Kind::kMessageLength, Kind::kBodyLength, Kind::kHeaderLength}) {
    for (const uint32_t amount : {0u, 1u, 7u, 8u, 255u, 1033u, 65535u}) {
      for (const uint32_t chunk : {0u, 1u, 2u}) {
        if (kind == Kind::kHeaderLength && amount > 255) continue;
        SCOPED_TRACE(testing::Message() << static_cast<int>(kind) << " " << amount << " " << chunk);
        Bench bench(WithFault({.kind = kind, .chunk = chunk, .times = 1, .amount = amount}));
        bench.Download();
        EXPECT_EQ(bench.connection->Speed(), 9600u) << bench.log.str();
        EXPECT_EQ(bench.receiver.speed(), 9600u) << bench.log.str();
        bench.stream.bytes.clear();
        EXPECT_EQ(bench.Download(), S_OK);
        EXPECT_TRUE(bench.HasWholeFile()) << bench.log.str();
      }
    }
  }
}

TEST(VelmarSimulatedReceiver, WhoseNumbersNeverEndIsWaitedFor) {
  sim::VelmarOptions options;
  options.faults.endless_sequence = true;
  Bench bench(options);
  EXPECT_EQ(bench.Download(), S_OK);
  EXPECT_TRUE(bench.HasWholeFile());
  EXPECT_GE(bench.connection->Now(), 30000u);
  EXPECT_EQ(bench.receiver.speed(), 9600u);
}

TEST(VelmarSimulatedReceiver, AChunkThatComesLateIsWaitedFor) {
  for (const uint32_t chunk : {0u, 1u, 2u}) {
    Bench bench(WithFault({.kind = sim::VelmarChunkFaultKind::kSilence,
                           .chunk = chunk,
                           .times = 1,
                           .amount = 29000}));
    EXPECT_EQ(bench.Download(), S_OK);
    EXPECT_TRUE(bench.HasWholeFile());
  }
}

TEST(VelmarSimulatedReceiver, WhichVanishesEndsTheDownloadWithWhatCame) {
  sim::VelmarOptions options;
  options.faults.vanish_after_chunk = 1;
  Bench bench(options);
  EXPECT_EQ(bench.Download(), S_OK);
  EXPECT_EQ(bench.stream.bytes, bench.content.substr(0, 2048));
  EXPECT_EQ(bench.connection->Speed(), 9600u);
}

TEST(VelmarSimulatedReceiver, ThatKeepsItsSpeedIsLost) {
  sim::VelmarOptions options;
  options.faults.keeps_speed = true;
  Bench bench(options);
  EXPECT_EQ(bench.Download(), S_OK);
  EXPECT_TRUE(bench.stream.bytes.empty());  // it acknowledged, so the host changed its speed alone
  EXPECT_EQ(bench.connection->Speed(), 9600u);
  EXPECT_TRUE(bench.IsFound());
}

TEST(VelmarSimulatedReceiver, ThatRefusesTheSpeedSendsAtTheOldOne) {
  for (const auto kind :
       {sim::VelmarReplyFaultKind::kRefused, sim::VelmarReplyFaultKind::kRefusedBare}) {
    Bench bench(WithFault({.kind = kind, .command = "COM", .times = sim::kAlways, .amount = 0}));
    EXPECT_EQ(bench.Download(), S_OK);
    EXPECT_TRUE(bench.HasWholeFile());
    EXPECT_EQ(bench.connection->Speed(), 9600u);
  }
}

}  // namespace
