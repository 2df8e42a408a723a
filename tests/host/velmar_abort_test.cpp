// Abort of a Velmar receiver's operations at difficult moments: while they wait for the lock, and
// while a download puts the speed back.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <chrono>
#include <future>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/host/support/velmar.h"
#include "tests/support/content.h"

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Not;

namespace {

// In pieces with pauses it takes nearly a minute.
constexpr size_t kEndless = 600000;
const std::vector<std::string> kSlowly = {"--pieces", "1000", "--piece-gap", "50"};
constexpr const char* kTimeouts = "CVelmarCommand::Execute - read failed";
constexpr const char* kStop = R"(> unlogall thisport\r)";

TEST(ApiVelmarAbort, OfAnOperationThatWaitsForTheReceiver) {
  host::Velmar receiver({});
  ASSERT_EQ(devapi::LockConnection(receiver.get(), nullptr), S_OK);
  const host::Report report;
  auto deletion = host::OnThread([&] { return receiver.Delete(L"X.log"); });
  report.WaitFor("CAbstractReceiver::DeleteFile");
  devapi::Abort(receiver.get());
  receiver.port.Pause();
  devapi::UnlockConnection(receiver.get());
  EXPECT_EQ(deletion.get(), S_FALSE);
  EXPECT_THAT(report.LinesWith(kTimeouts), IsEmpty()) << "a silence was waited out";
  receiver.port.Resume();
  receiver.port.WaitForTranscript(R"(> del file X.log\r)");
}

class ApiVelmarAbortedDownload : public testing::Test {
 protected:
  explicit ApiVelmarAbortedDownload(DWORD speed = CBR_9600) : speed_(speed) {}

  void Start() {
    download_ = host::OnThread([this] { return receiver_.Download(L"A.log", stream_); });
    port().WaitForTranscript(" offset=5120 ");
  }
  // An impatient user: aborts several times.
  void AbortUntilItEnds() {
    do {
      devapi::Abort(receiver_.get());
    } while (download_.wait_for(std::chrono::milliseconds(100)) != std::future_status::ready);
  }
  bed::SimulatedPort& port() { return receiver_.port; }

  const DWORD speed_;
  host::Velmar receiver_{
      kSlowly, {{"A.log", Content(kEndless)}, {"B.log", "the next one"}}, speed_};
  MemoryStream stream_;
  const host::Report report_;
  std::future<long> download_;
};

// The first abort ends the transfer. The receiver does not answer when the speed is put back: the
// next abort ends that wait, but only after the receiver was sent its old speed.
TEST_F(ApiVelmarAbortedDownload, OfAReceiverThatFallsSilent) {
  Start();
  port().Pause();
  AbortUntilItEnds();
  EXPECT_EQ(download_.get(), S_OK);
  EXPECT_THAT(report_.LinesWith(kTimeouts), IsEmpty()) << "a silence was waited out";
  EXPECT_TRUE(report_.Has("CSerialConnection::SetSpeed - changing of baudrate [115200 -> 9600]"));
}

TEST_F(ApiVelmarAbortedDownload, TracesNoTimeOutThatDidNotHappen) {
  Start();
  devapi::Abort(receiver_.get());
  EXPECT_EQ(download_.get(), S_OK);
  EXPECT_THAT(report_.LinesWith("CAbstractConnection::Read"), IsEmpty());
}

class ApiVelmarAbortedDownloadAtFullSpeed : public ApiVelmarAbortedDownload {
 protected:
  ApiVelmarAbortedDownloadAtFullSpeed() : ApiVelmarAbortedDownload(CBR_115200) {}
};

// The receiver would send the rest of the file into the next operation.
TEST_F(ApiVelmarAbortedDownloadAtFullSpeed, StopsTheReceiver) {
  Start();
  devapi::Abort(receiver_.get());
  EXPECT_EQ(download_.get(), S_FALSE);
  EXPECT_EQ(receiver_.Sent().back(), R"(unlogall thisport\r)");
  EXPECT_EQ(receiver_.Delete(L"X.log"), S_FALSE) << "the flag is still there";
  EXPECT_THAT(receiver_.Names(), ElementsAre(L"A.log", L"B.log")) << port().Transcript();
}

TEST_F(ApiVelmarAbortedDownloadAtFullSpeed, StopsTheReceiverWhenTheStreamFails) {
  stream_.fail_at_write = 2;
  EXPECT_EQ(receiver_.Download(L"A.log", stream_), stream_.failure);
  EXPECT_EQ(receiver_.Sent().back(), R"(unlogall thisport\r)");
  EXPECT_THAT(receiver_.Names(), ElementsAre(L"A.log", L"B.log")) << port().Transcript();
}

TEST(ApiVelmarRefusedDownload, IsNotStopped) {
  for (const char* command : {"currentfile", "log filehdra", "log filetransferb"}) {
    host::Velmar receiver({"--refuse", command}, {{"A.log", "content"}}, CBR_115200);
    MemoryStream stream;
    EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK) << command;
    EXPECT_THAT(receiver.SentAndMoved(), Not(Contains(kStop))) << command;
  }
}

}  // namespace
