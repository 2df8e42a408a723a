// The lock after a GetReceiverInfo that fails, as other threads find it: a Velmar receiver is free
// then, a Quorin receiver is not.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <string>

#include "rcvlink.h"
#include "tests/host/support/lock.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/host/support/velmar.h"

using host::TryLockElsewhere;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

// The result of GetReceiverInfo. After a failure the record has no strings.
long GetInfo(void* receiver, HANDLE abort_event = nullptr) {
  CReceiverInfo info{};
  info.bstrModel = info.bstrReceiverId = reinterpret_cast<wchar_t*>(&info);
  const long result = devapi::GetReceiverInfo(receiver, abort_event, &info);
  EXPECT_EQ(info.bstrModel, nullptr);
  EXPECT_EQ(info.bstrReceiverId, nullptr);
  return result;
}

long Delete(void* receiver, std::wstring name) {
  return devapi::DeleteFileW(receiver, name.data());
}

// --- Velmar

const char* const kVelmarLocked = "CVelmarProtocol::LockConnection - connection is locked [HANDLE]";
const char* const kVelmarUnlocked =
    "CVelmarProtocol::UnlockConnection - connection is unlocked [HANDLE]";

class ApiVelmarInfoRefused : public testing::TestWithParam<const char*> {};

TEST_P(ApiVelmarInfoRefused, LeavesTheReceiverFree) {
  const host::Velmar receiver({GetParam(), "log versiona"}, {{"A.log", "a"}});
  const host::Report report;
  EXPECT_EQ(GetInfo(receiver.get()), S_FALSE);
  EXPECT_THAT(report.LinesWith("CVelmarProtocol::LockConnection"), ElementsAre(kVelmarLocked));
  EXPECT_THAT(report.LinesWith("CVelmarProtocol::UnlockConnection"), ElementsAre(kVelmarUnlocked));
  ASSERT_EQ(TryLockElsewhere(receiver.get()), S_OK) << "the next would wait for ever";
  EXPECT_EQ(host::OnThread([&] { return Delete(receiver.get(), L"A.log"); }).get(), S_OK);
}

TEST_P(ApiVelmarInfoRefused, KeepsTheLockOfAThreadThatHeldItBefore) {
  const host::Velmar receiver({GetParam(), "log versiona"});
  ASSERT_EQ(devapi::LockConnection(receiver.get(), nullptr), S_OK);
  EXPECT_EQ(GetInfo(receiver.get()), S_FALSE);
  EXPECT_EQ(TryLockElsewhere(receiver.get()), S_FALSE);
  EXPECT_EQ(devapi::UnlockConnection(receiver.get()), S_OK);
  EXPECT_EQ(TryLockElsewhere(receiver.get()), S_OK);
}

INSTANTIATE_TEST_SUITE_P(Refusals,
                         ApiVelmarInfoRefused,
                         testing::Values("--refuse", "--refuse-bare"),
                         [](const auto& refusal) {
                           return refusal.index == 0 ? "WithAText" : "WithoutAText";
                         });

// It releases a lock that it did not get: the lock of another thread must stay held.
TEST(ApiVelmarInfo, ThatDidNotGetTheLockReleasesNone) {
  const host::Velmar receiver({});
  ASSERT_EQ(devapi::LockConnection(receiver.get(), nullptr), S_OK);
  const host::Report report;
  const long result = host::OnThread([&] {
                        const host::Event at_once(true);
                        return GetInfo(receiver.get(), at_once.get());
                      }).get();
  EXPECT_EQ(result, S_FALSE);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CAbstractReceiver::GetReceiverInfo",
                          "CVelmarProtocol::GetReceiverInfo",
                          "CVelmarProtocol::LockConnection - is cancelled [HANDLE]",
                          kVelmarUnlocked));
  EXPECT_EQ(TryLockElsewhere(receiver.get()), S_FALSE);
  EXPECT_EQ(devapi::UnlockConnection(receiver.get()), S_OK);
  EXPECT_EQ(TryLockElsewhere(receiver.get()), S_OK);
}

// --- Quorin

class ApiQuorinInfoRefused : public testing::TestWithParam<std::string> {
 protected:
  const bed::SimulatedPort port_{{"quorin", "--refuse", GetParam()}, {{"A.log", "a"}}};
  const host::Receiver receiver_{port_};
  void* const handle_ = receiver_.get();
  const host::Report report_;
};

TEST_P(ApiQuorinInfoRefused, KeepsOtherThreadsWaitingUntilItIsUnlocked) {
  EXPECT_EQ(GetInfo(handle_), host::kNotConnected);
  EXPECT_THAT(report_.LinesWith("CQuorinProtocol::UnlockConnection"), IsEmpty());
  EXPECT_EQ(TryLockElsewhere(handle_), S_FALSE);

  auto deletion = host::OnThread([&] { return Delete(handle_, L"A.log"); });
  report_.WaitFor("CAbstractReceiver::DeleteFile");
  // The holder continues, and its command is received first.
  EXPECT_EQ(receiver_.Check(), -1);
  EXPECT_EQ(devapi::UnlockConnection(handle_), S_OK);
  EXPECT_EQ(deletion.get(), S_OK);
  const host::Lines sent = receiver_.SentSince();
  ASSERT_FALSE(sent.empty());
  EXPECT_EQ(sent.back(), R"(%#%remove,A.log\r\n)");
  EXPECT_EQ(TryLockElsewhere(handle_), S_OK);
}

// Each failure takes the lock again.
TEST_P(ApiQuorinInfoRefused, HoldsItAsOftenAsItFailed) {
  EXPECT_EQ(GetInfo(handle_), host::kNotConnected);
  EXPECT_EQ(GetInfo(handle_), host::kNotConnected);
  EXPECT_EQ(devapi::UnlockConnection(handle_), S_OK);
  EXPECT_EQ(TryLockElsewhere(handle_), S_FALSE);
  EXPECT_EQ(devapi::UnlockConnection(handle_), S_OK);
  EXPECT_EQ(TryLockElsewhere(handle_), S_OK);
}

// Only the thread that failed can release it.
TEST_P(ApiQuorinInfoRefused, IsNotUnlockedByAnotherThread) {
  EXPECT_EQ(GetInfo(handle_), host::kNotConnected);
  EXPECT_EQ(host::OnThread([&] { return devapi::UnlockConnection(handle_); }).get(), S_OK);
  EXPECT_EQ(TryLockElsewhere(handle_), S_FALSE);
  EXPECT_EQ(devapi::UnlockConnection(handle_), S_OK);
  EXPECT_EQ(TryLockElsewhere(handle_), S_OK);
}

INSTANTIATE_TEST_SUITE_P(Questions,
                         ApiQuorinInfoRefused,
                         testing::Values("print,/par/rcvid", "print,/par/rcv/model"),
                         [](const auto& question) {
                           return question.param == "print,/par/rcvid" ? "Identity" : "Model";
                         });

}  // namespace
