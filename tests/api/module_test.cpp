// DllMain is called here as Windows calls it when the DLL is loaded and unloaded.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <exception>
#include <memory>
#include <string>

#include "api/registry.h"
#include "platform/hresult.h"
#include "platform/text.h"
#include "tests/support/report_capture.h"
#include "tests/support/resources.h"
#include "tests/support/stub_receiver.h"

using rcvlink::Receivers;

extern "C" BOOL WINAPI DllMain(HINSTANCE module, DWORD reason, void* process_ends);

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;

constexpr HRESULT kInvalid = static_cast<HRESULT>(0x80070057);

int any = 0;

// What Windows passes for a process that ends.
void* ProcessEnds() { return &any; }

size_t FreeFiberSlots() { return CountResources().free_fls_slots; }

TEST(Module, LoadWritesThePathAndTheProductVersion) {
  const ReportCapture report;
  EXPECT_TRUE(DllMain(GetModuleHandleW(L"kernel32.dll"), DLL_PROCESS_ATTACH, nullptr));
  EXPECT_THAT(report.Lines(),
              ElementsAre(MatchesRegex(
                  "Module is loaded \\[.*kernel32\\.dll\\] \\[\\d+\\.\\d+\\.\\d+\\.\\d+\\]")));
}

TEST(Module, LoadOfAModuleWithoutAVersionWritesNothing) {
  const ReportCapture report;
  EXPECT_TRUE(DllMain(GetModuleHandleW(nullptr), DLL_PROCESS_ATTACH, nullptr));
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST(Module, LoadOfAModuleWithoutAPathWritesNothing) {
  const ReportCapture report;
  const auto no_module = reinterpret_cast<HINSTANCE>(&any);
  EXPECT_TRUE(DllMain(no_module, DLL_PROCESS_ATTACH, nullptr));
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST(Module, UnloadClosesWhatTheHostLeftOpen) {
  bool destroyed = false;
  auto receiver = std::make_shared<StubReceiver>();
  receiver->destroyed = &destroyed;
  receiver->fill = [](CFileList&) {};
  void* handle = nullptr;
  ASSERT_EQ(Receivers().Insert(L"COM7", std::move(receiver), &handle), S_OK);
  void* list = nullptr;
  ASSERT_EQ(devapi::OpenFileList(handle, &list), S_OK);
  const ReportCapture report;
  EXPECT_TRUE(DllMain(nullptr, DLL_PROCESS_DETACH, nullptr));
  EXPECT_THAT(report.Lines(), ElementsAre("Bye!"));
  EXPECT_TRUE(destroyed);
  EXPECT_EQ(devapi::CloseReceiver(handle), kInvalid);
  EXPECT_EQ(devapi::CloseFileList(list), kInvalid);
}

// Another thread may have been stopped in the middle of an allocation.
TEST(Module, UnloadFreesTheExceptionStateUnlessTheProcessEnds) {
  EXPECT_EQ(std::uncaught_exceptions(), 0);  // makes the state
  const size_t slots = FreeFiberSlots();
  EXPECT_TRUE(DllMain(nullptr, DLL_PROCESS_DETACH, ProcessEnds()));
  EXPECT_EQ(FreeFiberSlots(), slots);
  EXPECT_TRUE(DllMain(nullptr, DLL_PROCESS_DETACH, nullptr));
  EXPECT_EQ(FreeFiberSlots(), slots + 1);
}

TEST(Module, ThreadsOfTheHostChangeNothing) {
  const ReportCapture report;
  EXPECT_EQ(std::uncaught_exceptions(), 0);
  const size_t slots = FreeFiberSlots();
  EXPECT_TRUE(DllMain(nullptr, DLL_THREAD_ATTACH, nullptr));
  EXPECT_TRUE(DllMain(nullptr, DLL_THREAD_DETACH, nullptr));
  EXPECT_THAT(report.Lines(), IsEmpty());
  EXPECT_EQ(FreeFiberSlots(), slots);
}

}  // namespace
