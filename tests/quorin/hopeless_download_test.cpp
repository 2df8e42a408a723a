// A transfer from a receiver that answers, and never sends a block that can be accepted.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <utility>

#include "platform/hresult.h"
#include "tests/quorin/block_download_fixture.h"

using rcvlink::kTimedOut;

using testing::Each;
using testing::ElementsAre;
using testing::SizeIs;

namespace {

constexpr char kHopeless[] = "no valid block has come for too long";

class QuorinHopelessUsb : public QuorinBlockDownloadTest {
 protected:
  QuorinHopelessUsb() : QuorinBlockDownloadTest(kUsbLink) {}

  // Gives the same answer for ever; each takes the receiver the same time.
  void GiveForEver(std::string bytes, DWORD takes_ms) {
    again_ = [this, bytes = std::move(bytes), takes_ms] {
      connection->Give({S_OK, bytes, [this, takes_ms] {
                          clock.now += takes_ms;
                          again_();
                        }});
    };
    again_();
  }

 private:
  std::function<void()> again_;
};

// The fourth silence ends it, as that of a receiver that does not answer.
TEST_F(QuorinHopelessUsb, ReadsWithoutBytesAreASilence) {
  GiveForEver("", 1000);
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_EQ(Controls(), "\x15\x15\x15");
  EXPECT_THAT(report.Lines(), SizeIs(4));
  EXPECT_THAT(report.Lines(), Each(TimeoutLine()));
  EXPECT_EQ(clock.now, 4U * 31000);
}

// A byte begins the silence anew.
TEST_F(QuorinHopelessUsb, ReadsWithoutBytesEndABlockOnlyTogether) {
  const std::string block = blocks.Last(content.substr(0, 512));
  const auto give_silence = [this] {
    for (int i = 0; i < 30; ++i) connection->Give({S_OK, "", [this] { clock.now += 1000; }});
  };
  give_silence();
  Give(block.substr(0, 1));
  give_silence();
  Give(block.substr(1));
  EXPECT_EQ(Download(512), S_OK);
  EXPECT_EQ(stream.bytes, content.substr(0, 512));
}

TEST_F(QuorinHopelessUsb, BlocksThatAreNeverValidEndItAfter2Minutes) {
  GiveForEver(std::string(518, '\x55'), 1000);
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_EQ(report.Lines().back(), Line(kHopeless));
  EXPECT_GT(clock.now, 120000U);
  EXPECT_LE(clock.now, 123000U);
}

// No read of a device that sends byte by byte times out.
TEST_F(QuorinHopelessUsb, ABlockThatComesByteByByteEndsItAfter2Minutes) {
  GiveForEver("\x02", 29000);
  EXPECT_EQ(Download(), kTimedOut);
  EXPECT_THAT(report.Lines(), ElementsAre(TimeoutLine(), Line(kHopeless)));
  EXPECT_GT(clock.now, 120000U);
  EXPECT_LE(clock.now, 150000U);
}

// A block that is accepted begins the time anew.
TEST_F(QuorinHopelessUsb, ABlockGivesItTheWholeTimeAgain) {
  const std::string wrong = BlockStream::Make(0x02, 7, "", 0);
  for (int block = 0; block < 2; ++block) {
    for (int i = 0; i < 100; ++i) {
      connection->Give({S_OK, wrong, [this] { clock.now += 1000; }});
    }
    Give(block == 0 ? FirstBlock() : blocks.Last(content.substr(512, 512)));
  }
  EXPECT_EQ(Download(1024), S_OK);
  EXPECT_EQ(stream.bytes, content.substr(0, 1024));
}

// On a bad line a block may need many tries: the host ends the transfer when it has waited enough.
class QuorinSerialTries : public QuorinBlockDownloadTest {
 protected:
  QuorinSerialTries() : QuorinBlockDownloadTest(kSerialLink) {}
};

TEST_F(QuorinSerialTries, HaveNoLimit) {
  for (int i = 0; i < 1000; ++i) {
    connection->Give({S_OK, "\x55\x55\x55", [this] { clock.now += 1000; }});
  }
  GiveFile();
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_EQ(Controls().size(), 1003U);
}

}  // namespace
