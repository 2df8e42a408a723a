#include "quorin/quorin_command.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <string>
#include <vector>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "tests/quorin/quorin_responder.h"
#include "tests/support/report_capture.h"
#include "tests/support/scripted_connection.h"

using rcvlink::KernelHandle;
using rcvlink::kTimedOut;

using namespace QuorinCommands;
using testing::ElementsAre;

namespace {

MATCHER(WritesATag, "writes a number between two percent signs") {
  const std::string call = arg;
  return call.starts_with("write ") && IsTag(std::string_view(call).substr(6));
}

// How a command is sent, up to the first read.
class QuorinCommandSending : public testing::Test {
 protected:
  ScriptedConnection connection;
};

TEST_F(QuorinCommandSending, NeedsAConnection) {
  CQuorinCommand command("print\r\n", kTagged);
  EXPECT_EQ(command.Execute(nullptr, nullptr), E_INVALIDARG);
}

TEST_F(QuorinCommandSending, FlushesThenWritesTheTagThenTheTextThenReads) {
  CQuorinCommand command("print\r\n", kTagged);
  command.Execute(&connection, nullptr);
  EXPECT_THAT(connection.calls,
              ElementsAre("flush", WritesATag(), "write print\r\n", "read 65536 30000"));
}

TEST_F(QuorinCommandSending, WritesNoTagWithoutTheFlag) {
  CQuorinCommand command("print\r\n", 0x0002);
  command.Execute(&connection, nullptr);
  EXPECT_THAT(connection.calls, ElementsAre("flush", "write print\r\n", "read 65536 30000"));
}

TEST_F(QuorinCommandSending, NeverReadsWhenNoReplyIsWanted) {
  connection.GiveRead("RE000");
  CQuorinCommand command("dm\r\n", kNoReply);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_THAT(connection.calls, ElementsAre("flush", "write dm\r\n"));
  EXPECT_EQ(command.Result(), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kNone);
}

TEST_F(QuorinCommandSending, TagsACommandThatWantsNoReply) {
  CQuorinCommand command("dm\r\n", kNoReply | kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_THAT(connection.calls, ElementsAre("flush", WritesATag(), "write dm\r\n"));
}

TEST_F(QuorinCommandSending, GivesEachTaggedCommandTheNextNumber) {
  const auto tag_number = [this](uint32_t flags) {
    connection.calls.clear();
    CQuorinCommand command("x", flags);
    command.Execute(&connection, nullptr);
    return std::atoi(connection.calls[1].c_str() + std::string_view("write %").size());
  };
  const int first = tag_number(kTagged);
  EXPECT_GT(first, 0);
  EXPECT_EQ(tag_number(kTagged), first + 1);
  tag_number(0);
  EXPECT_EQ(tag_number(kTagged | kNoReply), first + 2);
}

TEST_F(QuorinCommandSending, EndsWithAFailedFlush) {
  connection.on_flush = [] { return E_HANDLE; };
  CQuorinCommand command("print\r\n", kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), E_HANDLE);
  EXPECT_THAT(connection.calls, ElementsAre("flush"));
}

TEST_F(QuorinCommandSending, GoesOnWhenThereWasNothingToFlush) {
  connection.on_flush = [] { return S_FALSE; };
  CQuorinCommand command("dm\r\n", kNoReply);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(connection.Written(), "dm\r\n");
}

TEST_F(QuorinCommandSending, DiscardsAnEarlierReplyFirst) {
  connection.on_flush = [] { return E_HANDLE; };
  CQuorinCommand command("print\r\n", kTagged);
  command.SetReply("old");
  command.Execute(&connection, nullptr);
  EXPECT_EQ(command.GetReply(), nullptr);
}

TEST_F(QuorinCommandSending, EndsWithAFailedWriteOfTheTag) {
  connection.on_write = [](std::string_view) { return kTimedOut; };
  CQuorinCommand command("print\r\n", kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), kTimedOut);
  EXPECT_THAT(connection.calls, ElementsAre("flush", WritesATag()));
}

TEST_F(QuorinCommandSending, EndsWithAFailedWriteOfTheText) {
  connection.on_write = [](std::string_view bytes) { return IsTag(bytes) ? S_OK : E_HANDLE; };
  CQuorinCommand command("print\r\n", kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), E_HANDLE);
  EXPECT_EQ(connection.calls.back(), "write print\r\n");
}

TEST_F(QuorinCommandSending, EndsWithFailedWriteAlsoWhenNoReplyIsWanted) {
  connection.on_write = [](std::string_view) { return E_HANDLE; };
  CQuorinCommand command("dm\r\n", kNoReply);
  EXPECT_EQ(command.Execute(&connection, nullptr), E_HANDLE);
}

TEST_F(QuorinCommandSending, EndsWhenTheWriteOfTheTagWasAborted) {
  connection.on_write = [](std::string_view) { return S_FALSE; };
  CQuorinCommand command("print\r\n", kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_FALSE);
  EXPECT_EQ(connection.calls.size(), 2U);
}

TEST_F(QuorinCommandSending, EndsWhenTheWriteOfTheTextWasAborted) {
  connection.on_write = [](std::string_view bytes) { return IsTag(bytes) ? S_OK : S_FALSE; };
  CQuorinCommand command("print\r\n", kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_FALSE);
  EXPECT_EQ(connection.calls.back(), "write print\r\n");
}

TEST_F(QuorinCommandSending, WritesNoTextOnceCancelled) {
  CQuorinCommand command("print\r\n", 0);
  command.Cancel();
  EXPECT_EQ(command.Execute(&connection, nullptr), S_FALSE);
  EXPECT_THAT(connection.calls, ElementsAre("flush"));
}

TEST_F(QuorinCommandSending, WritesNoTextAfterACancelDuringTheTag) {
  CQuorinCommand command("print\r\n", kTagged);
  connection.on_write = [&](std::string_view) {
    command.Cancel();
    return S_OK;
  };
  EXPECT_EQ(command.Execute(&connection, nullptr), S_FALSE);
  EXPECT_THAT(connection.calls, ElementsAre("flush", WritesATag()));
}

TEST_F(QuorinCommandSending, WritesNoTextOnceTheEventIsSignalled) {
  const KernelHandle event(CreateEventW(nullptr, TRUE, TRUE, nullptr));
  CQuorinCommand command("dm\r\n", kNoReply);
  EXPECT_EQ(command.Execute(&connection, event.get()), S_FALSE);
  EXPECT_THAT(connection.calls, ElementsAre("flush"));
}

TEST_F(QuorinCommandSending, GoesOnWhileTheEventIsNotSignalled) {
  const KernelHandle event(CreateEventW(nullptr, TRUE, FALSE, nullptr));
  CQuorinCommand command("dm\r\n", kNoReply);
  EXPECT_EQ(command.Execute(&connection, event.get()), S_OK);
  EXPECT_EQ(connection.Written(), "dm\r\n");
}

TEST_F(QuorinCommandSending, ReadsNothingAfterACancelDuringTheText) {
  CQuorinCommand command("print\r\n", 0);
  connection.on_write = [&](std::string_view) {
    command.Cancel();
    return S_OK;
  };
  EXPECT_EQ(command.Execute(&connection, nullptr), S_FALSE);
  EXPECT_THAT(connection.calls, ElementsAre("flush", "write print\r\n"));
}

// What is sent whole reaches the receiver in spite of cancels.
class QuorinCommandSentWhole : public QuorinCommandSending {};

TEST_F(QuorinCommandSentWhole, IsWrittenThoughCancelled) {
  CQuorinCommand command("set\r\n", kTagged | kNoReply);
  command.SendWhole();
  command.Cancel();
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(connection.Writes().back(), "set\r\n");
}

TEST_F(QuorinCommandSentWhole, IsWrittenWithAShield) {
  std::vector<bool> shielded;
  connection.on_write = [&](std::string_view) {
    shielded.push_back(connection.wait_rule.shielded);
    return S_OK;
  };
  CQuorinCommand command("set\r\n", kTagged | kNoReply);
  command.SendWhole();
  command.Execute(&connection, nullptr);
  EXPECT_THAT(shielded, ElementsAre(true, true));
  EXPECT_FALSE(connection.wait_rule.shielded);
}

TEST_F(QuorinCommandSentWhole, WaitsForItsReplyWithoutTheShield) {
  bool shielded_at_read = true;
  connection.Give({S_OK, "RE000", [&] { shielded_at_read = connection.wait_rule.shielded; }});
  CQuorinCommand command("set\r\n", 0);
  command.SendWhole();
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_FALSE(shielded_at_read);
}

TEST_F(QuorinCommandSentWhole, DoesNotWaitForItsReplyOnceCancelled) {
  CQuorinCommand command("set\r\n", 0);
  command.SendWhole();
  command.Cancel();
  EXPECT_EQ(command.Execute(&connection, nullptr), S_FALSE);
  EXPECT_THAT(connection.calls, ElementsAre("flush", "write set\r\n"));
}

TEST_F(QuorinCommandSentWhole, LeavesNoShieldAfterAFailedWrite) {
  connection.on_write = [](std::string_view) { return E_HANDLE; };
  CQuorinCommand command("set\r\n", kNoReply);
  command.SendWhole();
  EXPECT_EQ(command.Execute(&connection, nullptr), E_HANDLE);
  EXPECT_FALSE(connection.wait_rule.shielded);
}

TEST_F(QuorinCommandSending, IsNotShieldedOtherwise) {
  bool shielded_at_write = true;
  connection.on_write = [&](std::string_view) {
    shielded_at_write = connection.wait_rule.shielded;
    return S_OK;
  };
  CQuorinCommand command("dm\r\n", kNoReply);
  command.Execute(&connection, nullptr);
  EXPECT_FALSE(shielded_at_write);
}

TEST(QuorinCommandTimeouts, AreThreeSecondsForEachWrite) {
  ScriptedConnection connection;
  CQuorinCommand command("dm\r\n", kTagged | kNoReply);
  command.Execute(&connection, nullptr);
  EXPECT_THAT(connection.write_timeouts, ElementsAre(3000, 3000));
}

TEST_F(QuorinCommandSending, TracesEachReadWithItsTimeout) {
  const ReportCapture report;
  connection.GiveRead("RE");
  connection.GiveRead("000");
  CQuorinCommand command("print\r\n", 0);
  command.SetReadTimeout(1234);
  command.Execute(&connection, nullptr);
  const std::string line = "CQuorinCommand::Execute - start reading. Timeout is [1234 msec]";
  EXPECT_THAT(report.Lines(), ElementsAre(line, line));
}

TEST_F(QuorinCommandSending, TracesNoReadWhenNoReplyIsWanted) {
  const ReportCapture report;
  CQuorinCommand command("dm\r\n", kNoReply);
  command.Execute(&connection, nullptr);
  EXPECT_THAT(report.Lines(), ElementsAre());
}

}  // namespace
