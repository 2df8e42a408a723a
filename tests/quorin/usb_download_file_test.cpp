// A whole download over USB: the commands around the block transfer.
#include <gtest/gtest.h>

#include <cstdint>
#include <initializer_list>
#include <string>

#include "tests/quorin/download_fixture.h"
#include "tests/quorin/simulated_download.h"

namespace {

class QuorinDownloadFileOverUsb : public QuorinDownloadTest {
 protected:
  QuorinDownloadFileOverUsb() { UseUsb(); }
};

TEST_F(QuorinDownloadFileOverUsb, GetsTheFileAtTheSpeedThatIs) {
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  ExpectSaid({kStart, kBlocks});
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::DownloadFile - receiver speed"));
}

TEST_F(QuorinDownloadFileOverUsb, DoesNotAskForASpeed) {
  connection->speed_result = E_HANDLE;
  EXPECT_EQ(Download(), S_OK);
}

TEST_F(QuorinDownloadFileOverUsb, ReportsItsStartAtOnce) {
  Download();
  ASSERT_GE(progress.percents.size(), 2U);
  EXPECT_EQ(progress.percents[0], 0);
  EXPECT_EQ(progress.percents[1], 1);
}

// Both the transfer and the driver send the end.
TEST_F(QuorinDownloadFileOverUsb, FailsWithTheStream) {
  stream.fail_at_write = 0;
  EXPECT_EQ(Download(), STG_E_MEDIUMFULL);
  ExpectSaid({kStart, {"#", "#"}});
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DownloadFile - download [A0101.log] is failed [0x80030070]"));
  EXPECT_TRUE(IsFreeForOthers(driver));
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
