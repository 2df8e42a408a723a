// The driver's lock on its connection.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <thread>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "tests/quorin/quorin_driver.h"
#include "tests/support/report_capture.h"

using rcvlink::HResultFromError;
using rcvlink::KernelHandle;

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

class QuorinConnectionLock : public QuorinDriverTest {
 protected:
  const KernelHandle event{CreateEventW(nullptr, TRUE, FALSE, nullptr)};
  const ReportCapture report;
};

TEST_F(QuorinConnectionLock, KeepsOthersOutUntilItIsReleased) {
  EXPECT_EQ(driver.LockConnection(nullptr), S_OK);
  EXPECT_FALSE(IsFreeForOthers(driver));
  EXPECT_EQ(driver.UnlockConnection(), 1);
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(QuorinConnectionLock, IsTracedWithItsHandle) {
  driver.LockConnection(nullptr);
  driver.UnlockConnection();
  EXPECT_THAT(
      report.Lines(),
      ElementsAre(
          "CQuorinProtocol::LockConnection - connection is locked " + driver.LockText(),
          "CQuorinProtocol::UnlockConnection - connection is unlocked " + driver.LockText()));
}

TEST_F(QuorinConnectionLock, IsTakenWithAnEventThatIsNotSignalled) {
  EXPECT_EQ(driver.LockConnection(event.get()), S_OK);
  EXPECT_FALSE(IsFreeForOthers(driver));
  driver.UnlockConnection();
}

TEST_F(QuorinConnectionLock, IsTakenWhenItIsFreeThoughTheEventIsSignalled) {
  SetEvent(event.get());
  EXPECT_EQ(driver.LockConnection(event.get()), S_OK);
  driver.UnlockConnection();
}

TEST_F(QuorinConnectionLock, IsNotTakenOnceTheEventIsSignalled) {
  driver.LockConnection(nullptr);
  SetEvent(event.get());
  HRESULT result = E_FAIL;
  std::thread([&] { result = driver.LockConnection(event.get()); }).join();
  EXPECT_EQ(result, S_FALSE);
  EXPECT_TRUE(report.Has("CQuorinProtocol::LockConnection - is cancelled " + driver.LockText()));
  EXPECT_EQ(driver.UnlockConnection(), 1);
}

TEST_F(QuorinConnectionLock, CountsHowOftenItIsTaken) {
  driver.LockConnection(nullptr);
  driver.LockConnection(nullptr);
  EXPECT_EQ(driver.UnlockConnection(), 1);
  EXPECT_FALSE(IsFreeForOthers(driver));
  EXPECT_EQ(driver.UnlockConnection(), 1);
  EXPECT_EQ(driver.UnlockConnection(), 0);
}

TEST_F(QuorinConnectionLock, CannotBeReleasedByAnotherThread) {
  EXPECT_EQ(driver.UnlockConnection(), 0);
  driver.LockConnection(nullptr);
  HRESULT result = E_FAIL;
  std::thread([&] { result = driver.UnlockConnection(); }).join();
  EXPECT_EQ(result, 0);
  EXPECT_EQ(driver.UnlockConnection(), 1);
}

TEST_F(QuorinConnectionLock, IsAFailureWhenItsHolderEndedWithoutRelease) {
  std::thread([this] { driver.LockConnection(nullptr); }).join();
  SetLastError(ERROR_GEN_FAILURE);
  EXPECT_EQ(driver.LockConnection(nullptr), HResultFromError(ERROR_GEN_FAILURE));
  EXPECT_TRUE(report.Has("CQuorinProtocol::LockConnection - is failed " + driver.LockText()));
}

TEST_F(QuorinConnectionLock, IsAFailureForAnEventThatIsNone) {
  driver.LockConnection(nullptr);
  const HANDLE none = reinterpret_cast<HANDLE>(static_cast<uintptr_t>(0xDEAD0));
  HRESULT result = S_OK;
  std::thread([&] { result = driver.LockConnection(none); }).join();
  EXPECT_EQ(result, HResultFromError(ERROR_INVALID_HANDLE));
  EXPECT_TRUE(report.Has("CQuorinProtocol::LockConnection - is failed " + driver.LockText()));
  driver.UnlockConnection();
}

TEST_F(QuorinConnectionLock, EndsACheckAndAnInquiryThatCannotHaveIt) {
  driver.LockConnection(nullptr);
  SetEvent(event.get());
  HRESULT check = E_FAIL;
  HRESULT inquiry = E_FAIL;
  CReceiverInfo info{};
  std::thread([&] {
    short answer = 0;
    check = driver.CheckConnection(event.get(), &answer);
    inquiry = driver.GetReceiverInfo(event.get(), &info);
  }).join();
  EXPECT_EQ(check, S_FALSE);
  EXPECT_EQ(inquiry, S_FALSE);
  EXPECT_THAT(connection->calls, IsEmpty());
  EXPECT_THAT(progress.percents, IsEmpty());
  driver.UnlockConnection();
}

}  // namespace
