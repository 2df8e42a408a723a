// How a block transfer over a serial link ends early, and how far it says it is.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/serial_download_fixture.h"
#include "tests/quorin/timed_writes.h"
#include "tests/support/report_capture.h"

using testing::Contains;
using testing::ElementsAre;
using testing::Not;

namespace {

class QuorinSerialDownloadEnd : public QuorinSerialDownloadTest {};

// Failures of the link.
TEST_F(QuorinSerialDownloadEnd, EndsWithAFailedRead) {
  connection->GiveResult(E_HANDLE);
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_THAT(connection->calls, ElementsAre(kHeaderRead));
}

TEST_F(QuorinSerialDownloadEnd, EndsWithAFailedReadOfTheRest) {
  Give(blocks.Data(0, "").substr(0, 3));
  connection->GiveResult(E_HANDLE);
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_THAT(connection->calls, ElementsAre(kHeaderRead, kRestRead));
}

TEST_F(QuorinSerialDownloadEnd, AsksAgainAfterAReadThatWasInterruptedWithoutAnAbort) {
  connection->GiveResult(S_FALSE);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
}

TEST_F(QuorinSerialDownloadEnd, EndsWithAFailedAck) {
  GiveFile();
  connection->on_write = [](std::string_view bytes) { return bytes == "\x06" ? E_HANDLE : S_OK; };
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_EQ(Controls(), "\x06");
}

TEST_F(QuorinSerialDownloadEnd, SaysEachControlByteWhole) {
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

TEST_F(QuorinSerialDownloadEnd, EndsWithoutAFailureWhenTheAckWasInterrupted) {
  GiveFile();
  connection->on_write = [](std::string_view) { return S_FALSE; };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(Controls(), "\x06");
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
}

TEST_F(QuorinSerialDownloadEnd, EndsWithAFailedNak) {
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_EQ(Controls(), "\x15");
}

TEST_F(QuorinSerialDownloadEnd, IsDoneThoughTheEndCannotBeWritten) {
  GiveFile();
  connection->on_write = [](std::string_view bytes) { return bytes == "#" ? E_HANDLE : S_OK; };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
}

TEST_F(QuorinSerialDownloadEnd, KeepsAFailureOfTheStreamToItself) {
  GiveFile();
  stream.fail_at_write = 1;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_EQ(stream.writes, 2U);
  EXPECT_EQ(Controls(), "\x06#");
}

// The abort.
TEST_F(QuorinSerialDownloadEnd, ReadsNothingAfterAnAbort) {
  const ReportCapture report;
  driver.Abort();
  connection->calls.clear();
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(Reads(), 0U);
  EXPECT_THAT(report.Lines(), ElementsAre(kCancelLine));
}

TEST_F(QuorinSerialDownloadEnd, IsAbortedWhileItWaitsForABlock) {
  const ReportCapture report;
  connection->Give({S_FALSE, "", [this] { driver.Abort(); }});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_TRUE(report.Has(kCancelLine));
}

TEST_F(QuorinSerialDownloadEnd, IsAbortedThoughTheHeaderCame) {
  connection->Give({S_OK, blocks.Data(0, "").substr(0, 3), [this] { driver.Abort(); }});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_THAT(connection->calls, Not(Contains(kRestRead)));
}

TEST_F(QuorinSerialDownloadEnd, IsAbortedThoughTheBlockCame) {
  GiveInTwo(blocks.Data(0, content.substr(0, 512)), [this] { driver.Abort(); });
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
}

TEST_F(QuorinSerialDownloadEnd, IsAbortedFromItsProgress) {
  GiveFile();
  progress.on_progress = [this](BYTE) { driver.Abort(); };
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_THAT(progress.percents, ElementsAre(47));
}

TEST_F(QuorinSerialDownloadEnd, IsCompleteThoughTheAbortCameWithTheLastBlock) {
  GiveInTwo(blocks.Last(content.substr(0, 100)), [this] { driver.Abort(); });
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(stream.bytes, content.substr(0, 100));
}

TEST_F(QuorinSerialDownloadEnd, GivesTheFailureOfTheEndAfterAnAbort) {
  driver.Abort();
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(Download(), E_HANDLE);
}

TEST_F(QuorinSerialDownloadEnd, SaysTheEndWholeAfterAnAbort) {
  bool shielded = false;
  connection->on_write = [&](std::string_view) {
    shielded = connection->wait_rule.shielded;
    return S_OK;
  };
  driver.Abort();
  Download();
  EXPECT_TRUE(shielded);
  EXPECT_FALSE(connection->wait_rule.shielded);
}

TEST(QuorinControlBytes, AreEachGivenThreeSeconds) {
  auto owned = std::make_unique<TimedWrites>();
  TimedWrites* const connection = owned.get();
  QuorinDriver driver(std::move(owned));
  MemoryStream stream;
  BlockStream blocks;
  connection->GiveRead("?");
  connection->GiveRead(blocks.Data(0, ""));
  connection->GiveRead(blocks.Last(""));
  EXPECT_EQ(driver.DownloadOverSerial(&stream, 512), S_OK);
  EXPECT_EQ(connection->Written(), "\x15\x06#");
  EXPECT_THAT(connection->timeouts, ElementsAre(3000, 3000, 3000));
}

// Progress.
TEST_F(QuorinSerialDownloadEnd, ReportsProgressFromOneToAHundred) {
  GiveFile();
  Download(1100);
  // 512 * 99 / 1100 + 1, 1024 * 99 / 1100 + 1, 1100 * 99 / 1100 + 1
  EXPECT_THAT(progress.percents, ElementsAre(47, 93, 100));
}

TEST_F(QuorinSerialDownloadEnd, ReportsEachPercentOnce) {
  // A hundred blocks of a file that is said to be ten times as large.
  for (uint16_t i = 0; i < 100; ++i) Give(blocks.Data(i, ""));
  Give(blocks.Last(""));
  Download(512 * 1000);
  EXPECT_THAT(progress.percents, ElementsAre(1, 2, 3, 4, 5, 6, 7, 8, 9, 10));
}

TEST_F(QuorinSerialDownloadEnd, ReportsTheFirstPercentAlsoForNothing) {
  Give(blocks.Last(""));
  Download();
  EXPECT_THAT(progress.percents, ElementsAre(1));
}

TEST_F(QuorinSerialDownloadEnd, ReportsAHundredAtMostForMoreThanWasSaid) {
  Give(blocks.Data(0, ""));
  Give(blocks.Last(content.substr(0, 512)));
  Download(400);
  // 512 * 99 / 400 + 1 is 127, 1024 * 99 / 400 + 1 is 254.
  EXPECT_THAT(progress.percents, ElementsAre(100, 100));
}

TEST_F(QuorinSerialDownloadEnd, CutsThePercentToEightBits) {
  Give(blocks.Data(0, ""));
  Give(blocks.Data(1, ""));
  Give(blocks.Last(""));
  Download(190);
  // 512 * 99 / 190 + 1 is 267, 1024 * 99 / 190 + 1 is 534.
  EXPECT_THAT(progress.percents, ElementsAre(267 - 256, 534 - 512));
}

TEST_F(QuorinSerialDownloadEnd, ReportsProgressOnceTheBytesAreInTheStream) {
  GiveFile();
  std::vector<size_t> sizes;
  progress.on_progress = [&](BYTE) { sizes.push_back(stream.bytes.size()); };
  Download();
  EXPECT_THAT(sizes, ElementsAre(512, 1024, 1100));
}

}  // namespace
