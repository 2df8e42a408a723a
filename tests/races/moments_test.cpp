// An operation of a receiver runs on one thread, and others abort, close and ask at random moments.
//
// The clock is moved by hand, so a moment is a place in the operation: a call to the port, a write
// to the stream, a percent.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "api/registry.h"
#include "platform/handle.h"
#include "platform/text.h"
#include "tests/races/options.h"
#include "tests/support/report_capture.h"
#include "tests/support/resources.h"
#include "tests/torture/session.h"

using torture::Bench;
using torture::Link;

namespace races {
namespace {

// Moments that meet each operation while it runs, on all links together: ten thousand of all.
constexpr size_t kMetOfEach = 1112;
constexpr uint64_t kFirstRounds = 50;
constexpr uint64_t kReportEvery = 8;  // a round has a report
constexpr DWORD kHungMs = 60'000;

enum class Operation { kSearch, kInfo, kCheck, kList, kDownload, kDelete, kRename, kPort, kLock };
constexpr std::array<const char*, 9> kOperations = {
    "search", "info", "check", "list", "download", "delete", "rename", "port setting", "lock"};

// What another thread does.
enum class Act { kAbort, kClose, kDestroy, kUnlock, kInfo, kOpen };
constexpr std::array<const char*, 6> kActs = {
    "Abort", "Close", "Destroy", "Unlock", "Info", "Open"};

// How the other threads meet the operation: at each of their places it stands still until they have
// acted, or it goes on while they act, or they act after random times from its beginning.
enum class Meeting { kWaitedFor, kReleased, kFree };
constexpr std::array<const char*, 3> kMeetings = {"waited for", "released", "free"};
// One is drawn as often as it is here.
constexpr std::array kDrawnMeetings = {
    Meeting::kWaitedFor, Meeting::kWaitedFor, Meeting::kReleased, Meeting::kFree};

struct Moment {
  Act act{};
  size_t place = 0;
  unsigned pause = 0;  // when it is free, in turns of a loop
};
using Moments = std::vector<Moment>;

constexpr std::array kEnds = {Act::kAbort, Act::kClose, Act::kDestroy};
constexpr std::array kHarmless = {Act::kUnlock, Act::kInfo, Act::kOpen};

bool Ends(Act act) { return act == Act::kAbort || act == Act::kClose || act == Act::kDestroy; }

class Event {
 public:
  explicit Event(bool signalled = false)
      : event_(CreateEventW(nullptr, TRUE, signalled, nullptr)) {}
  void Set() { SetEvent(event_.get()); }
  HANDLE get() const { return event_.get(); }

 private:
  rcvlink::KernelHandle event_;
};

// How far the operation has come, and the others. Locks and condition variables of Win32: under
// Wine an event takes ten times as long.
class Progress {
 public:
  void Reach(size_t place) {
    Change([&] { reached_ = place; });
  }
  void EndMoment() {
    Change([&] { ++ended_; });
  }
  // False: it took too long.
  bool WaitForPlace(size_t place) {
    return WaitFor([&] { return reached_ >= place; });
  }
  bool WaitForMoments(size_t count) {
    return WaitFor([&] { return ended_ >= count; });
  }

 private:
  template <typename Function>
  void Change(Function function) {
    AcquireSRWLockExclusive(&lock_);
    function();
    ReleaseSRWLockExclusive(&lock_);
    WakeAllConditionVariable(&changed_);
  }
  template <typename Condition>
  bool WaitFor(Condition condition) {
    AcquireSRWLockExclusive(&lock_);
    bool in_time = true;
    while (in_time && !condition()) {
      in_time = SleepConditionVariableSRW(&changed_, &lock_, kHungMs, 0) != FALSE;
    }
    ReleaseSRWLockExclusive(&lock_);
    return in_time;
  }

  SRWLOCK lock_ = SRWLOCK_INIT;
  CONDITION_VARIABLE changed_ = CONDITION_VARIABLE_INIT;
  size_t reached_ = 0;  // a place, and one more
  size_t ended_ = 0;    // moments
};

// What is drawn for one round.
struct Plan {
  uint64_t round = 0;
  Operation operation{};
  size_t places = 0;  // of the operation, when nobody disturbs it
  Meeting meeting{};
  std::vector<Moments> threads;
  bool reports = false;

  size_t Count(const std::function<bool(const Moment&)>& condition) const {
    size_t count = 0;
    for (const Moments& moments : threads) {
      count += static_cast<size_t>(std::ranges::count_if(moments, condition));
    }
    return count;
  }
  size_t MomentsAt(size_t place) const {
    return Count([&](const Moment& moment) { return moment.place == place; });
  }
  size_t MomentsTo(size_t place) const {
    return Count([&](const Moment& moment) { return moment.place <= place; });
  }
  bool HasEnd() const {
    return Count([](const Moment& moment) { return Ends(moment.act); }) != 0;
  }
  // The place of an abort that nothing else can end the operation before, while it stands there. At
  // the last place it may come too late.
  std::optional<size_t> AbortedAt() const {
    const auto ends = [](const Moment& moment) { return Ends(moment.act); };
    if (meeting != Meeting::kWaitedFor || Count(ends) != 1) return std::nullopt;
    for (const Moments& moments : threads) {
      const auto end = std::ranges::find_if(moments, ends);
      if (end == moments.end()) continue;
      if (end->act == Act::kAbort && end->place + 1 < places) return end->place;
    }
    return std::nullopt;
  }
  std::string InWords(const Link& link) const {
    std::string text = "seed " + std::to_string(Seed()) + ", round " + std::to_string(round) +
                       ": " + link.name + ", " + kOperations.at(static_cast<size_t>(operation)) +
                       ", " + kMeetings.at(static_cast<size_t>(meeting));
    for (const Moments& moments : threads) {
      text += ":";
      for (const auto& [act, place, pause] : moments) {
        text += std::string(" ") + kActs.at(static_cast<size_t>(act)) + " at " +
                std::to_string(meeting == Meeting::kFree ? pause : place);
      }
    }
    return text;
  }
};

// A round: the operation, the other threads, and what must be true after them.
class Round {
 public:
  Round(const Link& link, const Plan& plan) : link_(link), plan_(plan), bench_(link) {
    bench_.calls().on_call = [this] { Pass(); };
  }

  // The places of the operation.
  size_t Run() {
    if (plan_.operation != Operation::kSearch) {
      EXPECT_EQ(Search(link_.family, nullptr), S_OK);
      receiver_ = rcvlink::Receivers().Find(handle_);
    }
    for (const Moments& moments : plan_.threads) {
      others_.push_back(std::make_unique<Other>());
      Other& other = *others_.back();
      other.thread = std::thread([this, &other, &moments] { RunOther(other, moments); });
    }
    while (ready_ < others_.size()) SwitchToThread();
    is_operating_ = true;
    has_begun_ = true;
    Operate();
    is_operating_ = false;
    over_.Set();
    progress_.Reach(kOver);
    for (const auto& other : others_) other->thread.join();
    Check();
    return places_;
  }

  // The acts that came while the operation ran.
  size_t met() const { return met_; }

 private:
  struct Result {
    Act act;
    long value;
  };
  struct Other {
    std::thread thread;
    std::vector<Result> results;
  };
  // Also a place.
  class Stream : public MemoryStream {
   public:
    explicit Stream(Round& round) : round_(round) {}
    HRESULT STDMETHODCALLTYPE Write(const void* data, ULONG size, ULONG* written) override {
      if (round_.was_aborted_) ++round_.writes_after_abort_;
      round_.Pass();
      return MemoryStream::Write(data, size, written);
    }

   private:
    Round& round_;
  };

  // A hang ends the program: its threads cannot be ended otherwise.
  void Hang(const char* what) const {
    std::printf("%s: %s\n", what, plan_.InWords(link_).c_str());
    std::fflush(stdout);
    std::_Exit(1);
  }

  // A place of the thread that operates, or another thread in the port. The port is one thread's at
  // a time, and no thread's but the operation's while that stands at a place.
  void Pass() {
    if (is_at_place_.exchange(true)) {
      met_in_port_ = true;
      return;
    }
    if (GetCurrentThreadId() == worker_ && is_operating_) {
      const size_t place = places_++;
      if (plan_.meeting != Meeting::kFree && plan_.MomentsAt(place) != 0) {
        progress_.Reach(place + 1);
        if (plan_.meeting == Meeting::kWaitedFor &&
            !progress_.WaitForMoments(plan_.MomentsTo(place))) {
          Hang("the others did not end");
        }
        was_aborted_ = was_aborted_ || plan_.AbortedAt() == place;
      }
    }
    is_at_place_ = false;
  }

  long Search(EProtocol family, HANDLE event) {
    void* handle = nullptr;
    const long result =
        devapi::SearchReceiver(link_.port(), link_.instance, family, event, &handle);
    if (handle) handle_ = handle;
    if (handle) ++users_;
    return result;
  }

  void Operate() {
    wchar_t name[] = L"A.LOG";
    wchar_t other_name[] = L"B.LOG";
    wchar_t new_name[] = L"D.LOG";
    void* const handle = handle_;
    switch (plan_.operation) {
      case Operation::kSearch:
        allowed_ = {S_OK, S_FALSE};
        result_ = Search(eProtocolAny, search_abort_.get());
        return;
      case Operation::kInfo: {
        CReceiverInfo info{};
        result_ = devapi::GetReceiverInfo(handle, nullptr, &info);
        const rcvlink::UniqueBstr id(info.bstrReceiverId);
        const rcvlink::UniqueBstr model(info.bstrModel);
        is_complete_ = id && model;
        if (result_ != S_OK) devapi::UnlockConnection(handle);
        return;
      }
      case Operation::kCheck: {
        short answer = 0;
        result_ = devapi::CheckConnection(handle, nullptr, &answer);
        is_complete_ = answer == VARIANT_TRUE;
        return;
      }
      case Operation::kList:
        result_ = List(&is_complete_);
        return;
      case Operation::kDownload: {
        const auto tell = [](void* round, unsigned char) { static_cast<Round*>(round)->Pass(); };
        CProgressCallback progress = {tell, this};
        result_ = devapi::DownloadFile(handle, name, &stream_, &progress);
        is_complete_ = stream_.bytes == Bench::FileContent();
        return;
      }
      case Operation::kDelete:
        result_ = devapi::DeleteFileW(handle, other_name);
        return;
      case Operation::kRename:
        allowed_.push_back(E_NOTIMPL);
        result_ = devapi::RenameFile(handle, other_name, new_name);
        return;
      case Operation::kPort: {
        // One stop bit, as the port has. A Quorin receiver is not locked by it.
        const bool is_quorin = link_.family == eProtocolQuorin;
        if (is_quorin) devapi::LockConnection(handle, nullptr);
        result_ = devapi::DCSetRcvStopbits(handle, is_quorin ? 0 : 1);
        if (is_quorin) devapi::UnlockConnection(handle);
        return;
      }
      case Operation::kLock:
        allowed_ = {S_OK, E_INVALIDARG};
        result_ = devapi::LockConnection(handle, nullptr);
        Pass();
        devapi::UnlockConnection(handle);
        return;
    }
  }

  long List(bool* is_complete) {
    void* list = nullptr;
    long count = 0;
    const long result = devapi::OpenFileList(handle_, &list);
    if (list) devapi::GetFilesCount(list, &count);
    if (list) devapi::CloseFileList(list);
    *is_complete = count >= Bench::kFiles - 1;  // one may be deleted
    return result;
  }

  void RunOther(Other& other, const Moments& moments) {
    bool may_hold = false;
    ++ready_;
    for (const auto& [act, place, pause] : moments) {
      if (plan_.meeting == Meeting::kFree) {
        while (!has_begun_) continue;
        // Not a wait: a thread that yields on a busy machine comes back late.
        for (std::atomic<unsigned> n = 0; n < pause;) ++n;
      } else if (!progress_.WaitForPlace(place + 1)) {
        Hang("the operation did not come to its place");
      }
      if (is_operating_) ++met_;
      const long result = Execute(act);
      if (act == Act::kInfo && result != S_OK) {
        // It may hold the lock, and cannot release that of a receiver that was closed.
        may_hold = devapi::UnlockConnection(handle_) != S_OK;
        if (may_hold) may_be_abandoned_ = true;
      }
      other.results.push_back({act, result});
      progress_.EndMoment();
    }
    // A thread that ends releases its locks, and the operation goes on. Otherwise this one watches.
    if (!may_hold && !progress_.WaitForPlace(kOver)) Hang("the operation did not end");
  }

  long Execute(Act act) {
    switch (act) {
      case Act::kAbort:
        if (plan_.operation == Operation::kSearch) search_abort_.Set();
        return devapi::Abort(handle_);
      case Act::kClose:
        return devapi::CloseReceiver(handle_);
      case Act::kDestroy:
        return devapi::DestroyReceiver(link_.port());
      case Act::kUnlock:
        return devapi::UnlockConnection(handle_);
      case Act::kInfo: {
        // The operation may hold the lock: while it waits for this thread, this one does not wait.
        CReceiverInfo info{};
        const Event& end = plan_.meeting == Meeting::kWaitedFor ? signalled_ : over_;
        const long result = devapi::GetReceiverInfo(handle_, end.get(), &info);
        SysFreeString(info.bstrReceiverId);
        SysFreeString(info.bstrModel);
        return result;
      }
      case Act::kOpen: {
        void* handle = nullptr;
        const long result = devapi::OpenReceiver(link_.port(), &handle);
        if (handle) handle_ = handle;
        return result;
      }
    }
    return E_UNEXPECTED;
  }

  // A wait for a lock whose thread has ended gives the last error of the thread that waits.
  bool IsOfAbandonedLock(long result) const { return may_be_abandoned_ && result < 0; }

  static bool IsDocumented(const Result& result) {
    switch (result.act) {
      case Act::kAbort:
      case Act::kUnlock:
        return result.value == S_OK || result.value == E_INVALIDARG;
      case Act::kClose:
      case Act::kInfo:
        return result.value == S_OK || result.value == S_FALSE || result.value == E_INVALIDARG;
      case Act::kDestroy:
      case Act::kOpen:
        return result.value == S_OK || result.value == S_FALSE;
    }
    return false;
  }

  void Check() {
    EXPECT_FALSE(met_in_port_) << "two threads in the port";
    CheckResults();
    CheckAbort();
    CheckUsers();
    EXPECT_TRUE(receiver_.expired()) << "the receiver stays";
    EXPECT_EQ(devapi::Abort(handle_), E_INVALIDARG);
    // One more of the same name.
    bool is_complete = false;
    EXPECT_EQ(Search(link_.family, nullptr), S_OK);
    EXPECT_EQ(List(&is_complete), S_OK);
    EXPECT_TRUE(is_complete) << "the next list";
    EXPECT_EQ(devapi::CloseReceiver(handle_), S_OK);
  }

  void CheckResults() {
    for (const auto& other : others_) {
      for (const Result& result : other->results) {
        EXPECT_TRUE(IsDocumented(result) ||
                    (result.act == Act::kInfo && IsOfAbandonedLock(result.value)))
            << kActs.at(static_cast<size_t>(result.act)) << " gave " << std::hex << result.value;
      }
    }
    EXPECT_TRUE(std::ranges::find(allowed_, result_) != allowed_.end() ||
                IsOfAbandonedLock(result_))
        << std::hex << result_;
    const std::string content = Bench::FileContent();
    EXPECT_TRUE(content.starts_with(stream_.bytes));
    if (plan_.operation == Operation::kDownload && result_ == S_OK &&
        link_.family == eProtocolQuorin) {
      EXPECT_TRUE(is_complete_) << stream_.bytes.size() << " bytes";
    }
    const bool renames = link_.family == eProtocolVelmar;
    if (plan_.operation == Operation::kRename && !renames && result_ != E_INVALIDARG) {
      EXPECT_EQ(result_, E_NOTIMPL);
    } else if (!plan_.HasEnd()) {
      EXPECT_EQ(result_, S_OK);
      EXPECT_TRUE(is_complete_);
    }
  }

  // The operation stood still while the abort came, so the abort has to end it.
  void CheckAbort() {
    const auto aborted_at = plan_.AbortedAt();
    if (!aborted_at) return;
    // It may come when the answer to the last command is there.
    constexpr size_t kPlacesOfAnAnswer = 5;
    const bool is_late = places_ <= *aborted_at + kPlacesOfAnAnswer;
    switch (plan_.operation) {
      case Operation::kLock:
        return;
      case Operation::kCheck:
        EXPECT_TRUE(!is_complete_ || is_late) << "it was aborted";
        return;
      case Operation::kPort:
        EXPECT_TRUE(result_ == S_FALSE || is_late) << "it was aborted";
        return;
      case Operation::kDownload:
        // Bytes that have come already are written.
        EXPECT_LE(writes_after_abort_, 1);
        // That of a Velmar receiver may give S_OK after whatever ended it.
        if (link_.family == eProtocolQuorin) {
          EXPECT_EQ(result_, S_FALSE);
        }
        return;
      default:
        EXPECT_EQ(result_, S_FALSE) << "it was aborted";
    }
  }

  // Closes the receiver, unless the others did: as many times as there are users.
  void CheckUsers() {
    int removed = 0;
    bool counts = true;
    for (const auto& other : others_) {
      for (const auto& [act, value] : other->results) {
        if (act == Act::kOpen && value == S_OK) ++users_;
        if (act == Act::kClose && value == S_FALSE) --users_;
        if (act == Act::kDestroy && value == S_FALSE) --users_;
        if ((act == Act::kClose || act == Act::kDestroy) && value == S_OK) ++removed;
        // It says the same when it found nothing.
        if (act == Act::kDestroy && plan_.operation == Operation::kSearch) counts = false;
      }
    }
    EXPECT_LE(removed, 1);
    if (removed == 0 && handle_) {
      CheckItWorks();
      int closed = 0;
      long result = S_FALSE;
      while (result == S_FALSE) {
        result = devapi::CloseReceiver(handle_);
        ++closed;
      }
      EXPECT_EQ(result, S_OK);
      if (counts) {
        EXPECT_EQ(closed, users_);
      }
    }
    void* none = nullptr;
    EXPECT_EQ(devapi::OpenReceiver(link_.port(), &none), S_FALSE) << "it is still registered";
  }

  // The lock of a receiver that is still known is free. An abort ends at most one more operation.
  void CheckItWorks() {
    // On another thread: the one that has the lock could take it again.
    long locked = S_FALSE;
    std::thread([&] {
      locked = devapi::LockConnection(handle_, signalled_.get());
      devapi::UnlockConnection(handle_);
    }).join();
    EXPECT_EQ(locked, S_OK) << "it is still locked";
    bool is_complete = false;
    long result = List(&is_complete);
    if (result == S_FALSE && plan_.HasEnd()) result = List(&is_complete);
    EXPECT_EQ(result, S_OK) << "the list after it";
    EXPECT_TRUE(is_complete) << "the list after it";
  }

  const Link& link_;
  const Plan& plan_;
  Bench bench_;
  const DWORD worker_ = GetCurrentThreadId();
  static constexpr size_t kOver = SIZE_MAX;

  Progress progress_;
  Event over_;  // the operation has ended
  Event search_abort_;
  const Event signalled_{true};
  std::vector<std::unique_ptr<Other>> others_;
  std::atomic<void*> handle_ = nullptr;
  std::weak_ptr<CIReceiver> receiver_;
  std::atomic<bool> is_at_place_ = false;
  std::atomic<bool> met_in_port_ = false;
  std::atomic<bool> may_be_abandoned_ = false;  // the lock
  std::atomic<size_t> ready_ = 0;               // threads
  std::atomic<bool> has_begun_ = false;
  std::atomic<bool> is_operating_ = false;
  std::atomic<size_t> met_ = 0;
  size_t places_ = 0;  // of the operation's thread, as the next
  bool was_aborted_ = false;
  int writes_after_abort_ = 0;
  int users_ = 0;
  std::vector<long> allowed_ = {S_OK, S_FALSE, E_INVALIDARG};  // results of the operation
  long result_ = 0;
  bool is_complete_ = true;
  Stream stream_{*this};
};

using Counts = std::array<size_t, kOperations.size()>;

class Races : public testing::TestWithParam<Link> {
 protected:
  // The places of each operation, when nobody disturbs it. One has none: a Quorin receiver does not
  // rename, and the library says so at once.
  static Counts CountPlaces() {
    Counts places{};
    for (size_t i = 0; i < places.size(); ++i) {
      Plan alone;
      alone.operation = static_cast<Operation>(i);
      places.at(i) = Round(GetParam(), alone).Run();
    }
    return places;
  }

  // The moments that are to meet each operation on this link.
  static Counts Wanted(const Counts& places) {
    Counts wanted{};
    for (size_t i = 0; i < wanted.size(); ++i) {
      const bool is_rename = static_cast<Operation>(i) == Operation::kRename;
      const size_t links = is_rename ? 1 : std::size(torture::kLinks);
      if (places.at(i) != 0) wanted.at(i) = (kMetOfEach + links - 1) / links * Times();
    }
    return wanted;
  }

  static Plan Draw(uint64_t round, const Counts& places) {
    std::seed_seq seeds{Seed(), round};
    std::mt19937 random(seeds);
    const auto below = [&random](size_t end) { return static_cast<size_t>(random() % end); };
    Plan plan;
    plan.round = round;
    plan.operation = static_cast<Operation>(round % places.size());
    plan.places = places.at(round % places.size());
    if (plan.places == 0) return plan;
    plan.meeting = kDrawnMeetings.at(below(kDrawnMeetings.size()));
    plan.reports = below(kReportEvery) == 0;
    constexpr size_t kMostThreads = 2;
    constexpr size_t kMostMoments = 16;
    constexpr size_t kMostEnds = 2;
    constexpr size_t kLater = 3;              // places
    constexpr size_t kLongestPause = 20'000;  // as long as a short operation
    plan.threads.resize(1 + below(kMostThreads));
    for (Moments& moments : plan.threads) {
      moments.resize(1 + below(kMostMoments));
      for (Moment& moment : moments) {
        moment = {.act = kHarmless.at(below(kHarmless.size())),
                  .place = below(plan.places),
                  .pause = static_cast<unsigned>(below(kLongestPause / moments.size()))};
      }
    }
    // In half of these rounds an abort alone has to end the operation.
    const bool aborts = plan.meeting == Meeting::kWaitedFor && below(2) == 0;
    // Few of the others come later, since the operation would not be there any more.
    size_t end = plan.places;
    for (size_t ends = aborts ? 1 : below(kMostEnds + 1); ends > 0; --ends) {
      Moments& moments = plan.threads.at(below(plan.threads.size()));
      Moment& moment = moments.at(below(moments.size()));
      moment.act = aborts ? Act::kAbort : kEnds.at(below(kEnds.size()));
      end = std::min(end, moment.place + kLater);
    }
    for (Moments& moments : plan.threads) {
      for (Moment& moment : moments) {
        if (!Ends(moment.act)) moment.place %= end;
      }
    }
    for (Moments& moments : plan.threads) std::ranges::sort(moments, {}, &Moment::place);
    return plan;
  }
};

// What was met, by operation.
struct Tally {
  Counts planned{};
  Counts met{};
  Counts aborts{};  // that had to end it

  bool Has(const Counts& wanted, size_t operation) const {
    return met.at(operation) >= wanted.at(operation);
  }
  bool HasAll(const Counts& wanted) const {
    return std::ranges::equal(met, wanted, std::ranges::greater_equal());
  }
  void Add(const Plan& plan, size_t met_in_round) {
    const auto operation = static_cast<size_t>(plan.operation);
    planned.at(operation) += plan.MomentsTo(SIZE_MAX);
    met.at(operation) += met_in_round;
    if (plan.AbortedAt()) ++aborts.at(operation);
  }
  void Print() const {
    std::printf("%-14s %10s %10s %10s\n", "operation", "moments", "met it", "aborts");
    for (size_t i = 0; i < kOperations.size(); ++i) {
      std::printf(
          "%-14s %10zu %10zu %10zu\n", kOperations.at(i), planned.at(i), met.at(i), aborts.at(i));
    }
  }
};

TEST_P(Races, OperationsMeetOtherThreads) {
  std::printf("seed %llu\n", static_cast<unsigned long long>(Seed()));
  const Counts places = CountPlaces();
  const Counts wanted = Wanted(places);
  size_t handles = 0;
  Tally tally;
  for (uint64_t round = 0; !tally.HasAll(wanted) && !HasFailure(); ++round) {
    // The system keeps some handles of the first threads and files.
    if (round == kFirstRounds) handles = HandleCount();
    const Plan plan = Draw(round, places);
    const auto operation = static_cast<size_t>(plan.operation);
    if (tally.Has(wanted, operation)) continue;
    SCOPED_TRACE(plan.InWords(GetParam()));
    std::optional<ReportCapture> report;
    if (plan.reports) report.emplace();
    Round one(GetParam(), plan);
    one.Run();
    tally.Add(plan, one.met());
  }
  tally.Print();
  if (!HasFailure()) {
    for (size_t i = 0; i < places.size(); ++i) {
      // At a single place, the last one, an abort may come too late.
      EXPECT_TRUE(tally.aborts.at(i) > 0 || places.at(i) <= 1) << kOperations.at(i);
    }
    EXPECT_EQ(HandleCount(), handles);
  }
}

INSTANTIATE_TEST_SUITE_P(Links, Races, testing::ValuesIn(torture::kLinks), [](const auto& link) {
  return link.param.name;
});

}  // namespace
}  // namespace races
