// How long a command waits for its reply, and how much it holds.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "platform/hresult.h"
#include "tests/quorin/reply_fixture.h"
#include "tests/support/manual_clock.h"

using rcvlink::kNotConnected;
using rcvlink::kTimedOut;

using namespace QuorinCommands;
using testing::ElementsAre;

namespace {

constexpr size_t kBufferLength = 65536;

// The time-out counts over the whole exchange.
class QuorinReplyTimeout : public QuorinReplyTest {
 protected:
  // A read that takes so long.
  void GiveSlowRead(std::string bytes, DWORD takes_ms) {
    connection.Give({S_OK, std::move(bytes), [this, takes_ms] { clock.now += takes_ms; }});
  }

  ManualClock clock;
};

TEST_F(QuorinReplyTimeout, EndsTheCommandOnceItHasPassed) {
  GiveSlowRead("***", 30001);
  GiveSlowRead("RE001x", 0);
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), kNotConnected);
  EXPECT_EQ(Reads(), 1U);
  EXPECT_EQ(command.GetReply(), nullptr);
}

TEST_F(QuorinReplyTimeout, HasNotPassedAtItsLastMillisecond) {
  GiveSlowRead("***", 30000);
  GiveSlowRead("RE001x", 0);
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "x");
}

TEST_F(QuorinReplyTimeout, AddsUpOverTheReads) {
  for (int i = 0; i < 10; ++i) GiveSlowRead("RE010", 400);
  AskCommand command(0);
  command.SetReadTimeout(1000);
  EXPECT_EQ(command.Execute(&connection, nullptr), kNotConnected);
  EXPECT_EQ(Reads(), 3U);
}

TEST_F(QuorinReplyTimeout, IsGivenWholeToEachRead) {
  GiveSlowRead("RE0", 400);
  GiveSlowRead("01x", 400);
  AskCommand command(0);
  command.SetReadTimeout(1000);
  command.Execute(&connection, nullptr);
  EXPECT_THAT(connection.calls,
              ElementsAre("flush", "write ask\r\n", "read 65536 1000", "read 65533 1000"));
}

TEST_F(QuorinReplyTimeout, DoesNotSpoilAReplyThatCameWithTheLastRead) {
  GiveSlowRead("RE001x", 50000);
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "x");
}

TEST_F(QuorinReplyTimeout, EndsAlsoAmongMessagesOfOtherTags) {
  GiveSlowRead("RE003%0%RE003%0%", 30001);
  AskCommand command(kTagged);
  EXPECT_EQ(command.Execute(&connection, nullptr), kNotConnected);
  EXPECT_EQ(Reads(), 1U);
}

TEST_F(QuorinReplyTimeout, CountsOnWhenTheClockWraps) {
  clock.now = 0xFFFFFFF0;
  GiveSlowRead("***", 100);
  GiveSlowRead("RE001x", 0);
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), "x");
}

// The buffer ends.
class QuorinReplyBuffer : public QuorinReplyTest {
 protected:
  static std::string Garbage(size_t length) { return std::string(length, '*'); }
};

TEST_F(QuorinReplyBuffer, FullOfGarbageIsAnEmptyReply) {
  connection.GiveRead(Garbage(kBufferLength + 1));
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kBlank);
  EXPECT_EQ(command.Result(), S_OK);
  EXPECT_STREQ(command.ReplyText().c_str(), "");
  EXPECT_EQ(Reads(), 1U);
}

TEST_F(QuorinReplyBuffer, WithOneByteFreeReadsOn) {
  connection.GiveRead(Garbage(kBufferLength - 1));
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Result(), kTimedOut);
  EXPECT_EQ(connection.calls.back(), "read 1 30000");
}

TEST_F(QuorinReplyBuffer, FullWithAHeaderCutOffAtItsEndIsAnEmptyReply) {
  connection.GiveRead(Garbage(kBufferLength - 4) + "RE00");
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kBlank);
}

TEST_F(QuorinReplyBuffer, HoldsAMessageThatJustFits) {
  const std::string body(0x100, 'x');
  connection.GiveRead(Garbage(kBufferLength - 5 - body.size()) + "RE100");
  connection.GiveRead(body);
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
  EXPECT_EQ(command.ReplyText(), body);
}

TEST_F(QuorinReplyBuffer, RefusesAMessageThatIsOneByteTooLong) {
  const std::string body(0x100, 'x');
  connection.GiveRead(Garbage(kBufferLength - 4 - body.size()) + "RE100");
  connection.GiveRead(body);
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), kNotConnected);
  EXPECT_EQ(Reads(), 1U);
  EXPECT_EQ(command.GetReply(), nullptr);
}

TEST_F(QuorinReplyBuffer, HoldsAnEmptyMessageAtItsVeryEnd) {
  connection.GiveRead(Garbage(kBufferLength - 5) + "ER000");
  AskCommand command(0);
  EXPECT_EQ(command.Execute(&connection, nullptr), kNotConnected);
  EXPECT_EQ(command.Kind(), ReplyKind::kError);
}

}  // namespace
