// An operation that is repeated a thousand times leaves no handle open.
#include <gtest/gtest.h>
#include <windows.h>

#include <string>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/support/resources.h"

namespace {

// Executes an operation a few times, because the system keeps some handles of the first one, and
// then many times.
template <typename Operation>
void ExpectNothingIsLeft(const char* name, int times, Operation operation) {
  constexpr int kFirstTimes = 3;
  for (int i = 0; i < kFirstTimes; ++i) operation();
  const size_t before = HandleCount();
  for (int i = 0; i < times; ++i) operation();
  EXPECT_EQ(HandleCount(), before) << name;
}

TEST(ApiManyTimes, HandlesAreCounted) {
  const size_t before = HandleCount();
  const host::Event first;
  const host::Event second;
  EXPECT_EQ(HandleCount(), before + 2);
}

TEST(ApiManyTimes, WithoutAReceiver) {
  const bed::PortLease missing;
  const std::string port = missing.name();
  std::wstring name(port.begin(), port.end());
  ExpectNothingIsLeft("a missing port", 300, [&] {
    void* handle = nullptr;
    DCB settings = host::Settings(CBR_9600);
    EXPECT_EQ(
        devapi::CreateReceiverOnSerial(name.data(), eProtocolAny, &settings, nullptr, &handle),
        host::kFileNotFound);
  });
  const std::wstring report = host::NewReportName();
  ExpectNothingIsLeft("a report", 100, [&] {
    dump_hlp::CreateReportFile(report.c_str());
    dump_hlp::CreateReportFile(report.c_str());
    dump_hlp::CloseReportFile();
  });
  EXPECT_TRUE(DeleteFileW(host::ReportPath(report).c_str()));
}

TEST(ApiManyTimes, WithAReceiver) {
  const bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  std::wstring name = port.name();
  const host::Event signalled(true);
  void* const handle = receiver.get();
  ExpectNothingIsLeft("another user", 200, [&] {
    void* again = nullptr;
    EXPECT_EQ(devapi::OpenReceiver(name.data(), &again), S_OK);
    EXPECT_EQ(devapi::CloseReceiver(again), S_FALSE);
  });
  ExpectNothingIsLeft("a check that is ended at once", 100, [&] {
    short answer = 7;
    EXPECT_EQ(devapi::CheckConnection(handle, signalled.get(), &answer), S_OK);
    EXPECT_EQ(answer, 0);
  });
  ExpectNothingIsLeft("a lock", 100, [&] {
    EXPECT_EQ(devapi::LockConnection(handle, signalled.get()), S_OK);
    EXPECT_EQ(devapi::UnlockConnection(handle), S_OK);
  });
  ExpectNothingIsLeft("an abort and what it ends", 100, [&] {
    void* list = nullptr;
    EXPECT_EQ(devapi::Abort(handle), S_OK);
    EXPECT_EQ(devapi::OpenFileList(handle, &list), S_FALSE);
    EXPECT_EQ(devapi::CloseFileList(list), S_OK);
  });
  EXPECT_EQ(receiver.Check(), -1);
}

TEST(ApiManyTimes, OpeningAPortThatIsThere) {
  const bed::SimulatedPort port({"quorin"});
  std::wstring name = port.name();
  const host::Event signalled(true);
  ExpectNothingIsLeft("a try that is ended at once", 100, [&] {
    void* handle = nullptr;
    EXPECT_EQ(SearchReceiverOnSerial(name.data(), eProtocolAny, signalled.get(), &handle), S_FALSE);
  });
}

// Threads start and end.
TEST(ApiManyTimes, FromManyThreads) {
  const bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  ExpectNothingIsLeft("a thread", 100, [&] {
    const HANDLE thread = CreateThread(
        nullptr,
        0,
        [](void* handle) -> DWORD {
          const host::Event signalled(true);
          devapi::LockConnection(handle, signalled.get());
          devapi::UnlockConnection(handle);
          return 0;
        },
        receiver.get(),
        0,
        nullptr);
    WaitForSingleObject(thread, INFINITE);
    CloseHandle(thread);
  });
}

}  // namespace
