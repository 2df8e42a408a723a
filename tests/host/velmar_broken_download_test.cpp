// Downloads at raised speed that end in the middle of the file: afterwards both ends are at the old
// speed, whether the receiver goes on sending or not, and the next operation works.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <chrono>
#include <future>
#include <ostream>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/velmar.h"
#include "tests/support/content.h"

using testing::ElementsAre;

namespace {

// Paced, this takes nearly a minute: no download ends before it is interrupted.
constexpr size_t kEndless = 600000;
constexpr auto kMuchLess = std::chrono::seconds(20);

struct Behaviour {
  std::string name;
  std::vector<std::string> switches;
};

std::ostream& operator<<(std::ostream& out, const Behaviour& behaviour) {
  return out << behaviour.name;
}

class ApiVelmarBrokenDownload : public testing::TestWithParam<Behaviour> {
 protected:
  auto Start(host::Progress* progress = nullptr) {
    return host::OnThread(
        [this, progress] { return receiver_.Download(L"A.log", stream_, progress); });
  }

  // Both are back at the old speed. The command for that was sent at the higher one.
  void ExpectBothAtTheOldSpeed() {
    receiver_.port.WaitForTranscript("= speed 9600\n");
    host::Lines speeds;
    for (const std::string& line : receiver_.SentAndMoved()) {
      if (line.starts_with("> COM") || line.starts_with("=")) speeds.push_back(line);
    }
    EXPECT_THAT(speeds,
                ElementsAre(R"(> COM 115200 N 8 1 N\r)",
                            "= speed 115200",
                            R"(> COM 9600 N 8 1 N\r)",
                            "= speed 9600"))
        << receiver_.port.Transcript();
    EXPECT_TRUE(content_.starts_with(stream_.bytes));
    EXPECT_LT(stream_.bytes.size(), content_.size());
    EXPECT_EQ(stream_.bytes.size() % 1024, 0U);
  }
  void ExpectFilesAreListed() {
    EXPECT_THAT(receiver_.Names(), ElementsAre(L"A.log", L"B.log")) << receiver_.port.Transcript();
  }
  void ExpectNextDownloadWorks() {
    MemoryStream next;
    EXPECT_EQ(receiver_.Download(L"B.log", next), S_OK);
    EXPECT_EQ(next.bytes, "the next one") << receiver_.port.Transcript();
  }

  static std::vector<std::string> Switches() {
    std::vector<std::string> switches = GetParam().switches;
    // As slow as a line, but in whole answers: a greeting that comes byte by byte may lose its
    // beginning to a purge.
    switches.insert(switches.end(), {"--pieces", "1000", "--piece-gap", "85"});
    return switches;
  }

  const std::string content_ = Content(kEndless);
  host::Velmar receiver_{Switches(), {{"A.log", content_}, {"B.log", "the next one"}}};
  MemoryStream stream_;
};

// The result of putting the speed back replaces the failure.
TEST_P(ApiVelmarBrokenDownload, ByAStreamThatFails) {
  stream_.fail_at_write = 2;
  EXPECT_EQ(receiver_.Download(L"A.log", stream_), S_OK);
  EXPECT_EQ(stream_.writes, 3U);
  EXPECT_EQ(stream_.bytes.size(), 2048U);
  ExpectBothAtTheOldSpeed();
  ExpectFilesAreListed();
}

TEST_P(ApiVelmarBrokenDownload, ByAStreamThatFailsAtOnce) {
  stream_.fail_at_write = 0;
  EXPECT_EQ(receiver_.Download(L"A.log", stream_), S_OK);
  EXPECT_EQ(stream_.bytes, "");
  ExpectBothAtTheOldSpeed();
  ExpectNextDownloadWorks();
}

// The flag of an abort stays set after the download: the next operation sends its command and then
// ends.
TEST_P(ApiVelmarBrokenDownload, ByAnAbortFromAnotherThread) {
  auto download = Start();
  receiver_.port.WaitForTranscript(" offset=5120 ");
  EXPECT_EQ(devapi::Abort(receiver_.get()), S_OK);
  EXPECT_EQ(download.wait_for(kMuchLess), std::future_status::ready);
  EXPECT_EQ(download.get(), S_OK);
  ExpectBothAtTheOldSpeed();
  EXPECT_EQ(receiver_.Delete(L"X.log"), S_FALSE);
  EXPECT_EQ(receiver_.Sent().back(), R"(del file X.log\r)") << receiver_.port.Transcript();
  ExpectFilesAreListed();
}

// A download as the next operation does not check the flag: it is complete, and the flag stays set.
TEST_P(ApiVelmarBrokenDownload, ByAnAbortFromItsOwnProgress) {
  host::Progress progress([&](int percent) {
    if (percent == 1) devapi::Abort(receiver_.get());
  });
  auto download = Start(&progress);
  EXPECT_EQ(download.wait_for(kMuchLess), std::future_status::ready);
  EXPECT_EQ(download.get(), S_OK);
  ExpectBothAtTheOldSpeed();
  ExpectNextDownloadWorks();
  EXPECT_EQ(receiver_.Delete(L"X.log"), S_FALSE);
}

INSTANTIATE_TEST_SUITE_P(Receivers,
                         ApiVelmarBrokenDownload,
                         testing::Values(Behaviour{"SendsOn", {}},
                                         Behaviour{"StopsForCommands", {"--stop-for-commands"}}),
                         [](const auto& behaviour) { return behaviour.param.name; });

}  // namespace
