#include "api/registry.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <memory>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "platform/api_types.h"
#include "platform/handle.h"
#include "platform/hresult.h"
#include "tests/support/report_capture.h"
#include "tests/support/stub_receiver.h"

using rcvlink::KernelHandle;
using rcvlink::Receivers;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr HRESULT kInvalid = static_cast<HRESULT>(0x80070057);

// The functions take names that are not constant, as hosts have them.
wchar_t* Name(const wchar_t* text) {
  static std::array<std::wstring, 8> names;
  static size_t next = 0;
  std::wstring& name = names[next++ % names.size()];
  name = text;
  return name.data();
}

struct Registered {
  explicit Registered(const wchar_t* port) {
    auto owned = std::make_shared<StubReceiver>();
    receiver = owned.get();
    receiver->destroyed = &destroyed;
    EXPECT_EQ(Receivers().Insert(port, std::move(owned), &handle), S_OK);
  }
  ~Registered() {
    while (!destroyed && devapi::CloseReceiver(handle) != kInvalid) continue;
  }
  StubReceiver* receiver;
  void* handle = nullptr;
  bool destroyed = false;
};

TEST(Registry, TheHandleIsTheReceiversAddress) {
  const Registered one(L"COM7");
  EXPECT_EQ(one.handle, static_cast<CIReceiver*>(one.receiver));
}

TEST(Registry, OpenCountsAUserAndGivesTheHandle) {
  const ReportCapture report;
  const Registered one(L"COM7");
  void* handle = nullptr;
  EXPECT_EQ(devapi::OpenReceiver(Name(L"COM7"), &handle), S_OK);
  EXPECT_EQ(handle, one.handle);
  EXPECT_THAT(report.Lines(), ElementsAre("OpenReceiver - ref [2] [COM7]"));
}

TEST(Registry, OpenFindsNothingByAnotherName) {
  const Registered one(L"COM7");
  int untouched = 0;
  void* handle = &untouched;
  EXPECT_EQ(devapi::OpenReceiver(Name(L"COM8"), &handle), S_FALSE);
  EXPECT_EQ(devapi::OpenReceiver(Name(L"com7"), &handle), S_FALSE);
  EXPECT_EQ(devapi::OpenReceiver(nullptr, &handle), S_FALSE);
  EXPECT_EQ(handle, &untouched);
}

TEST(Registry, ANullNameIsAnEmptyOne) {
  const Registered one(L"");
  void* handle = nullptr;
  EXPECT_EQ(devapi::OpenReceiver(nullptr, &handle), S_OK);
  EXPECT_EQ(handle, one.handle);
}

TEST(Registry, OpenWithoutAPlaceForTheHandleIsRefused) {
  EXPECT_EQ(devapi::OpenReceiver(Name(L"COM7"), nullptr), kInvalid);
}

TEST(Registry, OpenInAnEmptyRegistryFindsNothing) {
  void* handle = nullptr;
  EXPECT_EQ(devapi::OpenReceiver(Name(L"COM7"), &handle), S_FALSE);
}

TEST(Registry, CloseRemovesOneUserAndTheReceiverWithTheLast) {
  const ReportCapture report;
  const Registered one(L"COM7");
  void* handle = nullptr;
  devapi::OpenReceiver(Name(L"COM7"), &handle);
  EXPECT_EQ(devapi::CloseReceiver(handle), S_FALSE);
  EXPECT_TRUE(report.Has("CloseReceiver - ref [1] [COM7]"));
  EXPECT_FALSE(one.destroyed);
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
  EXPECT_TRUE(report.Has("CloseReceiver - removed [COM7]"));
  EXPECT_TRUE(one.destroyed);
  EXPECT_EQ(devapi::CloseReceiver(handle), kInvalid);
}

TEST(Registry, CloseAbortsBeforeItRemoves) {
  const ReportCapture report;
  const Registered one(L"COM7");
  std::vector<std::string> calls;
  bool removed_already = true;
  one.receiver->during = [&] {
    calls = one.receiver->calls;
    removed_already = report.Has("CloseReceiver - removed [COM7]");
  };
  EXPECT_EQ(devapi::CloseReceiver(one.handle), S_OK);
  EXPECT_THAT(calls, ElementsAre("Abort"));
  EXPECT_FALSE(removed_already);
}

TEST(Registry, CloseOfAnUnknownHandleIsReported) {
  const ReportCapture report;
  EXPECT_EQ(devapi::CloseReceiver(reinterpret_cast<void*>(0x1234)), kInvalid);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CloseReceiver - receiver not found [0x0000000000001234]"));
}

TEST(Registry, DestroyRemovesOneUserEachAndReportsOnlyRemovedReceivers) {
  const ReportCapture report;
  const Registered one(L"COM7");
  void* handle = nullptr;
  devapi::OpenReceiver(Name(L"COM7"), &handle);
  const size_t lines = report.Lines().size();
  EXPECT_EQ(devapi::DestroyReceiver(Name(L"COM7")), S_FALSE);
  EXPECT_EQ(report.Lines().size(), lines);
  EXPECT_FALSE(one.destroyed);
  EXPECT_EQ(devapi::DestroyReceiver(Name(L"COM7")), S_OK);
  EXPECT_TRUE(report.Has("DestroyReceiver - removed [COM7]"));
  EXPECT_TRUE(one.destroyed);
  EXPECT_EQ(devapi::DestroyReceiver(Name(L"COM7")), S_FALSE);
}

TEST(Registry, DestroyDoesNotAbortWhereNothingRuns) {
  const Registered one(L"COM7");
  bool called = false;
  one.receiver->during = [&] { called = true; };
  one.receiver->stopped = &called;
  EXPECT_EQ(devapi::DestroyReceiver(Name(L"COM7")), S_OK);
  EXPECT_FALSE(called);
}

TEST(Registry, DestroyRefusesANullNameAndMissesAnother) {
  EXPECT_EQ(devapi::DestroyReceiver(nullptr), kInvalid);
  const Registered one(L"COM7");
  EXPECT_EQ(devapi::DestroyReceiver(Name(L"com7")), S_FALSE);
  EXPECT_FALSE(one.destroyed);
}

TEST(Registry, TwoReceiversMayShareAName) {
  const Registered one(L"COM7");
  const Registered other(L"COM7");
  void* handle = nullptr;
  EXPECT_EQ(devapi::OpenReceiver(Name(L"COM7"), &handle), S_OK);
  EXPECT_TRUE(handle == one.handle || handle == other.handle);
  devapi::CloseReceiver(handle);
  // One call removes one receiver, then it stops.
  EXPECT_EQ(devapi::DestroyReceiver(Name(L"COM7")), S_OK);
  EXPECT_NE(one.destroyed, other.destroyed);
  EXPECT_EQ(devapi::DestroyReceiver(Name(L"COM7")), S_OK);
  EXPECT_TRUE(one.destroyed && other.destroyed);
}

TEST(Registry, DestroyRemovesAUserOfEachReceiverThatItPasses) {
  const Registered one(L"COM7");
  const Registered other(L"COM7");
  // A second user for the receiver that comes first. The other has one user and is removed by the
  // first call.
  void* first = nullptr;
  devapi::OpenReceiver(Name(L"COM7"), &first);
  EXPECT_EQ(devapi::DestroyReceiver(Name(L"COM7")), S_OK);
  EXPECT_EQ(one.destroyed, first != one.handle);
  EXPECT_EQ(other.destroyed, first != other.handle);
  // The call also removed a user of the first receiver. It has one left, so the next call removes
  // it.
  EXPECT_EQ(devapi::DestroyReceiver(Name(L"COM7")), S_OK);
  EXPECT_TRUE(one.destroyed && other.destroyed);
}

TEST(Registry, OperationsReachTheReceiverAndComeBackUnchanged) {
  const Registered one(L"COM7");
  one.receiver->result = 0x1234;
  void* const h = one.handle;
  short answer = 0;
  CReceiverInfo info{};
  EXPECT_EQ(devapi::GetReceiverInfo(h, nullptr, &info), 0x1234);
  EXPECT_EQ(devapi::CheckConnection(h, nullptr, &answer), 0x1234);
  EXPECT_EQ(devapi::LockConnection(h, nullptr), 0x1234);
  EXPECT_EQ(devapi::UnlockConnection(h), 0x1234);
  EXPECT_EQ(devapi::Abort(h), 0x1234);
  EXPECT_EQ(devapi::DownloadFile(h, nullptr, nullptr, nullptr), 0x1234);
  EXPECT_EQ(devapi::UploadFile(h, nullptr, nullptr, nullptr), 0x1234);
  EXPECT_EQ(devapi::DeleteFileW(h, nullptr), 0x1234);
  EXPECT_EQ(devapi::RenameFile(h, nullptr, nullptr), 0x1234);
  EXPECT_EQ(devapi::DCSetRcvBaudrate(h, 0), 0x1234);
  EXPECT_EQ(devapi::DCSetRcvParity(h, 0), 0x1234);
  EXPECT_EQ(devapi::DCSetRcvRTSControl(h, 0), 0x1234);
  EXPECT_EQ(devapi::DCSetRcvStopbits(h, 0), 0x1234);
  EXPECT_THAT(one.receiver->calls,
              ElementsAre("GetReceiverInfo",
                          "CheckConnection",
                          "LockConnection",
                          "UnlockConnection",
                          "Abort",
                          "DownloadFile",
                          "UploadFile",
                          "DeleteFile",
                          "RenameFile",
                          "DCSetRcvBaudrate",
                          "DCSetRcvParity",
                          "DCSetRcvRTSControl",
                          "DCSetRcvStopbits"));
}

TEST(Registry, UnknownHandlesAreRefusedEverywhere) {
  const ReportCapture report;
  short answer = 0;
  CReceiverInfo info{};
  void* list = nullptr;
  for (void* const h : {static_cast<void*>(nullptr), static_cast<void*>(&info)}) {
    EXPECT_EQ(devapi::GetReceiverInfo(h, nullptr, &info), kInvalid);
    EXPECT_EQ(devapi::CheckConnection(h, nullptr, &answer), kInvalid);
    EXPECT_EQ(devapi::LockConnection(h, nullptr), kInvalid);
    EXPECT_EQ(devapi::UnlockConnection(h), kInvalid);
    EXPECT_EQ(devapi::Abort(h), kInvalid);
    EXPECT_EQ(devapi::OpenFileList(h, &list), kInvalid);
    EXPECT_EQ(devapi::DownloadFile(h, nullptr, nullptr, nullptr), kInvalid);
    EXPECT_EQ(devapi::UploadFile(h, nullptr, nullptr, nullptr), kInvalid);
    EXPECT_EQ(devapi::DeleteFileW(h, nullptr), kInvalid);
    EXPECT_EQ(devapi::RenameFile(h, nullptr, nullptr), kInvalid);
    EXPECT_EQ(devapi::DCSetRcvBaudrate(h, 0), kInvalid);
    EXPECT_EQ(devapi::DCSetRcvParity(h, 0), kInvalid);
    EXPECT_EQ(devapi::DCSetRcvRTSControl(h, 0), kInvalid);
    EXPECT_EQ(devapi::DCSetRcvStopbits(h, 0), kInvalid);
  }
  EXPECT_THAT(report.Lines(), IsEmpty());
}

// The receiver outlives its removal for as long as a call is inside it.
TEST(Registry, ACallInFlightKeepsTheReceiverAlive) {
  for (const bool destroy : {false, true}) {
    const Registered one(L"COM7");
    const KernelHandle inside(CreateEventW(nullptr, TRUE, FALSE, nullptr));
    const KernelHandle go_on(CreateEventW(nullptr, TRUE, FALSE, nullptr));
    one.receiver->during = [&] {
      if (one.receiver->calls.back() == "Abort") return;  // by the removal, which does not wait
      SetEvent(inside.get());
      WaitForSingleObject(go_on.get(), INFINITE);
      EXPECT_FALSE(one.destroyed);
    };
    std::thread caller([&] {
      EXPECT_EQ(devapi::DownloadFile(one.handle, nullptr, nullptr, nullptr), S_OK);
      EXPECT_TRUE(one.destroyed);
    });
    WaitForSingleObject(inside.get(), INFINITE);
    EXPECT_EQ(destroy ? devapi::DestroyReceiver(Name(L"COM7")) : devapi::CloseReceiver(one.handle),
              S_OK);
    EXPECT_FALSE(one.destroyed);
    // From here only this test can end the call.
    EXPECT_THAT(one.receiver->calls, ElementsAre("DownloadFile", destroy ? "Stop" : "Abort"));
    EXPECT_EQ(devapi::Abort(one.handle), kInvalid);
    SetEvent(go_on.get());
    caller.join();
  }
}

TEST(GetConnection, IsNotOfferedAndWritesNothing) {
  auto* connection = reinterpret_cast<CIConnection*>(0x10);
  EXPECT_EQ(GetConnection(Name(L"COM7"), eInstanceSerial, &connection),
            static_cast<HRESULT>(0x80004001));
  EXPECT_EQ(connection, reinterpret_cast<CIConnection*>(0x10));
  EXPECT_EQ(GetConnection(nullptr, static_cast<EInstanceType>(3), nullptr),
            static_cast<HRESULT>(0x80004001));
}

}  // namespace
