// How a block transfer ends early, as far as both links agree.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/block_download_fixture.h"

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

namespace {

class QuorinBlockDownloadEnd : public QuorinBothLinksTest {
 protected:
  // More than half a second after the block before it, so that USB reports progress.
  void GiveLate(const std::string& block) {
    connection->Give({S_OK, block, [this] { clock.now += 501; }});
  }
};

INSTANTIATE_TEST_SUITE_P(Over, QuorinBlockDownloadEnd, BothLinks(), LinkName);

// Failures of the link.
TEST_P(QuorinBlockDownloadEnd, EndsWithAFailedRead) {
  for (const HRESULT failure : {E_HANDLE, static_cast<HRESULT>(0xE0001009)}) {
    connection->calls.clear();
    connection->GiveResult(failure);
    EXPECT_EQ(Download(), failure);
    EXPECT_THAT(connection->calls, ElementsAre(link.first_read));
    EXPECT_THAT(report.Lines(), IsEmpty());
  }
}

TEST_P(QuorinBlockDownloadEnd, EndsWithAFailedReadOfTheRest) {
  Give(FirstBlock().substr(0, link.first_size));
  connection->GiveResult(E_HANDLE);
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_THAT(connection->calls, ElementsAreArray(BlockReads()));
}

TEST_P(QuorinBlockDownloadEnd, AsksAgainAfterAReadThatWasInterruptedWithoutAnAbort) {
  connection->GiveResult(S_FALSE);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_THAT(report.Lines(), ElementsAreArray(Why({kTypeText})));
}

TEST_P(QuorinBlockDownloadEnd, EndsWithAFailedAck) {
  GiveFile();
  connection->on_write = [](std::string_view bytes) { return bytes == "\x06" ? E_HANDLE : S_OK; };
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_EQ(Controls(), "\x06");
}

TEST_P(QuorinBlockDownloadEnd, EndsWithAFailedNak) {
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_EQ(Controls(), "\x15");
}

TEST_P(QuorinBlockDownloadEnd, EndsWithAFailedNakAfterAWrongBlock) {
  Give(BlockStream::Make(0x02, 0, "", 0x1111));
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_EQ(Controls(), "\x15");
}

TEST_P(QuorinBlockDownloadEnd, GoesOnThoughTheNakWasInterrupted) {
  GiveSilences(1);
  GiveFile();
  connection->on_write = [](std::string_view bytes) { return bytes == "\x15" ? S_FALSE : S_OK; };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
}

TEST_P(QuorinBlockDownloadEnd, IsDoneThoughTheEndCannotBeWritten) {
  GiveFile();
  connection->on_write = [](std::string_view bytes) { return bytes == "#" ? E_HANDLE : S_OK; };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
}

TEST_P(QuorinBlockDownloadEnd, SendsEachControlByteWhole) {
  std::string cut;
  connection->on_write = [&](std::string_view bytes) {
    if (!connection->wait_rule.shielded) cut += bytes;
    return S_OK;
  };
  GiveSilences(1);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(Controls(), "\x15\x06\x06#");
  EXPECT_EQ(cut, "");
}

TEST_P(QuorinBlockDownloadEnd, GivesEachControlByteThreeSeconds) {
  GiveSilences(1);
  Give(blocks.Data(0, ""));
  Give(blocks.Last(""));
  EXPECT_EQ(Download(512), S_OK);
  EXPECT_EQ(Controls(), "\x15\x06#");
  EXPECT_THAT(connection->write_timeouts, ElementsAre(3000, 3000, 3000));
}

// The result of a failed stream differs between the links, but the receiver is always sent the end.
TEST_P(QuorinBlockDownloadEnd, SendsTheReceiverTheEndAfterAFailedStream) {
  GiveFile();
  stream.fail_at_write = 1;
  Download();
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_EQ(stream.writes, 2U);
  EXPECT_EQ(Controls(), "\x06#");
}

TEST_P(QuorinBlockDownloadEnd, ReportsNoProgressAfterAFailedStream) {
  GiveLate(FirstBlock());
  stream.fail_at_write = 0;
  Download();
  EXPECT_THAT(progress.percents, IsEmpty());
}

// The abort.
TEST_P(QuorinBlockDownloadEnd, ReadsNothingAfterAnAbort) {
  driver.Abort();
  connection->calls.clear();
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_THAT(connection->calls, ElementsAre(kEndWrite));
  EXPECT_THAT(report.Lines(), ElementsAre(CancelLine()));
}

TEST_P(QuorinBlockDownloadEnd, IsAbortedWhileItWaitsForABlock) {
  connection->Give({S_FALSE, "", [this] { driver.Abort(); }});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_THAT(report.Lines(), ElementsAre(CancelLine()));
}

TEST_P(QuorinBlockDownloadEnd, IsAbortedBetweenTheReads) {
  connection->Give({S_OK, FirstBlock().substr(0, link.first_size), [this] { driver.Abort(); }});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_THAT(connection->calls, ElementsAre(link.first_read, "cancel", kEndWrite));
  EXPECT_THAT(report.Lines(), ElementsAre(CancelLine()));
}

TEST_P(QuorinBlockDownloadEnd, IsAbortedThoughTheReceiverEndsIt) {
  const std::string end = "#" + std::string(link.header_size - 1, '\0');
  connection->Give({S_OK, end, [this] { driver.Abort(); }});
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_THAT(report.Lines(), ElementsAre(CancelLine()));
}

TEST_P(QuorinBlockDownloadEnd, IsAbortedFromItsProgress) {
  GiveLate(FirstBlock());
  progress.on_progress = [this](BYTE) { driver.Abort(); };
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_THAT(progress.percents, ElementsAre(47));
  EXPECT_THAT(report.Lines(), ElementsAre(CancelLine()));
}

TEST_P(QuorinBlockDownloadEnd, IsCompleteThoughItIsAbortedFromItsLastProgress) {
  GiveLate(blocks.Last(content.substr(0, 100)));
  progress.on_progress = [this](BYTE) { driver.Abort(); };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(Controls(), "#");
  EXPECT_EQ(stream.bytes, content.substr(0, 100));
}

TEST_P(QuorinBlockDownloadEnd, IsAbortedWithItsAck) {
  GiveFile();
  connection->on_write = [this](std::string_view bytes) {
    if (bytes == "\x06") driver.Abort();
    return S_OK;
  };
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
  EXPECT_EQ(Controls(), "\x06#");
  EXPECT_THAT(report.Lines(), ElementsAre(CancelLine()));
}

TEST_P(QuorinBlockDownloadEnd, IsAbortedWithItsNak) {
  for (const HRESULT result : {S_OK, S_FALSE}) {
    GiveSilences(1);
    connection->on_write = [=, this](std::string_view bytes) {
      if (bytes != "\x15") return S_OK;
      driver.Abort();
      return result;
    };
    EXPECT_EQ(Download(), S_FALSE);
  }
  EXPECT_EQ(Controls(), "\x15#\x15#");
}

TEST_P(QuorinBlockDownloadEnd, ClearsTheAbort) {
  driver.Abort();
  EXPECT_EQ(Download(), S_FALSE);
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
}

TEST_P(QuorinBlockDownloadEnd, GivesTheFailureOfTheEndAfterAnAbort) {
  driver.Abort();
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(Download(), E_HANDLE);
}

TEST_P(QuorinBlockDownloadEnd, SendsTheEndWhole) {
  std::vector<bool> shielded;
  connection->on_write = [&](std::string_view bytes) {
    if (bytes == "#") shielded.push_back(connection->wait_rule.shielded);
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

}  // namespace
