// LockConnection and UnlockConnection: a receiver for one thread at a time.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <string>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::ElementsAre;

namespace {

class ApiLock : public testing::Test {
 protected:
  long Lock() const { return devapi::LockConnection(receiver_.get(), nullptr); }
  long Unlock() const { return devapi::UnlockConnection(receiver_.get()); }
  // Takes the lock if it is free, and fails at once otherwise.
  long TryLock() const {
    const host::Event at_once(true);
    return devapi::LockConnection(receiver_.get(), at_once.get());
  }
  long TryLockElsewhere() const {
    return host::OnThread([&] {
             const long result = TryLock();
             if (result == S_OK) Unlock();
             return result;
           })
        .get();
  }

  const bed::SimulatedPort port_{{"quorin"}, {{"A.log", "a"}}};
  const host::Receiver receiver_{port_};
  const host::Report report_;
};

TEST_F(ApiLock, KeepsOtherThreadsOut) {
  EXPECT_EQ(Lock(), S_OK);
  EXPECT_EQ(TryLockElsewhere(), S_FALSE);
  EXPECT_EQ(Unlock(), S_OK);
  EXPECT_EQ(TryLockElsewhere(), S_OK);
  EXPECT_THAT(report_.Lines(),
              ElementsAre("CQuorinProtocol::LockConnection - connection is locked [HANDLE]",
                          "CQuorinProtocol::LockConnection - is cancelled [HANDLE]",
                          "CQuorinProtocol::UnlockConnection - connection is unlocked [HANDLE]",
                          "CQuorinProtocol::LockConnection - connection is locked [HANDLE]",
                          "CQuorinProtocol::UnlockConnection - connection is unlocked [HANDLE]"));
}

TEST_F(ApiLock, IsReleasedAsOftenAsItWasTaken) {
  EXPECT_EQ(Lock(), S_OK);
  EXPECT_EQ(TryLock(), S_OK);
  EXPECT_EQ(Unlock(), S_OK);
  EXPECT_EQ(TryLockElsewhere(), S_FALSE);
  EXPECT_EQ(Unlock(), S_OK);
  EXPECT_EQ(TryLockElsewhere(), S_OK);
}

TEST_F(ApiLock, UnlockingWithoutItDoesNothing) {
  EXPECT_EQ(Unlock(), S_OK);
  EXPECT_EQ(Lock(), S_OK);
  EXPECT_EQ(host::OnThread([&] { return Unlock(); }).get(), S_OK);
  EXPECT_EQ(TryLockElsewhere(), S_FALSE) << "another thread has given it back";
  EXPECT_EQ(Unlock(), S_OK);
}

TEST_F(ApiLock, WaitsUntilTheOtherThreadIsDone) {
  ASSERT_EQ(Lock(), S_OK);
  auto other = host::OnThread([&] {
    const long result = Lock();
    Unlock();
    return result;
  });
  EXPECT_EQ(TryLockElsewhere(), S_FALSE);
  Unlock();
  EXPECT_EQ(other.get(), S_OK);
}

// The holder's operation comes first, although the other thread started earlier.
TEST_F(ApiLock, OperationOfAnotherThreadWaits) {
  ASSERT_EQ(Lock(), S_OK);
  auto deletion = host::OnThread([&] {
    wchar_t name[] = L"A.log";
    return devapi::DeleteFileW(receiver_.get(), name);
  });
  report_.WaitFor("CAbstractReceiver::DeleteFile");
  EXPECT_EQ(receiver_.Identify().result, S_OK);
  EXPECT_EQ(receiver_.Identify().result, S_OK);
  EXPECT_EQ(Unlock(), S_OK);
  EXPECT_EQ(deletion.get(), S_OK);
  EXPECT_THAT(receiver_.SentSince(),
              ElementsAre(R"(%#%print,/par/rcvid\r\n)",
                          R"(%#%print,/par/rcv/model\r\n)",
                          R"(%#%print,/par/rcvid\r\n)",
                          R"(%#%print,/par/rcv/model\r\n)",
                          R"(%#%remove,A.log\r\n)"));
}

TEST_F(ApiLock, HolderMayUseEveryOperation) {
  ASSERT_EQ(Lock(), S_OK);
  void* list = nullptr;
  EXPECT_EQ(devapi::OpenFileList(receiver_.get(), &list), S_OK);
  EXPECT_EQ(devapi::CloseFileList(list), S_OK);
  wchar_t name[] = L"A.log";
  EXPECT_EQ(devapi::DeleteFileW(receiver_.get(), name), S_OK);
  EXPECT_EQ(TryLockElsewhere(), S_FALSE);
  EXPECT_EQ(Unlock(), S_OK);
}

}  // namespace
