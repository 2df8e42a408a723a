// The progress of a block transfer. The test sets when each block arrives, in milliseconds since
// the first request.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "tests/quorin/block_download_fixture.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

class QuorinProgressTest : public QuorinBlockDownloadTest {
 protected:
  explicit QuorinProgressTest(const Link& used) : QuorinBlockDownloadTest(used) {
    clock.now = 123456;
  }

  void GiveDataAt(DWORD ms) { GiveAt(ms, blocks.Data(sequence_++, "")); }
  void GiveLastAt(DWORD ms, size_t length = 0) {
    GiveAt(ms, blocks.Next(0x04, static_cast<uint16_t>(length), ""));
  }

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

// The same over both links, for blocks that come slowly.
class QuorinProgress : public QuorinProgressTest, public testing::WithParamInterface<Link> {
 protected:
  QuorinProgress() : QuorinProgressTest(GetParam()) {}
};

INSTANTIATE_TEST_SUITE_P(Over, QuorinProgress, BothLinks(), LinkName);

TEST_P(QuorinProgress, IsReportedFromOneToAHundred) {
  GiveDataAt(501);
  GiveDataAt(1002);
  GiveLastAt(1503, 76);
  EXPECT_EQ(Download(1100), S_OK);
  // 512 * 99 / 1100 + 1, 1024 * 99 / 1100 + 1, 1100 * 99 / 1100 + 1
  EXPECT_THAT(progress.percents, ElementsAre(47, 93, 100));
}

// A hundred blocks of a file whose announced size is ten times as large.
TEST_P(QuorinProgress, IsReportedOncePerPercent) {
  for (DWORD i = 1; i <= 100; ++i) GiveDataAt(i * 501);
  GiveLastAt(101 * 501);
  Download(512 * 1000);
  EXPECT_THAT(progress.percents, ElementsAre(1, 2, 3, 4, 5, 6, 7, 8, 9, 10));
}

TEST_P(QuorinProgress, IsReportedOnceTheBytesAreInTheStream) {
  GiveDataAt(501);
  GiveDataAt(1002);
  GiveLastAt(1503, 76);
  std::vector<size_t> sizes;
  progress.on_progress = [&](BYTE) { sizes.push_back(stream.bytes.size()); };
  Download(1100);
  EXPECT_THAT(sizes, ElementsAre(512, 1024, 1100));
}

TEST_P(QuorinProgress, IsAtLeastOne) {
  GiveLastAt(501);
  Download(1100);
  EXPECT_THAT(progress.percents, ElementsAre(1));
}

TEST_P(QuorinProgress, IsOneForTheFirstBytesOfAHugeFile) {
  GiveDataAt(501);
  GiveDataAt(1002);
  GiveLastAt(1503);
  Download(0x7FFFFFFF);
  EXPECT_THAT(progress.percents, ElementsAre(1));
}

// 99 % of the delivered bytes, never rounded up.
TEST_P(QuorinProgress, IsTruncated) {
  GiveLastAt(501, 199);
  Download(200);  // 199 * 99 / 200 + 1 is 99.505
  EXPECT_THAT(progress.percents, ElementsAre(99));
}

TEST_P(QuorinProgress, IsAHundredAtMostForALargerFileThanAnnounced) {
  GiveDataAt(501);
  GiveLastAt(1002, 512);
  Download(400);
  // 512 * 99 / 400 + 1 is 127, 1024 * 99 / 400 + 1 is 254.
  EXPECT_THAT(progress.percents, ElementsAre(100, 100));
}

TEST_P(QuorinProgress, IsCutToEightBits) {
  GiveDataAt(501);
  GiveDataAt(1002);
  GiveDataAt(1503);
  GiveLastAt(1503);
  Download(190);
  // 512 * 99 / 190 + 1 is 267, 1024 * 99 / 190 + 1 is 534, 1536 * 99 / 190 + 1 is 801.
  EXPECT_THAT(progress.percents, ElementsAre(267 - 256, 534 - 512, 801 - 768));
}

TEST_P(QuorinProgress, IsCutToEightBitsForAMuchLargerFileThanAnnounced) {
  GiveDataAt(501);
  GiveDataAt(1002);
  GiveLastAt(1503);
  Download(1);
  // 512 * 99 + 1 is 198 * 256 + 1; 1024 * 99 + 1 is 396 * 256 + 1: no change.
  EXPECT_THAT(progress.percents, ElementsAre(1));
}

// Over a serial link every change is reported, however soon.
class QuorinSerialProgress : public QuorinProgressTest {
 protected:
  QuorinSerialProgress() : QuorinProgressTest(kSerialLink) {}
};

TEST_F(QuorinSerialProgress, IsReportedWithEachChange) {
  GiveDataAt(0);
  GiveDataAt(0);
  GiveLastAt(1, 76);
  EXPECT_EQ(Download(1100), S_OK);
  EXPECT_THAT(progress.percents, ElementsAre(47, 93, 100));
}

// Over USB progress is reported at most twice a second.
class QuorinUsbProgress : public QuorinProgressTest {
 protected:
  QuorinUsbProgress() : QuorinProgressTest(kUsbLink) {}
};

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
  GiveDataAt(1200);  // 20, skipped
  GiveDataAt(1201);  // 30
  GiveDataAt(1300);  // 40, skipped
  GiveDataAt(1701);  // 50, skipped
  GiveDataAt(9999);  // 60
  GiveLastAt(9999);
  Download(512 * 11);
  EXPECT_THAT(progress.percents, ElementsAre(10, 28, 55));
}

// A percent that was skipped is not reported later while it does not change.
TEST_F(QuorinUsbProgress, IsSkippedNotDeferred) {
  GiveDataAt(100);   // 1.1: changed, too early
  GiveDataAt(600);   // 1.2: not changed
  GiveDataAt(1100);  // 1.3
  for (int i = 3; i < 10; ++i) GiveDataAt(1100);
  GiveDataAt(1200);  // 2.1
  GiveLastAt(5000);  // 2.1
  Download(512 * 1000);
  EXPECT_THAT(progress.percents, ElementsAre(2));
}

// Neither changes the time of the last report.
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
  GiveDataAt(100);  // before it: 10, skipped
  GiveDataAt(500);  // after it: 20, skipped
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

}  // namespace
