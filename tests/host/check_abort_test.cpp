// CheckConnection ended from another thread: with an event of the host's and without, on each link.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <chrono>
#include <future>
#include <memory>
#include <ostream>
#include <string>
#include <thread>
#include <tuple>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/host/support/velmar.h"

using testing::IsEmpty;

namespace {

// A receiver that answers the check late enough for an abort to come first.
class SlowReceiver {
 public:
  virtual ~SlowReceiver() = default;
  virtual void* handle() const = 0;
  virtual std::wstring name() const = 0;
  // From here on the test's own code closes the receiver.
  virtual void Release() = 0;
  virtual std::string Transcript() const = 0;
};

constexpr std::chrono::milliseconds kPollInterval{1};
constexpr char kQuorinSilence[] = "1.5:ping";
constexpr char kVelmarSilence[] = "1.5:unlogall";

class QuorinOnPort : public SlowReceiver {
 public:
  void* handle() const override { return receiver_.get(); }
  std::wstring name() const override { return port_.name(); }
  void Release() override { receiver_.Release(); }
  std::string Transcript() const override { return port_.Transcript(); }

 private:
  bed::SimulatedPort port_{{"quorin", "--reply-silence", kQuorinSilence}};
  host::Receiver receiver_{port_};
};

class VelmarOnPort : public SlowReceiver {
 public:
  void* handle() const override { return receiver_.get(); }
  std::wstring name() const override { return receiver_.port.name(); }
  void Release() override { receiver_.Release(); }
  std::string Transcript() const override { return receiver_.port.Transcript(); }

 private:
  host::Velmar receiver_{{"--reply-silence", kVelmarSilence}};
};

class QuorinOnUsb : public SlowReceiver {
 public:
  void* handle() const override { return receiver_.get(); }
  std::wstring name() const override { return usb_.device(); }
  void Release() override { receiver_.Release(); }
  std::string Transcript() const override { return usb_.Transcript(); }

 private:
  bed::SimulatedUsb usb_{{"quorin", "--reply-silence", kQuorinSilence}};
  host::UsbReceiver receiver_{usb_};
};

struct Link {
  const char* name;
  std::unique_ptr<SlowReceiver> (*open)();
  // The command of the check, as in the transcript.
  const char* question;
  // How many answers the receiver gives before that, from its opening on.
  ptrdiff_t answers_to_others;
};

template <typename Kind>
std::unique_ptr<SlowReceiver> Open() {
  return std::make_unique<Kind>();
}

std::ostream& operator<<(std::ostream& out, const Link& link) { return out << link.name; }

const Link kLinks[] = {{"QuorinOnPort", Open<QuorinOnPort>, "\n> %", 2},
                       {"VelmarOnPort", Open<VelmarOnPort>, "unlogall", 3},
                       {"QuorinOnUsb", Open<QuorinOnUsb>, "\n> %", 2}};

enum class EventOfHost { kNone, kNotSignalled };

// A check of a slow receiver, which waits for the answer.
class CheckOfSlowReceiver : public testing::TestWithParam<std::tuple<Link, EventOfHost>> {
 protected:
  // Returns when the receiver has received the command.
  void Start() {
    const size_t before = PlaceOfQuestion();
    check_ = host::OnThread(
        [this] { return devapi::CheckConnection(slow_->handle(), event(), &answer_); });
    while (PlaceOfQuestion() == before) std::this_thread::sleep_for(kPollInterval);
  }
  // It found no receiver, and neither a reply nor a time-out ended it.
  void ExpectEndedAtOnce() {
    EXPECT_EQ(check_.get(), S_OK);
    EXPECT_EQ(answer_, 0);
    ExpectNoTimeOut();
    EXPECT_LE(Answers(), link().answers_to_others) << "it was waited for: " << slow_->Transcript();
  }
  // Except at the end of each flush over USB, which reads until there is no more data.
  void ExpectNoTimeOut() const {
    EXPECT_LE(report_.LinesWith("CAbstractConnection::Read").size(),
              report_.LinesWith("CUSBConnection::Flush").size());
  }
  long Check() const {
    short answer = 7;
    EXPECT_EQ(devapi::CheckConnection(slow_->handle(), event(), &answer), S_OK);
    return answer;
  }

  ptrdiff_t Answers() const {
    const host::Lines lines = host::WireLines(slow_->Transcript());
    return std::count_if(
        lines.begin(), lines.end(), [](const std::string& line) { return line.starts_with("< "); });
  }
  // Where the last one is in the transcript.
  size_t PlaceOfQuestion() const { return slow_->Transcript().rfind(link().question); }

  static Link link() { return std::get<0>(GetParam()); }
  HANDLE event() const {
    return std::get<1>(GetParam()) == EventOfHost::kNone ? nullptr : event_.get();
  }

  const std::unique_ptr<SlowReceiver> slow_ = link().open();
  const host::Event event_;
  const host::Report report_;
  std::future<long> check_;
  short answer_ = 7;
};

TEST_P(CheckOfSlowReceiver, IsEndedByAbort) {
  Start();
  EXPECT_EQ(devapi::Abort(slow_->handle()), S_OK);
  ExpectEndedAtOnce();
  EXPECT_EQ(Check(), -1) << "the abort was for the check before";
}

TEST_P(CheckOfSlowReceiver, IsEndedByClosing) {
  Start();
  void* const handle = slow_->handle();
  slow_->Release();
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
  ExpectEndedAtOnce();
}

TEST_P(CheckOfSlowReceiver, IsEndedByDestruction) {
  Start();
  std::wstring name = slow_->name();
  slow_->Release();
  EXPECT_EQ(devapi::DestroyReceiver(name.data()), S_OK);
  ExpectEndedAtOnce();
  EXPECT_THAT(report_.LinesWith("CAbstractReceiver::Abort"), IsEmpty());
}

// An abort while nothing runs ends the next check, and that one alone.
TEST_P(CheckOfSlowReceiver, IsEndedByAnAbortThatCameBefore) {
  EXPECT_EQ(devapi::Abort(slow_->handle()), S_OK);
  EXPECT_EQ(Check(), 0);
  ExpectNoTimeOut();
  EXPECT_EQ(Check(), -1);
}

INSTANTIATE_TEST_SUITE_P(All,
                         CheckOfSlowReceiver,
                         testing::Combine(testing::ValuesIn(kLinks),
                                          testing::Values(EventOfHost::kNone,
                                                          EventOfHost::kNotSignalled)),
                         [](const auto& test) {
                           const bool none = std::get<1>(test.param) == EventOfHost::kNone;
                           return std::string(std::get<0>(test.param).name) +
                                  (none ? "WithoutEvent" : "WithEvent");
                         });

// An invalid handle is the same as an event that is never signalled.
TEST(SearchWithAHandleThatIsNone, FindsTheReceiver) {
  const bed::SimulatedPort port({"quorin"});
  std::wstring name = port.name();
  DCB settings = host::Settings(CBR_9600);
  HANDLE none = nullptr;
  {
    const host::Event closed;
    none = closed.get();
  }
  host::OpenReceiver receiver;
  EXPECT_EQ(
      devapi::CreateReceiverOnSerial(name.data(), eProtocolQuorin, &settings, none, receiver.out()),
      S_OK);
}

}  // namespace
