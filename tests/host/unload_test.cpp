// Loading and unloading the library leaves nothing in the host.
#include <gtest/gtest.h>
#include <windows.h>

#include <atomic>
#include <functional>
#include <list>
#include <string>
#include <utility>
#include <vector>

#include "tests/host/support/library_copy.h"
#include "tests/host/support/receiver.h"
#include "tests/races/options.h"
#include "tests/support/resources.h"

namespace {

// A plain Win32 thread: what the C++ runtime of this program keeps for its own threads would be
// counted as the library's.
class Thread {
 public:
  explicit Thread(std::function<void()> function) : function_(std::move(function)) {}
  Thread(const Thread&) = delete;
  Thread& operator=(const Thread&) = delete;
  // Waits for the end.
  ~Thread() {
    WaitForSingleObject(handle_, INFINITE);
    CloseHandle(handle_);
  }

 private:
  static DWORD WINAPI Run(void* self) {
    static_cast<Thread*>(self)->function_();
    return 0;
  }

  std::function<void()> function_;
  HANDLE handle_ = CreateThread(nullptr, 0, Run, this, 0, nullptr);
};

class ApiUnload : public testing::Test {
 protected:
  // Every third time an exception is raised inside.
  void LoadAndUnload(int times) {
    constexpr int kRaiseEvery = 3;
    for (int i = 0; i < times; ++i) {
      ASSERT_TRUE(copy_.Load()) << i;
      if (i % kRaiseEvery == 0) {
        ASSERT_TRUE(copy_.FailToOpen(missing_)) << i;
      }
      copy_.Unload();
    }
  }
  void LoadAndUnloadOnThread(int times) {
    const Thread thread([this, times] { LoadAndUnload(times); });
  }

  host::LibraryCopy copy_;
  const bed::PortLease lease_;
  const std::string port_ = lease_.name();
  const std::wstring missing_{port_.begin(), port_.end()};
};

TEST_F(ApiUnload, ResourcesAreCounted) {
  const Resources before = CountResources();
  const size_t bytes_before = HeapBytes();
  const host::Event event;
  const DWORD tls_slot = TlsAlloc();
  const DWORD fls_slot = FlsAlloc(nullptr);
  const std::vector<char> bytes(1000);
  EXPECT_GE(HeapBytes(), bytes_before + bytes.size());
  EXPECT_EQ(CountResources(),
            (Resources{.handles = before.handles + 1,
                       .free_tls_slots = before.free_tls_slots - 1,
                       .free_fls_slots = before.free_fls_slots - 1}));
  TlsFree(tls_slot);
  FlsFree(fls_slot);
  EXPECT_GT(before.free_tls_slots, 0U);
  EXPECT_GT(before.free_fls_slots, 0U);
}

TEST_F(ApiUnload, LeavesNothingOfManyTimes) {
  constexpr int kFirstTimes = 3;  // the system keeps something of a first time
  constexpr size_t kSmall = 16384;
  constexpr size_t kSmallSet = 256 * 1024;
  // More than a process has TLS slots.
  const int times = static_cast<int>(1200 * races::Times());
  LoadAndUnload(kFirstTimes);
  LoadAndUnloadOnThread(kFirstTimes);
  const Resources before = CountResources();
  const size_t bytes_before = HeapBytes();
  const size_t set_before = WorkingSetBytes();

  LoadAndUnload(times);
  EXPECT_EQ(CountResources(), before);
  LoadAndUnloadOnThread(times);
  EXPECT_EQ(CountResources(), before);
  EXPECT_LT(HeapBytes(), bytes_before + kSmall);
  EXPECT_LT(WorkingSetBytes(), set_before + kSmallSet);
}

// What the library keeps for a thread that raised an exception is freed when the library is
// unloaded; the end of the thread does not use it.
TEST_F(ApiUnload, LeavesNothingForThreadsThatLiveOn) {
  constexpr int kThreads = 20;
  const auto unload_under_threads = [this] {
    ASSERT_TRUE(copy_.Load());
    std::atomic<int> still_to_raise = kThreads;
    host::Event all_raised;
    host::Event unloaded;
    std::list<Thread> threads;
    for (int i = 0; i < kThreads; ++i) {
      threads.emplace_back([&] {
        EXPECT_TRUE(copy_.FailToOpen(missing_));
        if (--still_to_raise == 0) all_raised.Set();
        WaitForSingleObject(unloaded.get(), INFINITE);
      });
    }
    WaitForSingleObject(all_raised.get(), INFINITE);
    copy_.Unload();
    unloaded.Set();
  };
  unload_under_threads();
  const Resources before = CountResources();
  unload_under_threads();
  EXPECT_EQ(CountResources(), before);
}

// What it keeps for a thread that raised an exception is freed when the thread ends.
TEST_F(ApiUnload, ThreadsThatRaisedLeaveNothing) {
  constexpr int kThreads = 200;
  constexpr size_t kLeastOfAThread = 8;
  const auto raise_on_thread = [this] {
    const Thread thread([this] { EXPECT_TRUE(copy_.FailToOpen(missing_)); });
  };
  ASSERT_TRUE(copy_.Load());
  raise_on_thread();
  raise_on_thread();
  const Resources before = CountResources();
  const size_t bytes_before = HeapBytes();
  for (int i = 0; i < kThreads; ++i) raise_on_thread();
  EXPECT_EQ(CountResources(), before);
  EXPECT_LT(HeapBytes(), bytes_before + kThreads * kLeastOfAThread);
}

}  // namespace
