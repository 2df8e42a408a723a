#include "velmar/velmar_command.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <tuple>
#include <vector>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "tests/support/manual_clock.h"
#include "tests/support/report_capture.h"
#include "tests/support/scripted_connection.h"
#include "tests/velmar/velmar_replies.h"

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

// Nothing went out: an answer would be waited for in vain.
TEST_F(VelmarCommand, AnAbortedWriteEndsIt) {
  connection.on_write = [](std::string_view) { return S_FALSE; };
  EXPECT_EQ(CVelmarCommand("x", 0).Execute(&connection, nullptr), S_FALSE);
  EXPECT_THAT(connection.calls, ElementsAre("flush", "write x"));
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

TEST_F(VelmarCommand, ATimeOutEndsItInPeace) {
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

// Reports have always shown what stood in the buffer at each read, so the beginning stands twice.
TEST_F(VelmarCommand, TheKeptReplyRepeatsWhatWasHeld) {
  connection.GiveRead("\r\n<OK\r");
  connection.GiveRead("\n[COM1]");
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_EQ(Reply(command), "\r\n<OK\r" + kOkPrompt);
}

TEST_F(VelmarCommand, AReplyInPiecesOfAnySizeIsTheSame) {
  for (size_t piece = 1; piece <= kOkPrompt.size(); ++piece) {
    ScriptedConnection pieces;
    for (size_t i = 0; i < kOkPrompt.size(); i += piece) {
      pieces.GiveRead(kOkPrompt.substr(i, piece));
    }
    CVelmarCommand command("x", 0);
    EXPECT_EQ(command.Execute(&pieces, nullptr), S_OK);
    // The first byte alone is a reply's beginning; what is behind the prompt has not come.
    EXPECT_EQ(command.Response(), RESPONSE_OK) << piece;
  }
}

TEST_F(VelmarCommand, ARefusalWithTextIsUnknown) {
  connection.GiveRead(kErrorTextPrompt);
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_TRUE(report.Has("CVelmarCommand::Execute - unknown response type"));
}

TEST_F(VelmarCommand, AnAbbreviatedLogIsNotOffered) {
  connection.GiveRead(kOkPrompt + "<VERSION");
  EXPECT_EQ(CVelmarCommand("x", 0).Execute(&connection, nullptr), static_cast<HRESULT>(0x80004001));
}

TEST_F(VelmarCommand, ALineEndBehindThePromptEndsIt) {
  connection.GiveRead(kOkPrompt + "\r\n");
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
}

TEST_F(VelmarCommand, OtherBytesBehindThePromptAreUnknown) {
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

// --- The parse operations that no exchange reaches

TEST_F(VelmarCommand, AcknowledgementsAsText) {
  const auto parse = [](const char* text) {
    CVelmarCommand command("x", 0);
    const int answer = command.ParseAcknowledgement(text);
    return std::tuple<int, int, std::string>(answer, command.Response(), command.ErrorText());
  };
  EXPECT_EQ(parse(nullptr), std::tuple(0, 3, ""));
  EXPECT_EQ(parse(""), std::tuple(0, 3, ""));
  EXPECT_EQ(parse("\r\n"), std::tuple(0, 3, ""));
  EXPECT_EQ(parse("\r\n<"), std::tuple(0, 3, ""));
  EXPECT_EQ(parse("\r\n<OK"), std::tuple(1, 0, ""));
  EXPECT_EQ(parse("<OK\r\n"), std::tuple(1, 0, ""));
  EXPECT_EQ(parse("<OK\r\nx"), std::tuple(1, 0, ""));
  EXPECT_EQ(parse("<OK\r\ntext"), std::tuple(0, 1, "text"));
  EXPECT_EQ(parse("<ERROR"), std::tuple(1, 2, ""));
  EXPECT_EQ(parse("text"), std::tuple(1, 4, ""));
}

TEST_F(VelmarCommand, AsciiMessages) {
  CVelmarCommand command("x", 0);
  bool done = true;
  EXPECT_EQ(command.ParseAsciiMessage("no separator", &done), S_FALSE);
  EXPECT_FALSE(done);
  EXPECT_EQ(command.ParseAsciiMessage(AsciiLog("VERSIONA", "body", 7, "COM3").c_str(), &done),
            S_OK);
  EXPECT_TRUE(done);
  EXPECT_EQ(command.Header().message_name, L"#VERSIONA");
  EXPECT_EQ(command.Port(), L"COM3");
  EXPECT_EQ(command.Header().gps_week, 1888);
  EXPECT_EQ(command.Header().gps_seconds, 405078.5);
  EXPECT_EQ(command.Header().sequence, 0);  // this way does not read it
  EXPECT_EQ(command.ParseAsciiHeader("a,b,c", 5), S_FALSE);
}

TEST_F(VelmarCommand, ReservedOperationsAreNotOffered) {
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.ParseReserved(nullptr, 0, nullptr, nullptr), E_NOTIMPL);
}

}  // namespace
