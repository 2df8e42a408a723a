// What ends the waits of a connection, and for how long.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <vector>

#include "platform/handle.h"
#include "tests/support/fake_device.h"
#include "tests/support/scripted_connection.h"
#include "transport/serial_connection.h"
#include "transport/wait_scope.h"

using rcvlink::KernelHandle;
using rcvlink::WaitScope;

using testing::ElementsAre;

namespace {

// Another handle of the event.
MATCHER_P(IsHandleOf, event, "") {
  SetEvent(event);
  const DWORD signalled = WaitForSingleObject(arg, 0);
  ResetEvent(event);
  return arg != event && signalled == WAIT_OBJECT_0 && WaitForSingleObject(arg, 0) == WAIT_TIMEOUT;
}

KernelHandle MakeEvent() { return KernelHandle(CreateEventW(nullptr, TRUE, FALSE, nullptr)); }

class WaitScopeTest : public testing::Test {
 protected:
  WaitScopeTest() {
    DCB settings{};
    connection.Open(L"COM7", &settings);
    device.transfer_error = ERROR_IO_PENDING;
    device.on_wait = [this](DWORD count, const HANDLE* handles) {
      waited_for.assign(handles, handles + count - 1);  // without the transfer's own event
    };
  }

  std::vector<HANDLE> WaitedForByRead() {
    BYTE byte = 0;
    DWORD count = 0;
    connection.Read(&byte, 1, &count, 1000);
    return waited_for;
  }
  std::vector<HANDLE> WaitedForByWrite() {
    connection.Write("x", 1, 1000);
    return waited_for;
  }

  FakeDevice device;
  CSerialConnection connection{device};
  const KernelHandle event = MakeEvent();
  std::vector<HANDLE> waited_for;
};

TEST_F(WaitScopeTest, NothingEndsTheWaitsInAShield) {
  const HANDLE cancel = connection.GetAbortEvent();
  {
    const WaitScope shield = WaitScope::Shielded(&connection);
    EXPECT_THAT(WaitedForByWrite(), ElementsAre());
    EXPECT_THAT(WaitedForByRead(), ElementsAre());
  }
  EXPECT_THAT(WaitedForByWrite(), ElementsAre(cancel));
  EXPECT_THAT(WaitedForByRead(), ElementsAre(cancel));
}

TEST_F(WaitScopeTest, TheWatchedEventEndsReadsAsTheCancelDoes) {
  const HANDLE cancel = connection.GetAbortEvent();
  {
    const WaitScope watching = WaitScope::Watching(&connection, event.get());
    EXPECT_THAT(WaitedForByRead(), ElementsAre(cancel, IsHandleOf(event.get())));
    device.wait_answer = WAIT_OBJECT_0 + 1;
    BYTE byte = 0;
    DWORD count = 0;
    EXPECT_EQ(connection.Read(&byte, 1, &count, 1000), S_FALSE);
    device.wait_answer = FakeDevice::kDone;
  }
  EXPECT_THAT(WaitedForByRead(), ElementsAre(cancel));
}

// Half a line would come before the next command.
TEST_F(WaitScopeTest, TheWatchedEventDoesNotEndWrites) {
  const WaitScope watching = WaitScope::Watching(&connection, event.get());
  EXPECT_THAT(WaitedForByWrite(), ElementsAre(connection.GetAbortEvent()));
}

TEST_F(WaitScopeTest, AShieldInsideKeepsWhatIsWatchedForAfterIt) {
  const WaitScope watching = WaitScope::Watching(&connection, event.get());
  {
    const WaitScope shield = WaitScope::Shielded(&connection);
    const WaitScope inner = WaitScope::Shielded(&connection);
  }
  EXPECT_THAT(WaitedForByRead(), ElementsAre(connection.GetAbortEvent(), IsHandleOf(event.get())));
}

TEST_F(WaitScopeTest, AnOutsideAbortEventStillReplacesTheCancel) {
  const KernelHandle outside = MakeEvent();
  connection.SetAbortEvent(outside.get());
  const WaitScope watching = WaitScope::Watching(&connection, event.get());
  EXPECT_THAT(WaitedForByRead(), ElementsAre(outside.get(), IsHandleOf(event.get())));
}

// Testing an event that resets itself would clear it.
TEST_F(WaitScopeTest, ASignalledEventStaysSignalled) {
  const KernelHandle own(CreateEventW(nullptr, FALSE, TRUE, nullptr));
  const WaitScope watching = WaitScope::Watching(&connection, own.get());
  EXPECT_EQ(WaitForSingleObject(own.get(), 0), WAIT_OBJECT_0);
}

TEST_F(WaitScopeTest, AnEventThatTheHostClosesIsStillWatched) {
  KernelHandle own = MakeEvent();
  const WaitScope watching = WaitScope::Watching(&connection, own.get());
  own.Reset();
  ASSERT_EQ(WaitedForByRead().size(), 2u);
  EXPECT_EQ(WaitForSingleObject(WaitedForByRead()[1], 0), WAIT_TIMEOUT);
}

TEST_F(WaitScopeTest, AHandleThatIsNoneIsNotWatched) {
  HANDLE none = nullptr;
  {
    const KernelHandle closed = MakeEvent();
    none = closed.get();
  }
  for (const HANDLE handle : {none, HANDLE{nullptr}}) {
    const WaitScope watching = WaitScope::Watching(&connection, handle);
    EXPECT_THAT(WaitedForByRead(), ElementsAre(connection.GetAbortEvent()));
  }
}

TEST_F(WaitScopeTest, ClearingACancelLeavesNoneForTheNextWait) {
  connection.Cancel();
  connection.ClearCancel();
  EXPECT_EQ(WaitForSingleObject(connection.GetAbortEvent(), 0), WAIT_TIMEOUT);
}

TEST(ClearCancel, OfAConnectionThatWasNeverOpenedDoesNothing) {
  FakeDevice device;
  CSerialConnection connection(device);
  connection.ClearCancel();
  EXPECT_EQ(connection.GetAbortEvent(), nullptr);
}

}  // namespace
