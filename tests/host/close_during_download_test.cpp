// A receiver that is closed while another thread downloads from it.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <string>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/support/content.h"

namespace {

constexpr size_t kSize = 5000;

// The download is stopped at a percent.
class HeldDownload : public testing::TestWithParam<int> {
 protected:
  void Start() {
    download_ = host::OnThread([this] {
      wchar_t name[] = L"A.log";
      return devapi::DownloadFile(handle_, name, &stream_, held_.progress.record());
    });
    ASSERT_TRUE(held_.gate.WaitForArrival());
  }
  long Finish() {
    held_.gate.Open();
    return download_.get();
  }

  void ExpectHandleIsUnknown() {
    std::wstring name = port_.name();
    short answer = 7;
    void* found = nullptr;
    EXPECT_EQ(devapi::CheckConnection(handle_, nullptr, &answer), E_INVALIDARG);
    EXPECT_EQ(devapi::Abort(handle_), E_INVALIDARG);
    EXPECT_EQ(devapi::CloseReceiver(handle_), E_INVALIDARG);
    EXPECT_EQ(devapi::OpenReceiver(name.data(), &found), S_FALSE);
  }
  size_t TimesDisconnected() const {
    return report_
        .LinesWith("CAbstractConnection::Disconnect - disconnected [" + host::Narrow(port_.name()) +
                   "]")
        .size();
  }
  void ExpectPortIsFree() {
    EXPECT_EQ(TimesDisconnected(), 1U);
    if (port_.Transcript().find("= speed 115200") != std::string::npos) {
      port_.WaitForTranscript("= speed 9600\n");
    }
    const host::Receiver again(port_);
    EXPECT_EQ(again.Identify().model, L"HVA3-G3T");
  }

  const std::string content_ = Content(kSize);
  const bed::SimulatedPort port_{{"quorin"}, {{"A.log", content_}}};
  void* const handle_ = host::Receiver(port_).Release();
  const host::Report report_;
  MemoryStream stream_;
  host::GatedProgress held_{GetParam()};
  std::future<long> download_;
};

using ApiCloseDuringDownload = HeldDownload;

TEST_P(ApiCloseDuringDownload, EndsIt) {
  Start();
  EXPECT_EQ(devapi::CloseReceiver(handle_), S_OK);
  ExpectHandleIsUnknown();
  EXPECT_EQ(TimesDisconnected(), 0U) << "under the feet of the download";
  EXPECT_EQ(Finish(), S_FALSE);
  EXPECT_TRUE(content_.starts_with(stream_.bytes));
  ExpectPortIsFree();
}

INSTANTIATE_TEST_SUITE_P(Percents, ApiCloseDuringDownload, testing::Values(0, 1, 50, 100));

using ApiDestroyDuringDownload = HeldDownload;

TEST_P(ApiDestroyDuringDownload, EndsIt) {
  Start();
  std::wstring name = port_.name();
  EXPECT_EQ(devapi::DestroyReceiver(name.data()), S_OK);
  ExpectHandleIsUnknown();
  EXPECT_EQ(TimesDisconnected(), 0U) << "under the feet of the download";
  EXPECT_EQ(Finish(), S_FALSE);
  EXPECT_TRUE(content_.starts_with(stream_.bytes));
  EXPECT_TRUE(report_.LinesWith("CAbstractReceiver::Abort").empty()) << "nobody called it";
  ExpectPortIsFree();
}

INSTANTIATE_TEST_SUITE_P(Percents, ApiDestroyDuringDownload, testing::Values(0, 1, 50, 100));

using ApiCloseOfOneOfTwoUsers = HeldDownload;

TEST_P(ApiCloseOfOneOfTwoUsers, LeavesTheDownloadAlone) {
  std::wstring name = port_.name();
  void* again = nullptr;
  ASSERT_EQ(devapi::OpenReceiver(name.data(), &again), S_OK);
  Start();
  EXPECT_EQ(devapi::CloseReceiver(again), S_FALSE);
  EXPECT_EQ(Finish(), S_OK);
  EXPECT_TRUE(stream_.bytes == content_);
  EXPECT_EQ(devapi::CloseReceiver(handle_), S_OK);
  EXPECT_EQ(TimesDisconnected(), 1U);
}

INSTANTIATE_TEST_SUITE_P(Percents, ApiCloseOfOneOfTwoUsers, testing::Values(50));

// Without a stop: whatever the download does at that moment, it ends.
TEST(ApiCloseDuringTransfer, EndsIt) {
  const bed::SimulatedPort port({"quorin", "--pace"}, {{"A.log", Content(300000)}});
  void* const handle = host::Receiver(port).Release();
  MemoryStream stream;
  auto download = host::OnThread([&] {
    wchar_t name[] = L"A.log";
    return devapi::DownloadFile(handle, name, &stream, nullptr);
  });
  port.WaitForTranscript(" seq=7 ");
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
  EXPECT_EQ(devapi::Abort(handle), E_INVALIDARG);
  EXPECT_EQ(download.get(), S_FALSE);
  EXPECT_LT(stream.bytes.size(), 300000U);
  port.WaitForTranscript("= speed 9600\n");
  const host::Receiver again(port);
  EXPECT_EQ(again.Identify().result, S_OK);
}

// The same while a command waits for its reply.
TEST(ApiCloseDuringCommand, EndsIt) {
  bed::SimulatedPort port({"quorin"}, {{"A.log", "a"}});
  void* const handle = host::Receiver(port).Release();
  const host::Report report;
  port.Pause();
  auto deletion = host::OnThread([&] {
    wchar_t name[] = L"A.log";
    return devapi::DeleteFileW(handle, name);
  });
  report.WaitFor("CQuorinCommand::Execute - start reading");
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
  EXPECT_EQ(deletion.get(), S_FALSE);
  EXPECT_EQ(report.LinesWith("CAbstractConnection::Disconnect").size(), 1U);
  port.Resume();
  const host::Receiver again(port);
  EXPECT_EQ(again.Identify().result, S_OK);
}

}  // namespace
