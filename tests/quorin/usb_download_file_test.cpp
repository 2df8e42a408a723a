// A whole download over USB: what is said around the block transfer.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <initializer_list>
#include <string>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/download_fixture.h"
#include "tests/quorin/simulated_download.h"

namespace {

class QuorinDownloadFileOverUsb : public QuorinDownloadTest {
 protected:
  QuorinDownloadFileOverUsb() {
    connection->instance_type = eInstanceUSB;
    connection->speed = 0;
    connection->speed_result = S_FALSE;
    connection->set_speed_result = S_FALSE;
  }

  void ExpectFailure(HRESULT failure, std::initializer_list<std::vector<std::string>> said) {
    EXPECT_EQ(Download(), failure);
    ExpectSaid(said);
    char code[16] = {};
    std::snprintf(code, sizeof(code), "[0x%08X]", static_cast<unsigned>(failure));
    EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadFile - download [A0101.log] is failed " +
                           std::string(code)));
    EXPECT_TRUE(IsFreeForOthers(driver));
  }
};

TEST_F(QuorinDownloadFileOverUsb, GetsTheFileAtTheSpeedThatIs) {
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  ExpectSaid({kStart, kBlocks});
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::DownloadFile - receiver speed"));
}

// A speed of 0 would be one to raise.
TEST_F(QuorinDownloadFileOverUsb, DoesNotAskForASpeed) {
  connection->speed_result = E_HANDLE;
  EXPECT_EQ(Download(), S_OK);
}

TEST_F(QuorinDownloadFileOverUsb, StartsTheTransferOnAnEmptyLine) {
  Download();
  const auto& calls = connection->calls;
  const auto start = std::ranges::find(calls, "write \x15");
  ASSERT_NE(start, calls.end());
  EXPECT_EQ(*(start - 1), "flush");
  EXPECT_EQ(*(start + 1), "read 512 30000");
  EXPECT_EQ(*(start + 2), "read 6 30000");
  EXPECT_EQ(*(start + 3), "write \x06");
}

TEST_F(QuorinDownloadFileOverUsb, ReportsItsStartAtOnce) {
  Download();
  ASSERT_GE(progress.percents.size(), 2U);
  EXPECT_EQ(progress.percents[0], 0);
  EXPECT_EQ(progress.percents[1], 1);
}

TEST_F(QuorinDownloadFileOverUsb, FailsWithATransferThatStaysSilent) {
  receiver.On("\x15", [](const std::string&) {});
  ExpectFailure(kTimedOut, {kStart, {"\x15", "\x15", "\x15", "#"}});
}

TEST_F(QuorinDownloadFileOverUsb, FailsWithTheLink) {
  receiver.On("\x15", [this](const std::string&) {
    connection->GiveResult(static_cast<HRESULT>(0xE0001009));
  });
  ExpectFailure(static_cast<HRESULT>(0xE0001009), {kStart, {"#"}});
}

TEST_F(QuorinDownloadFileOverUsb, FailsWithALastBlockOfNegativeLength) {
  receiver.On("\x15", [this](const std::string&) {
    connection->GiveRead(BlockStream::Make(0x04, 0xFFFF, "", 0));
  });
  ExpectFailure(kNotConnected, {kStart, {"#"}});
}

// Both the transfer and what is around it say that it is over.
TEST_F(QuorinDownloadFileOverUsb, FailsWithTheStream) {
  stream.fail_at_write = 0;
  ExpectFailure(STG_E_MEDIUMFULL, {kStart, {"#", "#"}});
}

TEST_F(QuorinDownloadFileOverUsb, FailsWithAnAckThatCannotBeWritten) {
  receiver.FailWriteOf("\x06", E_HANDLE);
  ExpectFailure(E_HANDLE, {kStart, {"\x06", "#"}});
}

TEST_F(QuorinDownloadFileOverUsb, FailsWithAFileOfNegativeSize) {
  receiver.Reply("print,/log/A0101.log&size\r\n", "-5");
  ExpectFailure(E_INVALIDARG, {kStart, {"#"}});
}

TEST_F(QuorinDownloadFileOverUsb, IsNotDoneWhenTheReceiverEndsIt) {
  receiver.On("\x15", [this](const std::string&) {
    connection->GiveRead(BlockStream::Make(0x23, 0, "", 0));
  });
  EXPECT_EQ(Download(), S_FALSE);
  ExpectSaid({kStart});
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::DownloadFile - download"));
}

TEST_F(QuorinDownloadFileOverUsb, IsAbortedBetweenBlocks) {
  receiver.On("\x06", [this](const std::string&) { driver.Abort(); });
  EXPECT_EQ(Download(), S_FALSE);
  ExpectSaid({kStart, kBlocks});
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadOverUSB - download is cancelled"));
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::DownloadFile - download"));
}

// The simulated receiver.
TEST(QuorinDownloadFromTheSimulatorOverUsb, GetsFilesOfAllSizes) {
  for (const size_t size : std::initializer_list<size_t>{1, 511, 512, 513, 1024, 9999}) {
    for (const size_t piece_size : std::initializer_list<size_t>{0, 1, 64, 500}) {
      sim::QuorinOptions options;
      options.line.piece_size = piece_size;
      options.empty_last_block = true;
      SimulatedDownload download(options, size, 0);
      EXPECT_EQ(download.Run(), S_OK);
      EXPECT_TRUE(download.HasWholeFile()) << size << " in pieces of " << piece_size;
      EXPECT_EQ(download.CountInLog("rate,"), 0U);
      EXPECT_FALSE(download.receiver.in_transfer());
    }
  }
}

TEST(QuorinDownloadFromTheSimulatorOverUsb, EndsInOrderWithAStreamThatFails) {
  SimulatedDownload download({}, 2000, 0);
  download.stream.fail_at_write = 1;
  EXPECT_EQ(download.Run(), STG_E_MEDIUMFULL);
  EXPECT_FALSE(download.receiver.in_transfer());
  download.stream.fail_at_write = SIZE_MAX;
  download.stream.bytes.clear();
  EXPECT_EQ(download.Run(), S_OK);
  EXPECT_TRUE(download.HasWholeFile());
}

}  // namespace
