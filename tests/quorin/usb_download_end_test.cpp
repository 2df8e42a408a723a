// How a block transfer over USB ends early, and how far it says it is.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/timed_writes.h"
#include "tests/quorin/usb_download_fixture.h"
#include "tests/support/manual_clock.h"
#include "tests/support/report_capture.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr HRESULT kPositive = 2;  // no failure, and neither S_OK nor S_FALSE

class QuorinUsbDownloadEnd : public QuorinUsbDownloadTest {
 protected:
  // A block in its two pieces.
  void GiveInTwo(const std::string& block, const std::function<void()>& before_rest) {
    Give(block.substr(0, 512));
    connection->Give({S_OK, block.substr(512), before_rest});
  }
  std::string FirstBlock() { return blocks.Data(0, content.substr(0, 512)); }

  const ReportCapture report;
};

// Failures of the link.
TEST_F(QuorinUsbDownloadEnd, EndsWithAFailedRead) {
  connection->GiveResult(E_HANDLE);
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_THAT(connection->calls, ElementsAre(kFirstRead));
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST_F(QuorinUsbDownloadEnd, EndsWithAFailedReadOfTheRest) {
  Give(FirstBlock().substr(0, 512));
  connection->GiveResult(E_HANDLE);
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_THAT(connection->calls, ElementsAre(kFirstRead, kSecondRead));
}

TEST_F(QuorinUsbDownloadEnd, EndsWithAnErrorOfTheDriver) {
  connection->GiveResult(static_cast<HRESULT>(0xE0001009));
  EXPECT_EQ(Download(), static_cast<HRESULT>(0xE0001009));
}

TEST_F(QuorinUsbDownloadEnd, EndsWithAFailedAck) {
  GiveFile();
  connection->on_write = [](std::string_view bytes) { return bytes == "\x06" ? E_HANDLE : S_OK; };
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_EQ(Controls(), "\x06");
}

TEST_F(QuorinUsbDownloadEnd, SaysEachControlByteWhole) {
  std::string cut;
  connection->on_write = [&](std::string_view bytes) {
    if (!connection->wait_rule.shielded) cut += bytes;
    return S_OK;
  };
  connection->GiveResult(kTimedOut);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_EQ(cut, "");
}

TEST_F(QuorinUsbDownloadEnd, EndsAsTheAckDid) {
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

TEST_F(QuorinUsbDownloadEnd, EndsWithAFailedNak) {
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_EQ(Controls(), "\x15");
}

TEST_F(QuorinUsbDownloadEnd, EndsWithAFailedNakAfterAWrongBlock) {
  Give(BlockStream::Make(0x02, 0, "", 0x1111));
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_EQ(Controls(), "\x15");
}

TEST_F(QuorinUsbDownloadEnd, GoesOnThoughTheNakWasInterrupted) {
  connection->GiveResult(kTimedOut);
  GiveFile();
  connection->on_write = [](std::string_view bytes) { return bytes == "\x15" ? S_FALSE : S_OK; };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
}

TEST_F(QuorinUsbDownloadEnd, IsDoneThoughTheEndCannotBeWritten) {
  GiveFile();
  connection->on_write = [](std::string_view bytes) { return bytes == "#" ? E_HANDLE : S_OK; };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
}

// Reads that end without a failure, but not well.
TEST_F(QuorinUsbDownloadEnd, EndsAsTheReadDid) {
  connection->Give({kPositive, FirstBlock().substr(0, 512), {}});
  EXPECT_EQ(Download(), kPositive);
  EXPECT_THAT(connection->calls, ElementsAre(kFirstRead));
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST_F(QuorinUsbDownloadEnd, EndsAsTheReadOfTheRestDidWhateverIsWrongWithIt) {
  Give(FirstBlock().substr(0, 512));
  connection->Give({kPositive, std::string(6, '?'), {}});
  EXPECT_EQ(Download(), kPositive);
  EXPECT_EQ(Controls(), "");
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(report.Lines(), IsEmpty());
}

// The abort that ended the read is gone when another call has taken it.
TEST_F(QuorinUsbDownloadEnd, TellsTheReceiverWhenTheReadOfTheRestWasInterrupted) {
  Give(FirstBlock().substr(0, 512));
  connection->GiveResult(S_FALSE);
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
}

// What the header says comes first.
TEST_F(QuorinUsbDownloadEnd, IsEndedByTheReceiverHoweverTheReadEnded) {
  connection->Give({kPositive, "#", {}});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_THAT(report.Lines(), ElementsAre(kEndLine));
}

TEST_F(QuorinUsbDownloadEnd, AsksAgainForAWrongHeaderHoweverTheReadEnded) {
  connection->Give({kPositive, BlockStream::Make(0x02, 5, "", 0).substr(0, 512), {}});
  connection->Give({kPositive, BlockStream::Make(0x7F, 0, "", 0).substr(0, 512), {}});
  connection->GiveResult(S_FALSE);  // no header at all
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x15\x15\x06\x06#");
  EXPECT_THAT(report.Lines(), ElementsAre(kSequenceLine, kTypeLine, kTypeLine));
}

TEST_F(QuorinUsbDownloadEnd, FailsWithALastBlockOfNoLengthHoweverTheReadEnded) {
  connection->Give({kPositive, BlockStream::Make(0x04, 0xFFFF, "", 0).substr(0, 512), {}});
  EXPECT_EQ(Download(), kNotConnected);
}

// The host's stream.
TEST_F(QuorinUsbDownloadEnd, PassesAFailureOfTheStreamOn) {
  GiveFile();
  stream.fail_at_write = 1;
  EXPECT_EQ(Download(), static_cast<HRESULT>(0x80030070));
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_EQ(stream.writes, 2U);
  EXPECT_EQ(Controls(), "\x06#");
  EXPECT_THAT(
      report.Lines(),
      ElementsAre("CQuorinProtocol::DownloadOverUSB - write to stream failed [0x80030070]"));
}

TEST_F(QuorinUsbDownloadEnd, PassesAFailureOfTheStreamOnThoughTheEndCannotBeWritten) {
  GiveFile();
  stream.fail_at_write = 0;
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(Download(), STG_E_MEDIUMFULL);
}

TEST_F(QuorinUsbDownloadEnd, ReportsNoProgressOfAFailedStream) {
  ManualClock clock;
  connection->Give({S_OK, FirstBlock(), [&] { clock.now += 1000; }});
  stream.fail_at_write = 0;
  Download();
  EXPECT_THAT(progress.percents, IsEmpty());
}

TEST_F(QuorinUsbDownloadEnd, EndsAsTheStreamTookTheLastBlock) {
  GiveFile();
  stream.fail_at_write = 2;
  stream.failure = kPositive;
  EXPECT_EQ(Download(), kPositive);
  EXPECT_EQ(Controls(), "\x06\x06#");
}

TEST_F(QuorinUsbDownloadEnd, GoesOnWithAStreamThatIsNotQuiteContent) {
  GiveFile();
  stream.fail_at_write = 0;
  stream.failure = S_FALSE;
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(stream.writes, 3U);
  EXPECT_EQ(Controls(), "\x06\x06#");
}

// The abort.
TEST_F(QuorinUsbDownloadEnd, ReadsNothingAfterAnAbort) {
  driver.Abort();
  connection->calls.clear();
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_THAT(connection->calls, ElementsAre(kEndWrite));
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbCancelLine));
}

TEST_F(QuorinUsbDownloadEnd, IsAbortedWhileItWaitsForABlock) {
  connection->Give({S_FALSE, "", [this] { driver.Abort(); }});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbCancelLine));
}

TEST_F(QuorinUsbDownloadEnd, IsAbortedBetweenThePieces) {
  connection->Give({S_OK, FirstBlock().substr(0, 512), [this] { driver.Abort(); }});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_THAT(connection->calls, ElementsAre(kFirstRead, "cancel", kEndWrite));
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbCancelLine));
}

TEST_F(QuorinUsbDownloadEnd, IsAbortedThoughTheBlockCame) {
  GiveInTwo(FirstBlock(), [this] { driver.Abort(); });
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbCancelLine));
}

TEST_F(QuorinUsbDownloadEnd, IsAbortedThoughTheReadFailed) {
  for (const HRESULT failure : {kTimedOut, E_HANDLE}) {
    connection->Give({failure, "", [this] { driver.Abort(); }});
    EXPECT_EQ(Download(), S_FALSE);
  }
  EXPECT_EQ(Controls(), "##");
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbCancelLine, kUsbCancelLine));
}

TEST_F(QuorinUsbDownloadEnd, IsAbortedThoughTheReceiverEndsIt) {
  Give("#");
  connection->Give({S_OK, std::string(517, '\0'), [this] { driver.Abort(); }});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbCancelLine));
}

TEST_F(QuorinUsbDownloadEnd, IsAbortedFromItsProgress) {
  ManualClock clock;
  connection->Give({S_OK, FirstBlock(), [&] { clock.now += 501; }});
  progress.on_progress = [this](BYTE) { driver.Abort(); };
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_THAT(progress.percents, ElementsAre(47));
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbCancelLine));
}

TEST_F(QuorinUsbDownloadEnd, IsCompleteThoughItIsAbortedFromItsLastProgress) {
  ManualClock clock;
  connection->Give({S_OK, blocks.Last(content.substr(0, 100)), [&] { clock.now += 501; }});
  progress.on_progress = [this](BYTE) { driver.Abort(); };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(stream.bytes, content.substr(0, 100));
}

TEST_F(QuorinUsbDownloadEnd, IsAbortedWithItsAck) {
  GiveFile();
  connection->on_write = [this](std::string_view bytes) {
    if (bytes == "\x06") driver.Abort();
    return S_OK;
  };
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_EQ(Controls(), "\x06#");
  EXPECT_THAT(report.Lines(), ElementsAre(kUsbCancelLine));
}

TEST_F(QuorinUsbDownloadEnd, IsAbortedWithItsNak) {
  for (const HRESULT result : {S_OK, S_FALSE}) {
    connection->GiveResult(kTimedOut);
    connection->on_write = [=, this](std::string_view bytes) {
      if (bytes != "\x15") return S_OK;
      driver.Abort();
      return result;
    };
    EXPECT_EQ(Download(), S_FALSE);
  }
  EXPECT_EQ(Controls(), "\x15#\x15#");
}

TEST_F(QuorinUsbDownloadEnd, UsesTheAbortUp) {
  driver.Abort();
  EXPECT_EQ(Download(), S_FALSE);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
}

TEST_F(QuorinUsbDownloadEnd, GivesTheFailureOfTheEndAfterAnAbort) {
  driver.Abort();
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(Download(), E_HANDLE);
}

TEST_F(QuorinUsbDownloadEnd, SaysTheEndWhole) {
  std::vector<bool> shielded;
  connection->on_write = [&](std::string_view bytes) {
    if (bytes == "#") {
      shielded.push_back(connection->wait_rule.shielded);
    }
    return S_OK;
  };
  driver.Abort();
  Download();  // aborted
  GiveFile();
  Download();  // done
  blocks = BlockStream();
  GiveFile();
  stream.fail_at_write = 0;
  Download();  // failed
  EXPECT_THAT(shielded, ElementsAre(true, true, true));
  EXPECT_FALSE(connection->wait_rule.shielded);
}

TEST(QuorinUsbControlBytes, AreEachGivenThreeSeconds) {
  auto owned = std::make_unique<TimedWrites>();
  TimedWrites* const connection = owned.get();
  QuorinDriver driver(std::move(owned));
  MemoryStream stream;
  BlockStream blocks;
  connection->GiveResult(kTimedOut);
  connection->GiveRead(blocks.Data(0, ""));
  connection->GiveRead(blocks.Last(""));
  EXPECT_EQ(driver.DownloadOverUSB(&stream, 512, 512), S_OK);
  EXPECT_EQ(connection->Written(), "\x15\x06#");
  EXPECT_THAT(connection->timeouts, ElementsAre(3000, 3000, 3000));
}

// Progress: the time that a block takes is told, in milliseconds since the download began.
class QuorinUsbProgress : public QuorinUsbDownloadTest {
 protected:
  QuorinUsbProgress() { clock.now = 123456; }

  void GiveDataAt(DWORD ms) { GiveAt(ms, blocks.Data(sequence_++, "")); }
  void GiveLastAt(DWORD ms, size_t length = 0) {
    GiveAt(ms, blocks.Next(0x04, static_cast<uint16_t>(length), ""));
  }

  ManualClock clock;

 private:
  void GiveAt(DWORD ms, const std::string& block) {
    connection->Give({S_OK, block, [=, this] {
                        if (first_) start_ = clock.now;
                        first_ = false;
                        clock.now = start_ + ms;
                      }});
  }

  uint16_t sequence_ = 0;
  bool first_ = true;
  DWORD start_ = 0;
};

TEST_F(QuorinUsbProgress, IsReportedFromOneToAHundred) {
  GiveDataAt(501);
  GiveDataAt(1002);
  GiveLastAt(1503, 76);
  EXPECT_EQ(Download(1100), S_OK);
  // 512 * 99 / 1100 + 1, 1024 * 99 / 1100 + 1, 1100 * 99 / 1100 + 1
  EXPECT_THAT(progress.percents, ElementsAre(47, 93, 100));
}

TEST_F(QuorinUsbProgress, IsNotReportedWhenAllIsDoneAtOnce) {
  GiveDataAt(0);
  GiveDataAt(0);
  GiveLastAt(0, 76);
  EXPECT_EQ(Download(1100), S_OK);
  EXPECT_THAT(progress.percents, IsEmpty());
}

TEST_F(QuorinUsbProgress, IsNotReportedAtJustHalfASecond) {
  GiveDataAt(500);
  GiveLastAt(500, 76);
  Download(1100);
  EXPECT_THAT(progress.percents, IsEmpty());
}

TEST_F(QuorinUsbProgress, IsReportedAgainMoreThanHalfASecondAfterTheLastReport) {
  GiveDataAt(700);   // 10
  GiveDataAt(1200);  // 20, dropped
  GiveDataAt(1201);  // 30
  GiveDataAt(1300);  // 40, dropped
  GiveDataAt(1701);  // 50, dropped
  GiveDataAt(9999);  // 60
  GiveLastAt(9999);
  Download(512 * 11);
  EXPECT_THAT(progress.percents, ElementsAre(10, 28, 55));
}

// A percent that was not told in time is not made up for while it stays.
TEST_F(QuorinUsbProgress, IsDroppedNotDeferred) {
  GiveDataAt(100);   // 1.1: changed, too early
  GiveDataAt(600);   // 1.2: not changed
  GiveDataAt(1100);  // 1.3
  for (int i = 3; i < 10; ++i) GiveDataAt(1100);
  GiveDataAt(1200);  // 2.1
  GiveLastAt(5000);  // 2.1
  Download(512 * 1000);
  EXPECT_THAT(progress.percents, ElementsAre(2));
}

// Neither moves the time of the last report.
TEST_F(QuorinUsbProgress, IsPacedByReportsAlone) {
  GiveDataAt(300);  // dropped
  GiveDataAt(501);
  GiveLastAt(900);
  Download(1100);
  EXPECT_THAT(progress.percents, ElementsAre(93));
}

TEST_F(QuorinUsbProgress, IsPacedByChangesAlone) {
  GiveDataAt(100);                               // 1.1: changed, too early
  GiveDataAt(501);                               // not changed
  for (int i = 2; i < 10; ++i) GiveDataAt(502);  // not changed
  GiveDataAt(600);                               // 2.1
  GiveLastAt(600);
  Download(512 * 1000);
  EXPECT_THAT(progress.percents, ElementsAre(2));
}

TEST_F(QuorinUsbProgress, IsPacedThoughTheTicksWrap) {
  clock.now = 0xFFFFFF00;
  GiveDataAt(100);  // ahead of it: 10, dropped
  GiveDataAt(500);  // behind it: 20, dropped
  GiveDataAt(501);  // 30
  GiveLastAt(501);
  Download(512 * 11);
  EXPECT_THAT(progress.percents, ElementsAre(28));
}

TEST_F(QuorinUsbProgress, IsPacedFromTheStartOfEachDownload) {
  for (int i = 0; i < 2; ++i) {
    clock.now += 10000;
    blocks = BlockStream();
    Give(blocks.Last("x"));
    EXPECT_EQ(Download(1), S_OK);
  }
  EXPECT_THAT(progress.percents, IsEmpty());
}

TEST_F(QuorinUsbProgress, IsReportedOnceTheBytesAreInTheStream) {
  GiveDataAt(501);
  GiveDataAt(1002);
  GiveLastAt(1503, 76);
  std::vector<size_t> sizes;
  progress.on_progress = [&](BYTE) { sizes.push_back(stream.bytes.size()); };
  Download(1100);
  EXPECT_THAT(sizes, ElementsAre(512, 1024, 1100));
}

TEST_F(QuorinUsbProgress, IsAtLeastOne) {
  GiveLastAt(501);
  Download(1100);
  EXPECT_THAT(progress.percents, ElementsAre(1));
}

TEST_F(QuorinUsbProgress, IsOneForTheFirstBytesOfAHugeFile) {
  GiveDataAt(501);
  GiveDataAt(1002);
  GiveLastAt(1503);
  Download(0x7FFFFFFF);
  EXPECT_THAT(progress.percents, ElementsAre(1));
}

// Ninety-nine hundredths of what was delivered, never rounded up.
TEST_F(QuorinUsbProgress, IsTruncated) {
  GiveLastAt(501, 199);
  Download(200);  // 199 * 99 / 200 + 1 is 99.505
  EXPECT_THAT(progress.percents, ElementsAre(99));
}

TEST_F(QuorinUsbProgress, IsAHundredAtMostForMoreThanWasSaid) {
  GiveDataAt(501);
  GiveLastAt(1002, 512);
  Download(400);
  // 512 * 99 / 400 + 1 is 127, 1024 * 99 / 400 + 1 is 254.
  EXPECT_THAT(progress.percents, ElementsAre(100, 100));
}

TEST_F(QuorinUsbProgress, IsCutToEightBits) {
  GiveDataAt(501);
  GiveDataAt(1002);
  GiveDataAt(1503);
  GiveLastAt(1503);
  Download(190);
  // 512 * 99 / 190 + 1 is 267, 1024 * 99 / 190 + 1 is 534, 1536 * 99 / 190 + 1 is 801.
  EXPECT_THAT(progress.percents, ElementsAre(267 - 256, 534 - 512, 801 - 768));
}

TEST_F(QuorinUsbProgress, IsCutToEightBitsHoweverLittleWasSaid) {
  GiveDataAt(501);
  GiveDataAt(1002);
  GiveLastAt(1503);
  Download(1);
  // 512 * 99 + 1 is 198 * 256 + 1; 1024 * 99 + 1 is 396 * 256 + 1: no change.
  EXPECT_THAT(progress.percents, ElementsAre(1));
}

// The most that can be delivered: the sequence numbers end there.
TEST_F(QuorinUsbProgress, DoesNotWrapInTheLargestTransfer) {
  uint32_t accepted = 0;
  connection->on_write = [&](std::string_view) {
    connection->calls.clear();
    clock.now += 501;
    ++accepted;
    Give(accepted <= 0xFFFF ? blocks.Data(static_cast<uint16_t>(accepted), "") : blocks.Last(""));
    return S_OK;
  };
  Give(blocks.Data(0, ""));
  EXPECT_EQ(Download(65536 * 512), S_OK);
  ASSERT_EQ(progress.percents.size(), 99U);  // the first was too early
  for (int i = 0; i < 99; ++i) EXPECT_EQ(progress.percents[static_cast<size_t>(i)], i + 2);
}

}  // namespace
