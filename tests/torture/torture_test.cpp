// The n-th allocation, Win32 call or write to the host's stream fails, for every n of a whole
// session. Whatever fails: the results say so, nothing stays behind, and the next session works.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <initializer_list>
#include <string>

#include "platform/hresult.h"
#include "tests/support/allocations.h"
#include "tests/support/report_capture.h"
#include "tests/support/resources.h"
#include "tests/torture/session.h"

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

class Torture : public testing::TestWithParam<Link> {
 protected:
  // A session without a fault, on a receiver that has served others.
  static void ExpectWhole(const std::string& after) {
    HostStream stream;
    Session session;
    session.Run(GetParam(), &stream, false);
    EXPECT_TRUE(session.IsWhole(stream.bytes)) << session.InWords() << ", " << after;
  }

  // What a host may rely on, whatever failed.
  static void ExpectHonest(const Session& session,
                           const std::string& bytes,
                           const std::string& fault,
                           bool stream_failed = false) {
    const std::string content = Bench::FileContent();
    EXPECT_TRUE(content.starts_with(bytes)) << fault;
    EXPECT_NE(session.search, Session::kNotCalled);
    // Only Velmar receivers, and streams that fail on a serial port, give S_OK for a part of a file.
    if (session.download == S_OK && GetParam().family == eProtocolQuorin && !stream_failed) {
      EXPECT_EQ(bytes, content) << session.InWords() << ", " << fault;
    }
    // A receiver that was not found was not closed.
    EXPECT_EQ(session.close, session.info == Session::kNotCalled ? Session::kNotCalled : S_OK)
        << session.InWords() << ", " << fault;
  }
};

// Every operation succeeded or failed with one of these codes.
void ExpectFailuresAre(const Session& session,
                       std::initializer_list<long> codes,
                       const std::string& fault) {
  for (const long result : {session.search,
                            session.info,
                            session.list,
                            session.download,
                            session.remove,
                            session.close}) {
    EXPECT_TRUE(result >= 0 || std::ranges::find(codes, result) != codes.end())
        << session.InWords() << ", " << fault;
  }
}

constexpr long FailureOfCalls() { return rcvlink::HResultFromError(FaultyCalls::kError); }

// Runs sessions whose n-th event fails until a session has no such event. `arm` sets the number on
// the calls and the stream, `has_failed` says whether it came to it.
void ForEveryFault(
    const Link& link,
    const std::function<void(size_t n, FaultyCalls& calls, HostStream& stream)>& arm,
    const std::function<bool(size_t n, const FaultyCalls& calls, const HostStream& stream)>& failed,
    const std::function<void(const Session&, const HostStream&, size_t n)>& check) {
  for (size_t n = 0;; ++n) {
    Bench bench(link);
    HostStream stream;
    arm(n, bench.calls(), stream);
    Session session;
    session.Run(link, &stream, true);
    const bool has_failed = failed(n, bench.calls(), stream);
    bench.calls().failing = SIZE_MAX;
    check(session, stream, n);
    if (testing::Test::HasFailure() || !has_failed) return;
  }
}

TEST_P(Torture, EveryWin32CallMayFail) {
  {
    // What the process keeps is made by the first session, and by the first exception.
    Bench bench(GetParam());
    ExpectWhole("no fault");
    EXPECT_THROW(rcvlink::ThrowIfFailed(E_FAIL), rcvlink::HResultError);
  }
  const size_t handles = HandleCount();
  size_t faults = 0;
  ForEveryFault(
      GetParam(),
      [](size_t n, FaultyCalls& calls, HostStream&) { calls.failing = n; },
      [](size_t n, const FaultyCalls& calls, const HostStream&) { return calls.count > n; },
      [&](const Session& session, const HostStream& stream, size_t n) {
        const std::string fault = "call " + std::to_string(n) + " failed";
        faults = n;
        ExpectHonest(session, stream.bytes, fault);
        ExpectFailuresAre(
            session, {FailureOfCalls(), rcvlink::kNotConnected, rcvlink::kTimedOut}, fault);
        ExpectWhole(fault);
      });
  EXPECT_GT(faults, 50U);
  EXPECT_EQ(HandleCount(), handles);
}

TEST_P(Torture, EveryWriteToTheStreamMayFail) {
  size_t faults = 0;
  ForEveryFault(
      GetParam(),
      [](size_t n, FaultyCalls&, HostStream& stream) { stream.fail_at_write = n; },
      [](size_t n, const FaultyCalls&, const HostStream& stream) { return stream.writes > n; },
      [&](const Session& session, const HostStream& stream, size_t n) {
        const std::string fault = "write " + std::to_string(n) + " failed";
        faults = n;
        ExpectHonest(session, stream.bytes, fault, n < stream.writes);
        EXPECT_EQ(session.remove, S_OK) << fault;
        ExpectWhole(fault);
      });
  EXPECT_GE(faults, 2U);
}

class TortureOfMemory : public Torture {
 protected:
  static void FailEveryAllocation() {
    {
      // Tables that grow once are allocated before.
      Bench bench(GetParam());
      ExpectWhole("no fault");
    }
    const size_t handles = HandleCount();
    size_t n = 0;
    for (bool has_failed = true; has_failed && !HasFailure(); ++n) {
      const std::string fault = "allocation " + std::to_string(n) + " failed";
      Bench bench(GetParam());
      HostStream stream;
      Session session;
      ptrdiff_t live = 0;
      {
        const Allocations allocations(n);
        session.Run(GetParam(), &stream, true);
        has_failed = Allocations::HasFailed();
        live = Allocations::Live();
      }
      EXPECT_EQ(live, 0) << session.InWords() << ", " << fault;
      ExpectHonest(session, stream.bytes, fault);
      // A reply that cannot be kept counts as one that has not come.
      ExpectFailuresAre(session, {E_OUTOFMEMORY, rcvlink::kTimedOut}, fault);
      EXPECT_TRUE(has_failed || session.IsWhole(stream.bytes)) << session.InWords();
      ExpectWhole(fault);
    }
    EXPECT_GT(n, 25U);
    EXPECT_EQ(HandleCount(), handles);
  }
};

TEST_P(TortureOfMemory, EveryAllocationMayFail) { FailEveryAllocation(); }

TEST_P(TortureOfMemory, EveryAllocationMayFailWithAReport) {
  const ReportCapture report;
  FailEveryAllocation();
}

std::string NameOf(const testing::TestParamInfo<Link>& info) { return info.param.name; }

INSTANTIATE_TEST_SUITE_P(Links, Torture, testing::ValuesIn(kLinks), NameOf);
INSTANTIATE_TEST_SUITE_P(Links, TortureOfMemory, testing::ValuesIn(kLinks), NameOf);

}  // namespace
}  // namespace torture
