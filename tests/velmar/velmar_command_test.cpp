#include "velmar/velmar_command.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "tests/support/manual_clock.h"
#include "tests/support/report_capture.h"
#include "tests/support/scripted_connection.h"
#include "tests/velmar/velmar_replies.h"

using rcvlink::KernelHandle;
using rcvlink::kTimedOut;

namespace {

using namespace VelmarCommands;
using testing::ElementsAre;

std::string Reply(const CReceiverCmd& command) {
  return {command.GetReply(), command.GetReply() + command.GetReplyLength()};
}

class VelmarCommand : public testing::Test {
 protected:
  ManualClock clock;
  ReportCapture report;
  ScriptedConnection connection;
};

TEST_F(VelmarCommand, NeedsAConnection) {
  CVelmarCommand command("x\r", 0);
  EXPECT_EQ(command.Execute(nullptr, nullptr), static_cast<HRESULT>(0x80070057));
}

TEST_F(VelmarCommand, FlushesWritesAndReads) {
  connection.GiveRead(kOkPrompt);
  CVelmarCommand command("x\r", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_THAT(connection.calls, ElementsAre("flush", "write x\r", "read 8192 30000"));
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_EQ(Reply(command), kOkPrompt);
}

TEST_F(VelmarCommand, PausesAfterAnExchange) {
  connection.GiveRead(kOkPrompt);
  CVelmarCommand("x\r", 0).Execute(&connection, nullptr);
  EXPECT_EQ(clock.paused, 500u);
}

TEST_F(VelmarCommand, SendOnlyReadsNothingAndDoesNotPause) {
  CVelmarCommand command("x\r", kSendOnly);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_THAT(connection.calls, ElementsAre("flush", "write x\r"));
  EXPECT_EQ(clock.paused, 0u);
}

TEST_F(VelmarCommand, GivesEachWriteHalfASecond) {
  CVelmarCommand("x\r", kAppendCrc | kSendOnly).Execute(&connection, nullptr);
  EXPECT_THAT(connection.write_timeouts, ElementsAre(500u, 500u));
}

TEST_F(VelmarCommand, ReadsTheAnswerToACommandWithItsChecksum) {
  connection.GiveRead(kOkPrompt);
  CVelmarCommand command("123456789", kAppendCrc);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_THAT(connection.calls,
              ElementsAre("flush", "write 123456789", "write \x88\x2D\xFD\x2D", "read 8192 30000"));
  EXPECT_EQ(command.Response(), RESPONSE_OK);
}

TEST_F(VelmarCommand, AppendsItsChecksumLowByteFirst) {
  CVelmarCommand command("123456789", kAppendCrc | kSendOnly);
  command.Execute(&connection, nullptr);
  EXPECT_THAT(connection.Writes(), ElementsAre("123456789", "\x88\x2D\xFD\x2D"));
}

TEST_F(VelmarCommand, GivesTheFailureOfEachStep) {
  connection.on_flush = [] { return E_ACCESSDENIED; };
  EXPECT_EQ(CVelmarCommand("x", 0).Execute(&connection, nullptr), E_ACCESSDENIED);
  connection.on_flush = nullptr;
  connection.on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(CVelmarCommand("x", 0).Execute(&connection, nullptr), E_HANDLE);
  connection.on_write = [](std::string_view bytes) { return bytes == "x" ? S_OK : E_HANDLE; };
  EXPECT_EQ(CVelmarCommand("x", kAppendCrc).Execute(&connection, nullptr), E_HANDLE);
  EXPECT_EQ(clock.paused, 0u);
}

// Half a line would come before the next command.
TEST_F(VelmarCommand, IsSentWhole) {
  std::vector<bool> shielded;
  connection.on_write = [&](std::string_view) {
    shielded.push_back(connection.wait_rule.shielded);
    return S_OK;
  };
  bool shielded_at_read = true;
  connection.Give({S_OK, "x", [&] { shielded_at_read = connection.wait_rule.shielded; }});
  EXPECT_EQ(CVelmarCommand("x", kAppendCrc).Execute(&connection, nullptr), S_OK);
  EXPECT_THAT(shielded, ElementsAre(true, true));
  EXPECT_FALSE(shielded_at_read);
}

TEST_F(VelmarCommand, AnAbortThatCameBeforeItEndsItAfterItsLine) {
  connection.Cancel();
  EXPECT_EQ(CVelmarCommand("x", 0).Execute(&connection, nullptr), S_FALSE);
  EXPECT_EQ(connection.Written(), "x");
}

TEST_F(VelmarCommand, AFailedReadEndsItWithoutAReply) {
  connection.GiveRead("\r\n<OK");
  connection.GiveResult(E_HANDLE);
  CVelmarCommand command("x", 0);
  command.SetReply("before");
  EXPECT_EQ(command.Execute(&connection, nullptr), E_HANDLE);
  EXPECT_TRUE(report.Has("CVelmarCommand::Execute - read failed [0x80070006]"));
  EXPECT_EQ(Reply(command), "before");
  EXPECT_EQ(clock.paused, 0u);
}

TEST_F(VelmarCommand, ATimeOutEndsItWithoutAFailure) {
  CVelmarCommand command("x", 0);
  command.SetReply("before");
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_TRUE(report.Has("CVelmarCommand::Execute - read failed [0x800705B4]"));
  EXPECT_EQ(command.GetReplyLength(), 0u);
  EXPECT_EQ(clock.paused, 500u);
}

TEST_F(VelmarCommand, BytesOfAReadThatTimedOutAreKeptButNotParsed) {
  connection.Give({kTimedOut, kOkPrompt, {}});
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_EQ(Reply(command), kOkPrompt);
}

TEST_F(VelmarCommand, AnEmptyReadEndsIt) {
  connection.GiveResult(S_OK);
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(connection.calls.back(), "read 8192 30000");
}

// Whatever ended it, a read that gives nothing ends the exchange with the bytes received so far.
TEST_F(VelmarCommand, AnEmptyReadInBetweenEndsIt) {
  for (const HRESULT result : {S_OK, kTimedOut}) {
    connection.DropAnswers();
    connection.GiveRead("\r\n<OK\r");
    connection.GiveResult(result);
    connection.GiveRead("\n[COM1]");
    CVelmarCommand command("x", 0);
    EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
    EXPECT_EQ(command.Response(), RESPONSE_INCOMPLETE);
    EXPECT_EQ(Reply(command), "\r\n<OK\r");
    EXPECT_EQ(connection.AnswersLeft(), 1u);
  }
}

// The cancel may have come before the command, which then does not know of it.
TEST_F(VelmarCommand, AReadThatACancelEndedEndsItAtOnce) {
  connection.GiveRead("\r\n<OK\r");
  connection.GiveResult(S_FALSE);
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_FALSE);
  EXPECT_EQ(command.GetReplyLength(), 0u);
  EXPECT_EQ(clock.paused, 0u);
}

// A link without a flush returns S_FALSE.
TEST_F(VelmarCommand, AFlushThatDoesNothingIsNoFailure) {
  connection.on_flush = [] { return S_FALSE; };
  connection.GiveRead(kOkPrompt);
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
}

// The report shows the whole buffer after each read, so the beginning appears twice.
TEST_F(VelmarCommand, TheKeptReplyRepeatsWhatWasHeld) {
  connection.GiveRead("\r\n<OK\r");
  connection.GiveRead("\n[COM1]");
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_EQ(Reply(command), "\r\n<OK\r" + kOkPrompt);
}

TEST_F(VelmarCommand, EachReadHasTheWholeTimeAndTheRestOfTheBuffer) {
  connection.GiveRead("\r\n<OK\r");
  connection.GiveRead("\n[");
  connection.GiveRead("COM1]");
  CVelmarCommand command("x", 0);
  command.SetReadTimeout(700);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_THAT(connection.calls,
              ElementsAre("flush", "write x", "read 8192 700", "read 8186 700", "read 8184 700"));
}

TEST_F(VelmarCommand, AReplyInPiecesOfAnySizeIsTheSame) {
  for (size_t piece = 1; piece <= kOkPrompt.size(); ++piece) {
    ScriptedConnection pieces;
    for (size_t i = 0; i < kOkPrompt.size(); i += piece) {
      pieces.GiveRead(kOkPrompt.substr(i, piece));
    }
    CVelmarCommand command("x", 0);
    EXPECT_EQ(command.Execute(&pieces, nullptr), S_OK);
    EXPECT_EQ(command.Response(), RESPONSE_OK) << piece;
    EXPECT_EQ(pieces.AnswersLeft(), 0u) << piece;
  }
}

TEST_F(VelmarCommand, ARefusalWithTextIsUnknown) {
  connection.GiveRead(kErrorTextPrompt);
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_TRUE(report.Has("CVelmarCommand::Execute - unknown response type"));
}

TEST_F(VelmarCommand, ARefusalWithoutTextIsAnError) {
  connection.GiveRead(kErrorPrompt);
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_ERROR);
  EXPECT_EQ(connection.calls.size(), 3u);
}

TEST_F(VelmarCommand, BytesThatAreNoReplyAreUnknown) {
  connection.GiveRead("x" + kOkPrompt);
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_EQ(Reply(command), "x" + kOkPrompt);
  EXPECT_EQ(connection.calls.size(), 3u);
  EXPECT_EQ(clock.paused, 500u);
}

TEST_F(VelmarCommand, AnAbbreviatedLogIsNotOffered) {
  connection.GiveRead(kOkPrompt + "<VERSION");
  CVelmarCommand command("x", 0);
  command.SetReply("before");
  EXPECT_EQ(command.Execute(&connection, nullptr), static_cast<HRESULT>(0x80004001));
  EXPECT_EQ(Reply(command), "before");
  EXPECT_EQ(clock.paused, 0u);
}

TEST_F(VelmarCommand, ALineEndAfterThePromptEndsIt) {
  for (const std::string& prompt : {kOkPrompt, kErrorPrompt}) {
    connection.calls.clear();
    connection.GiveRead(prompt + "\r\n");
    CVelmarCommand command("x", 0);
    EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
    EXPECT_EQ(command.Response(), prompt == kOkPrompt ? RESPONSE_OK : RESPONSE_ERROR);
    EXPECT_EQ(connection.calls.size(), 3u);
  }
}

TEST_F(VelmarCommand, OtherBytesAfterThePromptAreUnknown) {
  connection.GiveRead(kOkPrompt + "?");
  CVelmarCommand command("x", 0);
  command.Execute(&connection, nullptr);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
}

TEST_F(VelmarCommand, ABufferThatIsFullEndsIt) {
  for (int i = 0; i < 100; ++i) connection.GiveRead("\r\n<OK\r\n[" + std::string(1000, 'C'));
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_INCOMPLETE);
  EXPECT_GT(connection.AnswersLeft(), 80u);
}

// No read of a receiver that sends byte by byte times out.
TEST_F(VelmarCommand, AnAnswerThatDoesNotEndEndsItAfter5Minutes) {
  const std::string prompt = "\r\n<OK\r\n[" + std::string(100, 'C');
  for (const char byte : prompt) {
    connection.Give({S_OK, {byte}, [this] { clock.now += 20000; }});
  }
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_INCOMPLETE);
  EXPECT_TRUE(report.Has("CVelmarCommand::Execute - the answer does not end"));
  EXPECT_GT(clock.now, 300000u);
  EXPECT_LE(clock.now, 321000u);
}

TEST_F(VelmarCommand, AnAnswerThatEndsLateIsRead) {
  connection.Give({S_OK, kOkPrompt.substr(0, 1), [this] { clock.now += 299000; }});
  connection.Give({S_OK, kOkPrompt.substr(1), [this] { clock.now += 29000; }});
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_FALSE(report.Has("CVelmarCommand::Execute - the answer does not end"));
}

TEST_F(VelmarCommand, APromptOfMegabytesEndsItWithTheFirstBuffer) {
  connection.GiveRead("\r\n<OK\r\n[" + std::string(3 << 20, 'C'));
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_INCOMPLETE);
  EXPECT_THAT(connection.calls, ElementsAre("flush", "write x", "read 8192 30000"));
  EXPECT_EQ(command.GetReplyLength(), 8192u);
  EXPECT_EQ(clock.paused, 500u);
}

TEST_F(VelmarCommand, AReplyThatJustFillsTheBufferIsRead) {
  constexpr size_t kAroundPrompt = 9;
  const std::string reply = "\r\n<OK\r\n[" + std::string(8192 - kAroundPrompt, 'C') + "]";
  ASSERT_EQ(reply.size(), 8192u);
  connection.GiveRead(reply.substr(0, 5000));
  connection.GiveRead(reply.substr(5000));
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_EQ(connection.calls.back(), "read 3192 30000");
}

TEST_F(VelmarCommand, ACancelEndsItAtEachCheckpoint) {
  CVelmarCommand early("x", 0);
  early.Cancel();
  EXPECT_EQ(early.Execute(&connection, nullptr), S_FALSE);
  EXPECT_TRUE(connection.calls.empty());

  CVelmarCommand written("x", 0);
  connection.on_write = [&](std::string_view) {
    written.Cancel();
    return S_OK;
  };
  EXPECT_EQ(written.Execute(&connection, nullptr), S_FALSE);
  EXPECT_THAT(connection.calls, ElementsAre("flush", "write x"));
  connection.on_write = nullptr;

  CVelmarCommand reading("x", 0);
  reading.SetReply("before");
  connection.Give({S_OK, kOkPrompt, [&] { reading.Cancel(); }});
  EXPECT_EQ(reading.Execute(&connection, nullptr), S_FALSE);
  EXPECT_EQ(Reply(reading), "before");

  // Also where the read timed out.
  CVelmarCommand waiting("x", 0);
  connection.Give({kTimedOut, "", [&] { waiting.Cancel(); }});
  EXPECT_EQ(waiting.Execute(&connection, nullptr), S_FALSE);
  EXPECT_EQ(clock.paused, 0u);
}

// A command without a reply is already sent when the cancel comes.
TEST_F(VelmarCommand, ACancelAfterASendOnlyCommandIsTooLate) {
  CVelmarCommand command("x", kSendOnly);
  connection.on_write = [&](std::string_view) {
    command.Cancel();
    return S_OK;
  };
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
}

TEST_F(VelmarCommand, IsCancelledAtEachCheckpoint) {
  const KernelHandle event(CreateEventW(nullptr, TRUE, TRUE, nullptr));
  EXPECT_EQ(CVelmarCommand("x", 0).Execute(&connection, event.get()), S_FALSE);
  EXPECT_TRUE(connection.calls.empty());
  ResetEvent(event.get());

  connection.on_write = [&](std::string_view) {
    SetEvent(event.get());
    return S_OK;
  };
  EXPECT_EQ(CVelmarCommand("x", 0).Execute(&connection, event.get()), S_FALSE);
  EXPECT_THAT(connection.calls, ElementsAre("flush", "write x"));
  connection.on_write = nullptr;
  ResetEvent(event.get());

  connection.Give({S_OK, kOkPrompt, [&] { SetEvent(event.get()); }});
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, event.get()), S_FALSE);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_EQ(clock.paused, 0u);
}

// --- Parsers that consume

// Consumes a given number of bytes at each call, and keeps what it was given.
class Eater : public CVelmarCommand {
 public:
  Eater(std::vector<uint32_t> bites, uint32_t flags)
      : CVelmarCommand("x", flags), bites_(std::move(bites)) {}

  HRESULT ParseReply(const char* bytes, uint32_t length, bool* done, uint32_t* consumed) override {
    EXPECT_FALSE(*done);
    EXPECT_EQ(*consumed, 0u);
    seen.emplace_back(bytes, length);
    SetResponse(response);
    if (seen.size() <= bites_.size()) *consumed = bites_[seen.size() - 1];
    *done = seen.size() == done_at;
    return seen.size() == fail_at ? E_ACCESSDENIED : S_OK;
  }

  std::vector<std::string> seen;
  ResponseType response = RESPONSE_INCOMPLETE;
  size_t done_at = 0;  // the number of the call, from 1
  size_t fail_at = 0;

 private:
  std::vector<uint32_t> bites_;
};

TEST_F(VelmarCommand, WhatIsLeftIsParsedBeforeMoreIsRead) {
  connection.GiveRead("abcdef");
  connection.GiveRead("gh");
  Eater command({2, 1}, kStreamed);
  command.done_at = 4;
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_THAT(command.seen, ElementsAre("abcdef", "cdef", "def", "defgh"));
  EXPECT_THAT(connection.calls,
              ElementsAre("flush", "write x", "read 8192 30000", "read 8189 30000"));
  EXPECT_EQ(command.GetReplyLength(), 0u);
}

TEST_F(VelmarCommand, WhatIsLeftIsKeptOnceMoreWithTheNextRead) {
  connection.GiveRead("abcdef");
  connection.GiveRead("gh");
  Eater command({2, 1}, 0);
  command.done_at = 4;
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(Reply(command), "abcdefdefgh");
}

TEST_F(VelmarCommand, AStreamedReplyLeavesTheOldOne) {
  connection.GiveRead("abcdef");
  Eater command({}, kStreamed);
  command.SetReply("before");
  command.done_at = 1;
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(Reply(command), "before");
}

TEST_F(VelmarCommand, NoMoreIsConsumedThanHasCome) {
  connection.GiveRead("abc");
  connection.GiveRead("de");
  Eater command({1000000}, kStreamed);
  command.done_at = 3;
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_THAT(command.seen, ElementsAre("abc", "", "de"));
  EXPECT_EQ(connection.calls.back(), "read 8192 30000");
}

TEST_F(VelmarCommand, AFullBufferThatIsConsumedGoesOn) {
  connection.GiveRead(std::string(8192, 'a') + "b");
  Eater command({8192}, kStreamed);
  command.done_at = 3;
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.seen.back(), "b");
}

// What was consumed has come; the next piece has the whole time again.
TEST_F(VelmarCommand, ALongFileMayTakeLong) {
  for (int i = 0; i < 10; ++i) {
    connection.Give({S_OK, "abc", [this] { clock.now += 200000; }});
  }
  Eater command({3, 0, 3, 0, 3, 0, 3, 0, 3, 0, 3, 0, 3, 0, 3, 0, 3, 0, 3}, kStreamed);
  command.done_at = 20;
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(connection.AnswersLeft(), 0u);
}

// The parser's failure has priority over the other values that it set.
TEST_F(VelmarCommand, AFailingParserEndsIt) {
  connection.GiveRead("abc");
  Eater command({}, 0);
  command.fail_at = 1;
  command.done_at = 1;
  EXPECT_EQ(command.Execute(&connection, nullptr), E_ACCESSDENIED);
  EXPECT_EQ(clock.paused, 0u);
}

TEST_F(VelmarCommand, AnUnknownReplyIsReportedThoughItIsDone) {
  connection.GiveRead("abc");
  Eater command({}, 0);
  command.response = RESPONSE_UNKNOWN;
  command.done_at = 1;
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_TRUE(report.Has("CVelmarCommand::Execute - unknown response type"));
}

TEST_F(VelmarCommand, ALogThatIsNotParsedIsDone) {
  for (const std::string& log : {AsciiLog("A", "body"), BinaryLog{"chunk"}.Bytes()}) {
    connection.GiveRead(kOkPrompt + log);
    CVelmarCommand command("x", 0);
    EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
    EXPECT_EQ(connection.AnswersLeft(), 0u);
  }
  EXPECT_THAT(
      connection.calls,
      ElementsAre("flush", "write x", "read 8192 30000", "flush", "write x", "read 8192 30000"));
}

}  // namespace
