// The n-th allocation, call to the port's driver, call that makes an event, a mutex or a text, or write to the host's stream fails,
// for every n of a whole session. Whatever fails: the results say so, nothing stays behind, the lock is free, and
// both the next operation and the next session work.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <string>
#include <vector>

#include "platform/hresult.h"
#include "tests/support/allocations.h"
#include "tests/support/report_capture.h"
#include "tests/support/resources.h"
#include "tests/torture/session.h"
#include "tests/torture/system_objects.h"

namespace torture {
namespace {

// A host's stream: what it allocates is not the library's.
class HostStream : public MemoryStream {
 public:
  HRESULT STDMETHODCALLTYPE Write(const void* data, ULONG size, ULONG* written) override {
    const UncountedAllocations own;
    return MemoryStream::Write(data, size, written);
  }
};

// What fails.
enum class Event { kAllocation, kCall, kCallOfPending, kWrite, kObject };
constexpr std::array<const char*, 5> kEvents = {
    "allocation ", "call ", "call of pending ", "write ", "object "};

#if __has_feature(address_sanitizer)
constexpr bool kCountsAllocations = false;  // libstdc++.so makes a part of them
#else
constexpr bool kCountsAllocations = true;
#endif

constexpr long FailureOfCalls() { return rcvlink::HResultFromError(FaultyCalls::kError); }

// A session whose n-th event fails, on a receiver of its own.
struct Trial {
  Trial(const Link& link, Event event, size_t n, LockProbe& locks)
      : bench(link), event(event), n(n), link(link) {
    if (event == Event::kCall || event == Event::kCallOfPending) bench.calls().failing = n;
    if (event == Event::kCallOfPending) bench.MakePending();
    if (event == Event::kWrite) stream.fail_at_write = n;
    const Watch watch{locks, [this] { return HasFailed(); }};
    const Allocations allocations(event == Event::kAllocation ? n : Allocations::kNone);
    const SystemObjects objects(event == Event::kObject ? n : SystemObjects::kNone);
    session.Run(link, &stream, /*removes=*/true, &watch);
    live = Allocations::Live();
    has_failed = HasFailed();
  }

  bool HasFailed() const {
    if (event == Event::kAllocation) return Allocations::HasFailed();
    if (event == Event::kObject) return SystemObjects::HasFailed();
    return event == Event::kWrite ? stream.writes > n : bench.calls().count > n;
  }

  // Whether the fault was met while the speed was raised or set back, so that the ends of the line
  // have different speeds now. Only another search can find the receiver then.
  bool IsCut() const { return session.failed_in == "download" && !bench.IsInTune(); }

  std::string InWords() const {
    return session.InWords() + ", " + kEvents.at(static_cast<size_t>(event)) + std::to_string(n) +
           " failed " + bench.calls().failed + SystemObjects::Failed();
  }

  Bench bench;
  HostStream stream;
  Session session;
  Event event;
  size_t n;
  Link link;
  ptrdiff_t live = 0;
  bool has_failed = false;  // false: there was no such event
};

class Torture : public testing::TestWithParam<Link> {
 protected:
  struct Counts {
    size_t trials = 0;
    size_t cut = 0;  // of these, how many cut the line
  };

  // Runs sessions whose n-th event fails until a session has no such event. `codes` are those of the
  // operations that fail.
  Counts FailEach(Event event, const std::vector<long>& codes) {
    {
      // What the process keeps is made by the first session, and by the first exception.
      Bench bench(GetParam());
      ExpectWhole("no fault");
      EXPECT_THROW(rcvlink::ThrowIfFailed(E_FAIL), rcvlink::HResultError);
    }
    const size_t handles = HandleCount();
    Counts counts;
    for (bool has_failed = true; has_failed && !HasFailure(); ++counts.trials) {
      Trial trial(GetParam(), event, counts.trials, locks_);
      trial.bench.calls().failing = SIZE_MAX;
      has_failed = trial.has_failed;
      if (trial.IsCut()) ++counts.cut;
      EXPECT_TRUE(has_failed || trial.session.IsWhole(trial.stream.bytes)) << trial.InWords();
      if (kCountsAllocations) {
        EXPECT_EQ(trial.live, 0) << trial.InWords();
      }
      ExpectFailuresAre(codes, trial);
      ExpectHonest(trial);
      ExpectUsable(trial);
      ExpectWhole(trial.InWords());
    }
    EXPECT_EQ(HandleCount(), handles);
    return counts;
  }

 private:
  // A session without a fault, on a receiver that has served others.
  static void ExpectWhole(const std::string& after) {
    HostStream stream;
    Session session;
    session.Run(GetParam(), &stream, /*removes=*/false);
    EXPECT_TRUE(session.IsWhole(stream.bytes)) << session.InWords() << ", " << after;
  }

  // Every operation succeeded or failed with one of these codes. Nothing is aborted, so only a search may end with
  // S_FALSE: it has found nothing.
  static void ExpectFailuresAre(const std::vector<long>& codes, const Trial& trial) {
    const Session& session = trial.session;
    const auto is_expected = [&](long result) {
      return result == S_OK || std::ranges::find(codes, result) != codes.end();
    };
    EXPECT_TRUE(session.search == S_FALSE || is_expected(session.search)) << trial.InWords();
    for (const long result :
         {session.info, session.list.result, session.download, session.remove, session.close}) {
      EXPECT_TRUE(result == kNotCalled || is_expected(result)) << trial.InWords();
    }
  }

  // What a host may rely on when the result is S_OK, and of the bytes in any case.
  static void ExpectHonest(const Trial& trial) {
    const Session& session = trial.session;
    const bool is_velmar = GetParam().family == eProtocolVelmar;
    const std::string content = Bench::FileContent();
    EXPECT_TRUE(content.starts_with(trial.stream.bytes)) << trial.InWords();
    EXPECT_NE(session.search, kNotCalled);
    if (session.info == S_OK) {
      EXPECT_TRUE(session.has_texts) << trial.InWords();
    }
    if (session.list.result == S_OK) {
      EXPECT_EQ(session.list.count, Bench::kFiles) << trial.InWords();
      EXPECT_TRUE(session.list.are_files) << trial.InWords();
    }
    // Only Velmar receivers, and streams that fail on a serial port, give S_OK for a part of a file.
    const bool stream_failed = trial.event == Event::kWrite;
    if (session.download == S_OK && !is_velmar && !stream_failed) {
      EXPECT_EQ(trial.stream.bytes, content) << trial.InWords();
    }
    // A Velmar receiver that cannot be reached gives S_OK, as one that refuses does.
    if (session.remove == S_OK && !trial.IsCut()) {
      EXPECT_FALSE(trial.bench.HasFile("B.LOG")) << trial.InWords();
    }
    // A stream is the business of the download alone.
    if (stream_failed) {
      EXPECT_EQ(session.remove, S_OK) << trial.InWords();
    }
    // A receiver that was not found was not closed.
    EXPECT_EQ(session.close, session.info == kNotCalled ? kNotCalled : S_OK) << trial.InWords();
  }

  // The lock was free after each operation, and the next one worked.
  static void ExpectUsable(const Trial& trial) {
    const Session& session = trial.session;
    EXPECT_EQ(session.wrong_lock, "") << trial.InWords();
    if (session.failed_in.empty()) return;
    if (trial.IsCut()) {
      ExpectUnreachable(trial);
      return;
    }
    EXPECT_EQ(session.next.result, S_OK) << trial.InWords();
    EXPECT_EQ(session.next.count,
              session.failed_in == "delete" ? trial.bench.CountFiles() : Bench::kFiles)
        << trial.InWords();
    EXPECT_TRUE(session.next.are_files) << trial.InWords();
  }

  // The next operation ends as it does when no receiver answers. The directory of a Velmar receiver
  // is empty then.
  static void ExpectUnreachable(const Trial& trial) {
    const bool is_velmar = GetParam().family == eProtocolVelmar;
    EXPECT_EQ(trial.session.next.result, is_velmar ? S_OK : rcvlink::kTimedOut) << trial.InWords();
    EXPECT_EQ(trial.session.next.count, 0) << trial.InWords();
  }

  LockProbe locks_;
};

class TortureOfCalls : public Torture {
 protected:
  // The most faults that cut the line: the calls of two settings of the speed, and of the answers to
  // the commands before them.
  void FailEveryCall(Event event, size_t most_cut) {
    const Counts counts =
        FailEach(event, {FailureOfCalls(), rcvlink::kNotConnected, rcvlink::kTimedOut});
    EXPECT_GT(counts.trials, 51U);
    EXPECT_LE(counts.cut, GetParam().instance == eInstanceUSB ? 0U : most_cut);
  }
};

TEST_P(TortureOfCalls, EveryCallMayFail) { FailEveryCall(Event::kCall, 8); }

// Those of a driver that ends no write and no request at once.
TEST_P(TortureOfCalls, EveryCallOfPendingTransfersMayFail) {
  FailEveryCall(Event::kCallOfPending, 12);
}

TEST_P(Torture, EveryWriteToTheStreamMayFail) {
  const Counts counts = FailEach(Event::kWrite, {STG_E_MEDIUMFULL});
  EXPECT_GT(counts.trials, 2U);
  EXPECT_EQ(counts.cut, 0U);
}

class TortureOfObjects : public Torture {};

// Events, mutexes and texts.
TEST_P(TortureOfObjects, EveryObjectMayFail) {
  const Counts counts =
      FailEach(Event::kObject, {E_OUTOFMEMORY, rcvlink::HResultFromError(ERROR_NOT_ENOUGH_MEMORY)});
  EXPECT_GT(counts.trials, 10U);
  EXPECT_EQ(counts.cut, 0U);
}

class TortureOfMemory : public Torture {
 protected:
  void FailEveryAllocation() {
    // A reply that cannot be kept counts as one that has not come.
    const Counts counts = FailEach(Event::kAllocation, {E_OUTOFMEMORY, rcvlink::kTimedOut});
    EXPECT_GT(counts.trials, 25U);
    EXPECT_LE(counts.cut, GetParam().instance == eInstanceUSB ? 0U : 2U);
  }
};

TEST_P(TortureOfMemory, EveryAllocationMayFail) { FailEveryAllocation(); }

TEST_P(TortureOfMemory, EveryAllocationMayFailWithAReport) {
  const ReportCapture report;
  FailEveryAllocation();
}

std::string NameOf(const testing::TestParamInfo<Link>& info) { return info.param.name; }

INSTANTIATE_TEST_SUITE_P(Links, Torture, testing::ValuesIn(kLinks), NameOf);
INSTANTIATE_TEST_SUITE_P(Links, TortureOfCalls, testing::ValuesIn(kLinks), NameOf);
INSTANTIATE_TEST_SUITE_P(Links, TortureOfObjects, testing::ValuesIn(kLinks), NameOf);
INSTANTIATE_TEST_SUITE_P(Links, TortureOfMemory, testing::ValuesIn(kLinks), NameOf);

}  // namespace
}  // namespace torture
