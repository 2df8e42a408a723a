// The two parts of an abort, and what clears each of them.
#include "receiver/abort_switch.h"

#include <gtest/gtest.h>

#include "quorin/quorin_command.h"
#include "tests/support/scripted_connection.h"

using rcvlink::AbortSwitch;

namespace {

class AbortSwitchTest : public testing::Test {
 protected:
  // Whether an abort would end the next wait.
  bool IsCancelPending() const { return connection.is_cancelled; }

  ScriptedConnection connection;
  AbortSwitch abort{&connection};
  QuorinCommands::CQuorinCommand command{"x", QuorinCommands::kNoReply};
};

TEST_F(AbortSwitchTest, NothingIsSetAtFirst) {
  EXPECT_FALSE(abort.IsSet());
  EXPECT_FALSE(abort.Take());
  EXPECT_TRUE(connection.calls.empty());
}

TEST_F(AbortSwitchTest, AnAbortEndsTheWaitAndIsThereUntilItIsTaken) {
  abort.Abort();
  EXPECT_TRUE(IsCancelPending());
  EXPECT_TRUE(abort.IsSet());
  EXPECT_TRUE(abort.IsSet());
  EXPECT_TRUE(abort.Take());
  EXPECT_FALSE(abort.IsSet());
  EXPECT_FALSE(IsCancelPending()) << "it would end a wait of the next operation";
}

TEST_F(AbortSwitchTest, ManyAbortsAreTakenAtOnce) {
  abort.Abort();
  abort.Abort();
  EXPECT_TRUE(abort.Take());
  EXPECT_FALSE(abort.Take());
}

TEST_F(AbortSwitchTest, ClearingTheCancelKeepsTheFlag) {
  abort.Abort();
  abort.ClearCancel();
  EXPECT_FALSE(IsCancelPending());
  EXPECT_TRUE(abort.Take());
}

// Without an abort nothing must be cleared: the connection cancels itself when it is closed.
TEST_F(AbortSwitchTest, TakingNothingClearsNothing) {
  connection.Cancel();
  EXPECT_FALSE(abort.Take());
  EXPECT_TRUE(IsCancelPending());
}

TEST_F(AbortSwitchTest, CancelsTheCommandThatIsExecuted) {
  {
    const AbortSwitch::CurrentCommand current(abort, command);
    abort.Abort();
  }
  EXPECT_TRUE(command.IsCancelled(nullptr));
}

TEST_F(AbortSwitchTest, DoesNotCancelACommandThatIsDone) {
  { const AbortSwitch::CurrentCommand current(abort, command); }
  abort.Abort();
  EXPECT_FALSE(command.IsCancelled(nullptr));
}

TEST(AbortSwitchWithoutAConnection, HasNothingToAbort) {
  AbortSwitch abort(nullptr);
  abort.Abort();
  abort.ClearCancel();
  EXPECT_FALSE(abort.IsSet());
  EXPECT_FALSE(abort.Take());
}

}  // namespace
