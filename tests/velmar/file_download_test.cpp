// The transfer of a file from a Velmar receiver, chunk by chunk.
#include "velmar/file_download.h"

#include <algorithm>
#include <cstddef>
#include <string>
#include <vector>

#include "platform/hresult.h"
#include "tests/velmar/download_fixture.h"

namespace {

using testing::ElementsAre;

using VelmarFileDownload = VelmarDownload;

TEST_F(VelmarFileDownload, BringsTheFileAndReportsEachPercentOnce) {
  Serve(10);
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes.size(), 1000u);
  EXPECT_EQ(stream.bytes.substr(0, 1), "j");
  EXPECT_EQ(stream.bytes.substr(999), "a");
  EXPECT_THAT(percents, ElementsAre(0, 10, 20, 30, 40, 50, 60, 70, 80, 90, 100, 100));
  EXPECT_EQ(stream.references, 1u);
  EXPECT_TRUE(report.HasStart("CVelmarProtocol::DownloadFile - connection is locked [0x"));
}

// Each chunk is in the stream before its percent is reported, and the last percent is reported
// while the link is still fast.
TEST_F(VelmarFileDownload, ReportsThePercentOfWhatIsWritten) {
  Serve(2);
  connection->speed = 9600;
  std::vector<size_t> written;
  std::vector<DWORD> speeds;
  on_percent = [&](int) {
    written.push_back(stream.bytes.size());
    speeds.push_back(connection->speed);
  };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(percents, ElementsAre(0, 50, 100, 100));
  EXPECT_THAT(written, ElementsAre(0u, 100u, 200u, 200u));
  EXPECT_THAT(speeds, ElementsAre(9600u, 115200u, 115200u, 115200u));
}

// The received bytes are in the stream, and no result shows that some are missing.
TEST_F(VelmarFileDownload, ATransferThatStopsInBetweenIsASuccess) {
  Serve(4);
  const std::string reply = answers[kRead];
  answers[kRead] = reply.substr(0, reply.size() - 1);
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes.size(), 300u);
  EXPECT_THAT(percents, ElementsAre(0, 25, 50, 75, 100));
}

TEST_F(VelmarFileDownload, AFileOfSizeZeroIsCompleteAtOnce) {
  Serve(2);
  answers[kHeader] = HeaderReply("0");
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes.size(), 200u);
  EXPECT_THAT(percents, ElementsAre(0, 100, 100));
}

TEST_F(VelmarFileDownload, AFailingStreamEndsIt) {
  Serve(3);
  stream.fail_at_write = 1;
  EXPECT_EQ(Download(), STG_E_MEDIUMFULL);
  EXPECT_EQ(stream.writes, 2u);
  EXPECT_EQ(stream.bytes, std::string(100, 'c'));
  EXPECT_THAT(percents, ElementsAre(0, 33));
  EXPECT_EQ(stream.references, 1u);
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_TRUE(report.Has("CVelmarProtocol::DumpInvalidResponse - [0x80030070] [] [COM7]"));
}

// A file that turns out longer than its header said: the percent is a byte, and is reported as 100
// at the most.
TEST_F(VelmarFileDownload, ThePercentOfAFileThatIsLongerThanItsSize) {
  Serve(3);
  answers[kHeader] = HeaderReply("100");
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(percents, ElementsAre(0, 100, 100, 300 - 256, 100));
}

TEST_F(VelmarFileDownload, APercentThatDoesNotChangeIsNotReported) {
  Serve(4);
  answers[kHeader] = HeaderReply("20000");
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(percents, ElementsAre(0, 1, 2, 100));
}

// Sizes of 2 GB and more do not fit the number in the header, which is limited to its maximum; a
// negative size is a very large one.
TEST_F(VelmarFileDownload, SizesBeyondTheNumberAreTakenAsTheyCome) {
  for (const char* size : {"4000000000", "-1"}) {
    Serve(1);
    answers[kHeader] = HeaderReply(size);
    percents.clear();
    EXPECT_EQ(Download(), S_OK);
    EXPECT_THAT(percents, ElementsAre(0, 100)) << size;
  }
}

// In 32-bit arithmetic the product of a large file wraps.
TEST_F(VelmarFileDownload, ThePercentOfALargeFileWraps) {
  constexpr size_t kChunk = 1024;
  constexpr size_t kChunksUntilItWraps = 42949672 / kChunk + 1;
  answers[kHeader] = HeaderReply("100000000");
  answers[kRead] = kOkPrompt + BinaryLog{std::string(kChunk, 'x'), 1}.Bytes();
  const auto answer = connection->on_write;
  connection->on_write = [&](std::string_view bytes) {
    const HRESULT result = answer(bytes);
    if (bytes == kRead) {
      const std::string more = BinaryLog{std::string(kChunk, 'x'), 1}.Bytes();
      for (size_t i = 2; i < kChunksUntilItWraps; ++i) connection->GiveRead(more);
      connection->GiveRead(BinaryLog{std::string(kChunk, 'x'), 0}.Bytes());
    }
    return result;
  };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes.size(), kChunksUntilItWraps * kChunk);
  std::vector<int> expected;
  for (int percent = 0; percent <= 42; ++percent) expected.push_back(percent);
  expected.push_back(0);
  expected.push_back(100);
  EXPECT_EQ(percents, expected);
}

// A receiver that may still be sending is stopped, at any speed; one that has not begun is not.
class VelmarUnfinishedDownload : public VelmarDownload {
 protected:
  size_t TimesStopped() const {
    return static_cast<size_t>(std::ranges::count(connection->Writes(), kStop));
  }
};

TEST_F(VelmarUnfinishedDownload, IsStoppedAfterAnAbort) {
  Serve(3);
  before_command = [&](const std::string& command) {
    if (command == kRead) driver.Abort();
  };
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(TimesStopped(), 1u);
}

TEST_F(VelmarUnfinishedDownload, IsStoppedWhenTheStreamFails) {
  Serve(3);
  stream.fail_at_write = 1;
  EXPECT_EQ(Download(), stream.failure);
  EXPECT_EQ(TimesStopped(), 1u);
}

TEST_F(VelmarUnfinishedDownload, IsStoppedWhenTheFileBreaksOff) {
  Serve(3);
  answers[kRead].resize(answers[kRead].size() - 50);
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(TimesStopped(), 1u);
}

TEST_F(VelmarUnfinishedDownload, IsStoppedWhenTheAnswerCannotBeUnderstood) {
  Serve(3);
  answers[kRead] = "x" + answers[kRead];
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(TimesStopped(), 1u);
}

TEST_F(VelmarUnfinishedDownload, IsNotStoppedWhenItIsComplete) {
  Serve(3);
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(TimesStopped(), 0u);
}

TEST_F(VelmarUnfinishedDownload, IsNotStoppedBeforeItBegan) {
  const std::string refused = "\r\n<ERROR:No such file\r\n[COM1]";
  for (const std::string& command : {kCurrent, kHeader, kRead}) {
    for (const std::string& answer : {std::string(), kErrorPrompt, refused}) {
      Serve(3);
      answers[command] = answer;
      EXPECT_EQ(Download(), S_OK);
      EXPECT_EQ(TimesStopped(), 0u) << command << answer;
      answers[command] = kOkPrompt;
    }
  }
}

}  // namespace
