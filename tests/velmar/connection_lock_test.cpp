// The lock of a Velmar driver on its connection.
#include <future>
#include <thread>

#include "platform/hresult.h"
#include "tests/velmar/velmar_driver.h"

using rcvlink::HResultFromError;
using rcvlink::KernelHandle;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class VelmarConnectionLock : public VelmarDriver {
 protected:
  // Runs on a thread of its own, which has begun when this returns.
  template <typename Function>
  std::thread Elsewhere(Function function) {
    std::promise<void> begun;
    std::thread thread([&begun, function] {
      begun.set_value();
      function();
    });
    begun.get_future().wait();
    return thread;
  }

  const KernelHandle event{CreateEventW(nullptr, TRUE, FALSE, nullptr)};
};

TEST_F(VelmarConnectionLock, IsTracedWithItsHandle) {
  EXPECT_EQ(driver.LockConnection(nullptr), S_OK);
  EXPECT_EQ(driver.UnlockConnection(), 1);
  EXPECT_THAT(
      report.Lines(),
      ElementsAre(
          "CVelmarProtocol::LockConnection - connection is locked " + driver.LockText(),
          "CVelmarProtocol::UnlockConnection - connection is unlocked " + driver.LockText()));
}

TEST_F(VelmarConnectionLock, IsTakenWhenItIsFreeThoughTheEventIsSignalled) {
  SetEvent(event.get());
  EXPECT_EQ(driver.LockConnection(event.get()), S_OK);
  EXPECT_EQ(driver.UnlockConnection(), 1);
}

TEST_F(VelmarConnectionLock, CountsHowOftenItIsTaken) {
  driver.LockConnection(nullptr);
  driver.LockConnection(event.get());
  EXPECT_EQ(driver.UnlockConnection(), 1);
  EXPECT_FALSE(IsFreeForOthers(driver));
  EXPECT_EQ(driver.UnlockConnection(), 1);
  EXPECT_EQ(driver.UnlockConnection(), 0);
}

TEST_F(VelmarConnectionLock, AWaitForItEndsWithTheEvent) {
  driver.LockConnection(nullptr);
  HRESULT result = E_FAIL;
  std::thread waiting = Elsewhere([&] { result = driver.LockConnection(event.get()); });
  SetEvent(event.get());
  waiting.join();
  EXPECT_EQ(result, S_FALSE);
  EXPECT_TRUE(report.Has("CVelmarProtocol::LockConnection - is cancelled " + driver.LockText()));
  EXPECT_EQ(driver.UnlockConnection(), 1);
}

TEST_F(VelmarConnectionLock, AWaitForItEndsWithItsRelease) {
  driver.LockConnection(nullptr);
  HRESULT result = E_FAIL;
  std::thread waiting = Elsewhere([&] {
    result = driver.LockConnection(event.get());
    driver.UnlockConnection();
  });
  driver.UnlockConnection();
  waiting.join();
  EXPECT_EQ(result, S_OK);
}

// Whether it already waits or is about to when the event comes.
TEST_F(VelmarConnectionLock, ACheckThatWaitsForItEndsWithTheEvent) {
  driver.LockConnection(nullptr);
  short answer = 99;
  HRESULT result = E_FAIL;
  std::thread waiting = Elsewhere([&] { result = driver.CheckConnection(event.get(), &answer); });
  SetEvent(event.get());
  waiting.join();
  EXPECT_EQ(result, S_FALSE);
  EXPECT_EQ(answer, 99);
  EXPECT_THAT(connection->calls, IsEmpty());
  EXPECT_EQ(driver.UnlockConnection(), 1);  // the check did not release it
  EXPECT_EQ(driver.UnlockConnection(), 0);
}

TEST_F(VelmarConnectionLock, AnInquiryThatWaitsForItEndsWithTheEvent) {
  driver.LockConnection(nullptr);
  wchar_t left_over[] = L"left over";
  CReceiverInfo info{};
  info.bstrReceiverId = left_over;
  info.bstrModel = left_over;
  HRESULT result = E_FAIL;
  std::thread waiting = Elsewhere([&] { result = driver.GetReceiverInfo(event.get(), &info); });
  SetEvent(event.get());
  waiting.join();
  EXPECT_EQ(result, S_FALSE);
  EXPECT_EQ(info.bstrReceiverId, nullptr);
  EXPECT_EQ(info.bstrModel, nullptr);
  EXPECT_THAT(connection->calls, IsEmpty());
  EXPECT_THAT(percents, IsEmpty());
  EXPECT_EQ(driver.UnlockConnection(), 1);  // it has not really unlocked it
}

TEST_F(VelmarConnectionLock, IsAFailureWhenItsHolderEndedWithoutRelease) {
  std::thread([this] { driver.LockConnection(nullptr); }).join();
  SetLastError(ERROR_GEN_FAILURE);
  EXPECT_EQ(driver.LockConnection(nullptr), HResultFromError(ERROR_GEN_FAILURE));
  EXPECT_TRUE(report.Has("CVelmarProtocol::LockConnection - is failed " + driver.LockText()));
}

TEST_F(VelmarConnectionLock, ThatCannotBeHadFailsACheckAndAnInquiry) {
  driver.LockConnection(nullptr);
  const HANDLE none = reinterpret_cast<HANDLE>(static_cast<uintptr_t>(0xDEAD0));
  short answer = 99;
  CReceiverInfo info{};
  HRESULT check = S_OK;
  HRESULT inquiry = S_OK;
  std::thread([&] {
    check = driver.CheckConnection(none, &answer);
    inquiry = driver.GetReceiverInfo(none, &info);
  }).join();
  EXPECT_EQ(check, HResultFromError(ERROR_INVALID_HANDLE));
  EXPECT_EQ(inquiry, HResultFromError(ERROR_INVALID_HANDLE));
  EXPECT_EQ(answer, 99);
  EXPECT_TRUE(report.Has("CVelmarProtocol::LockConnection - is failed " + driver.LockText()));
  EXPECT_THAT(connection->calls, IsEmpty());
  driver.UnlockConnection();
}

// An inquiry that could not wait for the lock releases it all the same, and so one that its thread
// held before.
TEST_F(VelmarConnectionLock, IsReleasedOnceByAnInquiryThatCannotWaitForIt) {
  driver.LockConnection(nullptr);
  driver.LockConnection(nullptr);
  const HANDLE none = reinterpret_cast<HANDLE>(static_cast<uintptr_t>(0xDEAD0));
  CReceiverInfo info{};
  EXPECT_EQ(driver.GetReceiverInfo(none, &info), HResultFromError(ERROR_INVALID_HANDLE));
  EXPECT_FALSE(IsFreeForOthers(driver));
  EXPECT_EQ(driver.UnlockConnection(), 1);
  EXPECT_EQ(driver.UnlockConnection(), 0) << "it was held once";
}

// Operations may be called inside a lock of the host's, on its thread.
TEST_F(VelmarConnectionLock, LetsItsHolderWork) {
  driver.LockConnection(nullptr);
  EXPECT_EQ(driver.DeleteFile(L"a"), S_OK);
  EXPECT_FALSE(IsFreeForOthers(driver));
  EXPECT_EQ(driver.UnlockConnection(), 1);
  EXPECT_TRUE(IsFreeForOthers(driver));
}

// An abort does not wait for it, because it must be able to end the holder.
TEST_F(VelmarConnectionLock, IsNotNeededForAnAbort) {
  driver.LockConnection(nullptr);
  std::thread([&] { driver.Abort(); }).join();
  EXPECT_THAT(connection->calls, ElementsAre("cancel"));
  driver.UnlockConnection();
}

}  // namespace
