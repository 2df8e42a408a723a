#include "commands/receiver_cmd.h"

#include <gtest/gtest.h>

#include <string>

#include "platform/handle.h"
#include "tests/support/allocations.h"

using rcvlink::KernelHandle;

namespace {

class TestCommand : public CReceiverCmd {
 public:
  explicit TestCommand(const char* text) : CReceiverCmd(text, 0x1002, 500, 30000) {}
  HRESULT Execute(CIConnection*, HANDLE) override { return S_OK; }
};

std::string Command(const CReceiverCmd& command) {
  return {command.GetCommand(), command.GetCommand() + command.GetCommandLength()};
}

std::string Reply(const CReceiverCmd& command) {
  return {command.GetReply(), command.GetReply() + command.GetReplyLength()};
}

TEST(ReceiverCmd, HoldsItsArguments) {
  const TestCommand command("log\r");
  EXPECT_EQ(Command(command), "log\r");
  EXPECT_EQ(command.GetCommandLength(), 4u);
  EXPECT_EQ(command.GetFlags(), 0x1002u);
  EXPECT_EQ(command.GetWriteTimeout(), 500u);
  EXPECT_EQ(command.GetReadTimeout(), 30000u);
  EXPECT_EQ(command.GetReply(), nullptr);
  EXPECT_EQ(command.GetReplyLength(), 0u);
  EXPECT_FALSE(command.IsCancelled(nullptr));
}

TEST(ReceiverCmd, EmptyTextIsACommandOfNoBytes) {
  EXPECT_EQ(TestCommand("").GetCommandLength(), 0u);
}

TEST(ReceiverCmd, TakesAnotherCommand) {
  TestCommand command("first");
  EXPECT_TRUE(command.SetCommandText("second\r"));
  EXPECT_EQ(Command(command), "second\r");
  EXPECT_TRUE(command.SetCommand("a\0b", 3));
  EXPECT_EQ(Command(command), std::string("a\0b", 3));
}

// The text goes through the virtual operation, so that a family can see every command.
TEST(ReceiverCmd, TextIsSetThroughTheVirtualOperation) {
  class Watching : public TestCommand {
   public:
    using TestCommand::TestCommand;
    bool SetCommand(const void*, uint32_t length) override {
      seen = length;
      return false;
    }
    uint32_t seen = 0;
  } command("x");
  EXPECT_FALSE(command.SetCommandText("four"));
  EXPECT_EQ(command.seen, 4u);
}

TEST(ReceiverCmd, TimeOutsAndFlagsCanBeChanged) {
  TestCommand command("x");
  command.SetReadTimeout(8000);
  command.SetFlags(1);
  EXPECT_EQ(command.GetReadTimeout(), 8000u);
  EXPECT_EQ(command.GetFlags(), 1u);
}

TEST(ReceiverCmd, SetReplyStoresNoTerminator) {
  TestCommand command("x");
  command.SetReply("abc");
  EXPECT_EQ(command.GetReplyLength(), 3u);
  EXPECT_EQ(Reply(command), "abc");
  command.SetReply("");
  EXPECT_EQ(command.GetReplyLength(), 0u);
}

TEST(ReceiverCmd, AppendReplyReturnsWhatItDid) {
  TestCommand command("x");
  EXPECT_EQ(command.AppendReply(nullptr, 5), static_cast<HRESULT>(0x80070057));
  EXPECT_EQ(command.AppendReply("ab", 0), S_FALSE);
  EXPECT_EQ(command.GetReply(), nullptr);
  EXPECT_EQ(command.AppendReply("ab", 2), S_OK);
  EXPECT_EQ(command.AppendReply("cd", 0), S_FALSE);
  EXPECT_EQ(command.AppendReply("cd", 2), S_OK);
  EXPECT_EQ(Reply(command), "abcd");
}

// A length has 32 bits. Nothing is copied, so the bytes need not be there.
TEST(ReceiverCmd, AReplyThatWouldBeTooLongIsRefused) {
  TestCommand command("x");
  ASSERT_EQ(command.AppendReply("abc", 3), S_OK);
  EXPECT_EQ(command.AppendReply("", 0xFFFF'FFFD), E_OUTOFMEMORY);
  EXPECT_EQ(Reply(command), "abc");
}

TEST(ReceiverCmd, WithoutMemoryTheReplyStaysAsItWas) {
  const std::string longer(100, 'x');
  TestCommand command("x");
  command.SetReply("abc");
  {
    const Allocations failing(0);
    command.SetReply(longer.c_str());
    EXPECT_TRUE(Allocations::HasFailed());
  }
  EXPECT_EQ(Reply(command), "abc");
  HRESULT result = S_OK;
  {
    const Allocations failing(0);
    result = command.AppendReply(longer.data(), static_cast<uint32_t>(longer.size()));
  }
  EXPECT_EQ(result, E_OUTOFMEMORY);
  EXPECT_EQ(Reply(command), "abc");
}

TEST(ReceiverCmd, FreeReplyLeavesTheLength) {
  TestCommand command("x");
  command.SetReply("abc");
  command.FreeReply();
  EXPECT_EQ(command.GetReply(), nullptr);
  EXPECT_EQ(command.GetReplyLength(), 3u);
}

// The old length is not used after the reply was freed.
TEST(ReceiverCmd, AppendsToAFreedReplyFromTheStart) {
  TestCommand command("x");
  command.SetReply("abc");
  command.FreeReply();
  EXPECT_EQ(command.AppendReply("de", 2), S_OK);
  EXPECT_EQ(Reply(command), "de");
}

TEST(ReceiverCmd, CancelIsNeverCleared) {
  const KernelHandle quiet(CreateEventW(nullptr, TRUE, FALSE, nullptr));
  TestCommand command("x");
  EXPECT_FALSE(command.IsCancelled(quiet.get()));
  command.Cancel();
  EXPECT_TRUE(command.IsCancelled(nullptr));
  EXPECT_TRUE(command.IsCancelled(quiet.get()));
}

TEST(ReceiverCmd, ASignalledEventCancels) {
  const KernelHandle signalled(CreateEventW(nullptr, TRUE, TRUE, nullptr));
  const TestCommand command("x");
  EXPECT_TRUE(command.IsCancelled(signalled.get()));
  EXPECT_FALSE(command.IsCancelled(nullptr));
}

}  // namespace
