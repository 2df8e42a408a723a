// A host that aborts, closes and destroys at difficult moments, from several threads at once.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <atomic>
#include <chrono>
#include <future>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/lock.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/host/support/velmar.h"
#include "tests/support/content.h"

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Not;

namespace {

constexpr const char* kQuorinReads = "CQuorinCommand::Execute - start reading";
constexpr const char* kStop = R"(unlogall thisport\r)";

long Check(void* handle, HANDLE event = nullptr) {
  short answer = 7;
  const long result = devapi::CheckConnection(handle, event, &answer);
  return result == S_OK ? answer : result;
}

long Delete(void* handle, std::wstring name = L"X.log") {
  return devapi::DeleteFileW(handle, name.data());
}

// The host closes its event during the check.
TEST(ApiAwkwardMoments, EventIsClosedDuringTheCheck) {
  bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  const host::Report report;
  port.Pause();
  std::future<long> check;
  {
    const host::Event event;
    check = host::OnThread([&, handle = event.get()] { return Check(receiver.get(), handle); });
    report.WaitFor(kQuorinReads);
  }
  devapi::Abort(receiver.get());
  EXPECT_EQ(check.get(), 0);
  EXPECT_THAT(report.LinesWith("CAbstractConnection::Read"), IsEmpty()) << "a time-out ended it";
  port.Resume();
  EXPECT_EQ(receiver.Check(), -1);
}

class ApiAwkwardProgress : public testing::TestWithParam<int> {};

// The download's own thread closes the receiver while it holds locks of it.
TEST_P(ApiAwkwardProgress, ReceiverIsClosed) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", Content(1500)}});
  void* const handle = host::Receiver(port).Release();
  MemoryStream stream;
  std::vector<long> closings;
  host::Progress progress([&](int percent) {
    if (percent >= GetParam() && closings.empty()) closings = {devapi::CloseReceiver(handle)};
  });
  wchar_t name[] = L"A.log";
  EXPECT_EQ(devapi::DownloadFile(handle, name, &stream, progress.record()), S_FALSE);
  EXPECT_THAT(closings, ElementsAre(S_OK));
  EXPECT_EQ(devapi::Abort(handle), E_INVALIDARG);
}

INSTANTIATE_TEST_SUITE_P(Percents, ApiAwkwardProgress, testing::Values(0, 1, 50, 100));

struct Silence {
  const char* command;  // is not received
  const char* line;     // of the report, just before it is sent
};

class ApiAwkwardVelmarDownload : public testing::TestWithParam<Silence> {};

// After an abort before the file is requested, no command to stop the file is sent.
TEST_P(ApiAwkwardVelmarDownload, IsAbortedBeforeTheFileComes) {
  host::Velmar receiver(
      {"--mute", std::string(GetParam().command) + "@1"}, {{"A.log", Content(5000)}}, CBR_115200);
  const host::Report report;
  MemoryStream stream;
  auto download = host::OnThread([&] { return receiver.Download(L"A.log", stream); });
  report.WaitFor(GetParam().line);
  devapi::Abort(receiver.get());
  EXPECT_EQ(download.get(), S_FALSE);
  EXPECT_THAT(receiver.Sent(), Not(Contains(kStop)));
  EXPECT_EQ(stream.writes, 0U);
  EXPECT_EQ(receiver.Delete(L"X.log"), S_FALSE) << "the flag is still there";
  EXPECT_THAT(receiver.Names(), ElementsAre(L"A.log")) << receiver.port.Transcript();
}

INSTANTIATE_TEST_SUITE_P(
    Commands,
    ApiAwkwardVelmarDownload,
    testing::Values(Silence{"currentfile", "CVelmarProtocol::DownloadFile - connection is locked"},
                    Silence{"log filehdra", "CGetFileHeaderCmd::CGetFileHeaderCmd"}));

// Threads that use one receiver independently, while two more abort.
void WorkAndAbort(void* handle) {
  constexpr auto kDuration = std::chrono::seconds(3);
  std::atomic<bool> is_over = false;
  std::vector<std::future<void>> threads;
  for (unsigned seed = 1; seed <= 3; ++seed) {
    threads.push_back(host::OnThread([&, seed] {
      std::minstd_rand random(seed);
      while (!is_over) {
        const host::Event event;
        MemoryStream stream;
        CReceiverInfo info{};
        wchar_t name[] = L"A.log";
        switch (random() % 5) {
          case 0:
            Check(handle, random() % 2 == 0 ? event.get() : nullptr);
            break;
          case 1:
            if (devapi::GetReceiverInfo(handle, nullptr, &info) != S_OK) {
              devapi::UnlockConnection(handle);
            }
            SysFreeString(info.bstrReceiverId);
            SysFreeString(info.bstrModel);
            break;
          case 2:
            Delete(handle);
            break;
          case 3:
            devapi::DownloadFile(handle, name, &stream, nullptr);
            break;
          default:
            devapi::LockConnection(handle, nullptr);
            devapi::UnlockConnection(handle);
        }
      }
    }));
  }
  for (unsigned seed = 11; seed <= 12; ++seed) {
    threads.push_back(host::OnThread([&, seed] {
      std::minstd_rand random(seed);
      while (!is_over) {
        Sleep(random() % 60);
        devapi::Abort(handle);
      }
    }));
  }
  std::this_thread::sleep_for(kDuration);
  is_over = true;
  for (auto& thread : threads) thread.get();
}

// The next operation clears the last abort; after that everything works.
void ExpectNothingIsLeft(const host::OpenReceiver& receiver) {
  Check(receiver.get());
  Delete(receiver.get());
  EXPECT_EQ(receiver.Check(), -1);
  EXPECT_EQ(receiver.Identify().result, S_OK);
  EXPECT_EQ(host::TryLockElsewhere(receiver.get()), S_OK);
  MemoryStream stream;
  EXPECT_EQ(receiver.Download(L"A.log", stream), S_OK);
  EXPECT_EQ(stream.bytes.size(), 20000U);
}

TEST(ApiAwkwardMoments, ManyThreadsOnUsb) {
  const bed::SimulatedUsb usb({"quorin"}, {{"A.log", Content(20000)}});
  const host::UsbReceiver receiver(usb);
  WorkAndAbort(receiver.get());
  ExpectNothingIsLeft(receiver);
}

// A call that ends this soon was ended by the abort, not by a time-out.
constexpr auto kSoon = std::chrono::seconds(6);

template <typename Result>
bool EndsSoon(const std::future<Result>& call) {
  return call.wait_for(kSoon) == std::future_status::ready;
}

// An event that resets itself after a wait.
bed::UniqueHandle SelfResettingEvent() {
  return bed::UniqueHandle(CreateEventW(nullptr, FALSE, TRUE, nullptr));
}

// The step that clears the signal must also end the check.
TEST(ApiAwkwardMoments, SelfResettingEventEndsTheCheckOnAPort) {
  const bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  EXPECT_EQ(Check(receiver.get(), SelfResettingEvent().get()), 0);
  EXPECT_EQ(receiver.Check(), -1);
}

TEST(ApiAwkwardMoments, SelfResettingEventEndsTheCheckOnUsb) {
  const bed::SimulatedUsb usb({"quorin"});
  const host::UsbReceiver receiver(usb);
  EXPECT_EQ(Check(receiver.get(), SelfResettingEvent().get()), 0);
  EXPECT_EQ(receiver.Check(), -1);
}

TEST(ApiAwkwardMoments, SelfResettingEventEndsTheCheckOfAVelmarReceiver) {
  const host::Velmar receiver({});
  EXPECT_EQ(Check(receiver.get(), SelfResettingEvent().get()), 0);
  EXPECT_EQ(Check(receiver.get()), -1);
}

// The receiver takes a moment to change its speed. The abort comes after the last block: the
// download returns when both ends are at the old speed.
TEST(ApiAwkwardMoments, QuorinDownloadIsAbortedWithItsLastBlock) {
  const bed::SimulatedPort port({"quorin", "--reply-silence", "0.3:set,cur/term/rate"},
                                {{"A.log", Content(1500)}});
  const host::Receiver receiver(port);
  MemoryStream stream;
  host::Progress progress([&](int percent) {
    if (percent == 100) devapi::Abort(receiver.get());
  });
  EXPECT_EQ(receiver.Download(L"A.log", stream, &progress), S_FALSE);
  EXPECT_EQ(receiver.Check(), -1) << port.Transcript();
}

// The second abort ends a wait while the speed is put back. The next command is still received.
TEST(ApiAwkwardMoments, VelmarDownloadIsAbortedTwice) {
  // In pieces with pauses, for time to abort; answers come in one piece.
  host::Velmar receiver({"--pieces", "1000", "--piece-gap", "50", "--reply-silence", "0.3:COM"},
                        {{"A.log", Content(600000)}});
  MemoryStream stream;
  auto download = host::OnThread([&] { return receiver.Download(L"A.log", stream); });
  receiver.port.WaitForTranscript(" offset=2048 ");
  devapi::Abort(receiver.get());
  receiver.port.WaitForTranscript(R"(> unlogall thisport\r)"
                                  "\n- transfer stopped");
  devapi::Abort(receiver.get());
  EXPECT_TRUE(EndsSoon(download));
  EXPECT_EQ(download.get(), S_OK);
  auto deletion = host::OnThread([&] { return receiver.Delete(L"X.log"); });
  EXPECT_TRUE(EndsSoon(deletion));
  EXPECT_EQ(deletion.get(), S_FALSE);
  EXPECT_THAT(receiver.Sent(), Contains(R"(del file X.log\r)")) << receiver.port.Transcript();
}

// A receiver that never answers the command that raises its speed.
TEST(ApiAwkwardMoments, AbortEndsTheRaisingOfTheSpeed) {
  host::Velmar receiver({"--mute", "COM"}, {{"A.log", "content"}});
  MemoryStream stream;
  const host::Report report;
  auto download = host::OnThread([&] { return receiver.Download(L"A.log", stream); });
  report.WaitFor("CSetPortParamsCmd::CSetPortParamsCmd");
  // The first abort ends this wait, another one the wait while the speed is put back.
  const auto start = std::chrono::steady_clock::now();
  do {
    devapi::Abort(receiver.get());
  } while (download.wait_for(std::chrono::milliseconds(200)) != std::future_status::ready &&
           std::chrono::steady_clock::now() - start < kSoon);
  EXPECT_LT(std::chrono::steady_clock::now() - start, kSoon);
  download.get();
}

// An aborted command leaves nothing on the line before the next one.
TEST(ApiAwkwardMoments, AbortedCommandIsNotLeftHalfSent) {
  const bed::SimulatedUsb usb({"quorin"});
  const host::UsbReceiver receiver(usb);
  devapi::Abort(receiver.get());
  EXPECT_EQ(receiver.Identify().result, S_FALSE);
  EXPECT_EQ(receiver.Identify().result, S_OK);
  for (const std::string& line : receiver.SentSince()) {
    EXPECT_THAT(line,
                testing::AnyOf(R"(%#%print,/par/rcvid\r\n)", R"(%#%print,/par/rcv/model\r\n)"));
  }
}

// The operation ends at its next step, not after a time-out.
TEST(ApiAwkwardMoments, QuorinDownloadIsAbortedInItsFirstCommand) {
  bed::SimulatedPort port({"quorin", "--speed", "115200"}, {{"A.log", "content"}});
  const host::Receiver receiver(port, CBR_115200);
  const host::Report report;
  MemoryStream stream;
  port.Pause();
  auto download = host::OnThread([&] { return receiver.Download(L"A.log", stream); });
  report.WaitFor(kQuorinReads);
  devapi::Abort(receiver.get());
  EXPECT_TRUE(EndsSoon(download));
  EXPECT_EQ(download.get(), S_FALSE);
  port.Resume();
}

}  // namespace
