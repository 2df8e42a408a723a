// Abort, from another thread, at every moment of a download.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <chrono>
#include <ostream>
#include <string>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/support/content.h"

using testing::IsEmpty;

namespace {

// Paced, this takes half a minute: no download ends before its abort comes.
constexpr size_t kEndless = 300000;
constexpr const char* kReading = "CQuorinCommand::Execute - start reading";
constexpr auto kPoll = std::chrono::milliseconds(5);

class DownloadToAbort {
 protected:
  explicit DownloadToAbort(size_t size = kEndless)
      : content_(Content(size)),
        port_({"quorin", "--pace"}, {{"A.log", content_}, {"B.log", "next"}}),
        receiver_(port_) {}

  auto Start(host::Progress* progress = nullptr) {
    return host::OnThread(
        [this, progress] { return receiver_.Download(L"A.log", stream_, progress); });
  }
  void Abort() const { EXPECT_EQ(devapi::Abort(receiver_.get()), S_OK); }

  // The state after an aborted download: the receiver was sent the end and is at its old speed.
  void ExpectEnded() {
    const host::Lines lines = receiver_.WireSince();
    // After the get command the receiver waits for the host.
    const size_t begun = host::CountStarting(lines, "> %#%get,");
    EXPECT_EQ(host::CountOf(lines, "> #") + host::CountStarting(lines, "> #%"), begun)
        << port_.Transcript();
    EXPECT_TRUE(content_.starts_with(stream_.bytes));
    EXPECT_EQ(stream_.bytes.size() % 512, 0U);
  }
  void ExpectNothingIsLeftOfIt() {
    // An abort ends the wait for the receiver's reply about its speed.
    if (host::CountOf(receiver_.WireSince(), "= speed 115200") > 0) {
      port_.WaitForTranscript("= speed 9600\n");
    }
    const host::Identity identity = receiver_.Identify();
    EXPECT_EQ(identity.result, S_OK) << port_.Transcript();
    EXPECT_EQ(identity.model, L"HVA3-G3T");
  }
  void ExpectNextDownloadWorks() {
    MemoryStream next;
    EXPECT_EQ(receiver_.Download(L"B.log", next), S_OK);
    EXPECT_EQ(next.bytes, "next");
  }

  const std::string content_;
  bed::SimulatedPort port_;
  const host::Receiver receiver_;
  MemoryStream stream_;
};

class ApiDownloadAbort : public DownloadToAbort, public testing::Test {};

TEST_F(ApiDownloadAbort, BeforehandKeepsItFromBeginning) {
  Abort();
  EXPECT_EQ(receiver_.Download(L"A.log", stream_), S_FALSE);
  EXPECT_THAT(receiver_.SentSince(), IsEmpty());
  ExpectNextDownloadWorks();
}

struct Moment {
  std::string name;
  std::string text;  // of the transcript
};

std::ostream& operator<<(std::ostream& out, const Moment& moment) { return out << moment.name; }

class ApiDownloadAbortAt : public DownloadToAbort, public testing::TestWithParam<Moment> {};

TEST_P(ApiDownloadAbortAt, EndsIt) {
  ASSERT_EQ(port_.Transcript().find(GetParam().text), std::string::npos);
  auto download = Start();
  port_.WaitForTranscript(GetParam().text);
  Abort();
  EXPECT_EQ(download.get(), S_FALSE);
  ExpectEnded();
  ExpectNothingIsLeftOfIt();
}

INSTANTIATE_TEST_SUITE_P(Moments,
                         ApiDownloadAbortAt,
                         testing::Values(Moment{"SpeedRaised", "= speed 115200\n"},
                                         Moment{"LineEnd", R"(%\n)"},
                                         Moment{"Size", R"(&size\r\n)"},
                                         Moment{"Get", "get,"},
                                         Moment{"FirstBlock", " seq=0 "},
                                         Moment{"FirstAck", R"(> \x06)"},
                                         Moment{"TenthBlock", " seq=9 "}),
                         [](const auto& moment) { return moment.param.name; });

// The download is stopped in its progress function while the abort comes.
class ApiDownloadAbortAtPercent : public DownloadToAbort, public testing::TestWithParam<int> {
 protected:
  ApiDownloadAbortAtPercent() : DownloadToAbort(5000) {}
};

TEST_P(ApiDownloadAbortAtPercent, EndsIt) {
  host::GatedProgress held(GetParam());
  auto download = Start(&held.progress);
  ASSERT_TRUE(held.gate.WaitForArrival());
  Abort();
  held.gate.Open();
  EXPECT_EQ(download.get(), S_FALSE);
  if (GetParam() < 100) {
    EXPECT_LT(stream_.bytes.size(), content_.size());
    ExpectEnded();
  } else {
    EXPECT_TRUE(stream_.bytes == content_) << "all of it had come";
  }
  EXPECT_GE(held.progress.percents().back(), GetParam());
  ExpectNothingIsLeftOfIt();
}

INSTANTIATE_TEST_SUITE_P(Percents, ApiDownloadAbortAtPercent, testing::Values(0, 1, 50, 100));

// The host's own progress function may abort, too.
class ApiDownloadAbortFromProgress : public DownloadToAbort, public testing::Test {
 protected:
  ApiDownloadAbortFromProgress() : DownloadToAbort(5000) {}
};

TEST_F(ApiDownloadAbortFromProgress, EndsIt) {
  host::Progress progress([&](int percent) {
    if (percent == 31) devapi::Abort(receiver_.get());
  });
  EXPECT_EQ(receiver_.Download(L"A.log", stream_, &progress), S_FALSE);
  EXPECT_EQ(progress.percents().back(), 31);
  EXPECT_EQ(stream_.bytes.size(), 3U * 512);
  ExpectEnded();
  ExpectNothingIsLeftOfIt();
  ExpectNextDownloadWorks();
}

// The receiver does not answer while the speed is put back, until the abort ends that wait.
TEST_F(ApiDownloadAbortFromProgress, EndsTheWaitAtTheEndToo) {
  const host::Report report;
  host::GatedProgress held(100);
  auto download = Start(&held.progress);
  ASSERT_TRUE(held.gate.WaitForArrival());
  port_.Pause();
  const size_t before = report.Lines().size();
  held.gate.Open();
  report.WaitFor(kReading, before);
  Abort();
  EXPECT_EQ(download.get(), S_FALSE);
  EXPECT_TRUE(stream_.bytes == content_);
  EXPECT_TRUE(report.Has("CSerialConnection::SetSpeed - changing of baudrate [115200 -> 9600]"));
  port_.Resume();
  ExpectNothingIsLeftOfIt();
}

// Another thread's abort while this one waits for the receiver to be free.
TEST_F(ApiDownloadAbort, WhileAnotherThreadHoldsTheReceiver) {
  ASSERT_EQ(devapi::LockConnection(receiver_.get(), nullptr), S_OK);
  const host::Report report;
  auto download = Start();
  report.WaitFor("CAbstractReceiver::DownloadFile");
  Abort();
  devapi::UnlockConnection(receiver_.get());
  EXPECT_EQ(download.get(), S_FALSE);
  EXPECT_THAT(receiver_.SentSince(), IsEmpty());
  ExpectNothingIsLeftOfIt();
}

// A receiver that does not follow to the higher speed receives nothing more. The host ends each
// wait, returns to the old speed, and finds it again.
TEST(ApiDownloadAbortOfDeafReceiver, GoesBackToItsSpeed) {
  const bed::SimulatedPort port({"quorin", "--keep-speed"}, {{"A.log", "a"}});
  const host::Receiver receiver(port);
  const host::Report report;
  MemoryStream stream;
  auto download = host::OnThread([&] { return receiver.Download(L"A.log", stream); });
  report.WaitFor("CSerialConnection::SetSpeed - changing of baudrate [9600 -> 115200]");
  // One wait is over: the one for the name of the port.
  for (size_t over = 1; download.wait_for(kPoll) != std::future_status::ready;) {
    const size_t waits = report.LinesWith(kReading).size();
    if (waits > over) devapi::Abort(receiver.get());
    over = waits;
  }
  EXPECT_EQ(download.get(), S_FALSE);
  EXPECT_TRUE(report.Has("CSerialConnection::SetSpeed - changing of baudrate [115200 -> 9600]"));
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_EQ(receiver.Identify().result, S_OK);
}

// Impatient users abort several times.
TEST_F(ApiDownloadAbort, ManyTimesIsLikeOnce) {
  auto download = Start();
  port_.WaitForTranscript(" seq=3 ");
  for (int i = 0; i < 100; ++i) Abort();
  EXPECT_EQ(download.get(), S_FALSE);
  port_.WaitForTranscript("= speed 9600\n");  // the download did not wait for the reply
  ExpectEnded();
}

}  // namespace
