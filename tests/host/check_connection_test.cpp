// CheckConnection: whether the receiver still answers.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::ElementsAreArray;
using testing::IsEmpty;

namespace {

constexpr short kUntouched = 7;

TEST(ApiCheckConnection, ProbesTheReceiverAgain) {
  const bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  const host::Report report;
  short answer = kUntouched;
  EXPECT_EQ(devapi::CheckConnection(receiver.get(), nullptr, &answer), S_OK);
  EXPECT_EQ(answer, -1);
  EXPECT_EQ(report.Lines().front(), "CAbstractReceiver::CheckConnection");
  EXPECT_EQ(report.Lines().back(),
            "CQuorinProtocol::UnlockConnection - connection is unlocked [HANDLE]");
  // The last command has no reply, so it may still be arriving: the next command waits for it.
  receiver.Identify();
  host::Lines sent = receiver.SentSince();
  sent.resize(host::HandshakeOfHost().size());
  EXPECT_THAT(sent, ElementsAreArray(host::HandshakeOfHost()));
}

TEST(ApiCheckConnection, ReportsASilentReceiverAndFindsItAgain) {
  bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  const host::Report report;
  port.Pause();
  short answer = kUntouched;
  EXPECT_EQ(devapi::CheckConnection(receiver.get(), nullptr, &answer), S_OK);
  EXPECT_EQ(answer, 0);
  EXPECT_TRUE(report.Has("CQuorinProtocol::CheckConnection - ping cmd failed [0x800705B4] [" +
                         host::Narrow(port.name()) + "]"));
  port.Resume();
  EXPECT_EQ(receiver.Check(), -1);
}

TEST(ApiCheckConnection, SignalledEventKeepsItFromAsking) {
  const bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  const host::Event abort_event(true);
  short answer = kUntouched;
  EXPECT_EQ(devapi::CheckConnection(receiver.get(), abort_event.get(), &answer), S_OK);
  EXPECT_EQ(answer, 0);
  EXPECT_THAT(receiver.SentSince(), IsEmpty());
  EXPECT_EQ(receiver.Check(), -1);
}

TEST(ApiCheckConnection, EventEndsItInASilence) {
  bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  const host::Report report;
  port.Pause();
  host::Event abort_event;
  short answer = kUntouched;
  auto check = host::OnThread(
      [&] { return devapi::CheckConnection(receiver.get(), abort_event.get(), &answer); });
  report.WaitFor("CQuorinCommand::Execute - start reading. Timeout is [8000 msec]");
  abort_event.Set();
  EXPECT_EQ(check.get(), S_OK);
  EXPECT_EQ(answer, 0);
  EXPECT_THAT(report.LinesWith("CAbstractConnection::Read"), IsEmpty()) << "it was waited out";
}

TEST(ApiCheckConnection, WritesNoAnswerWhileAnotherThreadHoldsTheReceiver) {
  const bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  ASSERT_EQ(devapi::LockConnection(receiver.get(), nullptr), S_OK);
  short answer = kUntouched;
  auto check = host::OnThread([&] {
    const host::Event at_once(true);
    return devapi::CheckConnection(receiver.get(), at_once.get(), &answer);
  });
  EXPECT_EQ(check.get(), S_FALSE);
  EXPECT_EQ(answer, kUntouched);
  devapi::UnlockConnection(receiver.get());
}

}  // namespace
