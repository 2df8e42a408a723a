#include "exchange.h"

#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <fstream>
#include <iterator>

#include "exchange_page.h"
#include "exchange_text.h"
#include "results.h"

namespace cli {
namespace {

constexpr unsigned kJapanese = 932;

Exchange Parse(const std::string& report) { return ReadExchange(report, CP_ACP); }

std::string Recorded(const std::string& name) {
  std::ifstream file(std::string(RCVLINK_TEST_DATA) + "/reports/" + name, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

// The only entry with that text in its meaning; fails when it is not the only one.
ExchangeEntry Only(const Exchange& exchange, const std::string& text) {
  std::vector<ExchangeEntry> found;
  std::ranges::copy_if(exchange.entries, std::back_inserter(found), [&](const auto& entry) {
    return entry.meaning.find(text) != std::string::npos;
  });
  EXPECT_EQ(found.size(), 1U) << text;
  return found.empty() ? ExchangeEntry() : found.front();
}

TEST(ExchangeTest, ADownloadOfAQuorinReceiverShowsItsRetries) {
  const Exchange exchange = Parse(Recorded("quorin-retries.txt"));
  EXPECT_EQ(exchange.remarks, std::vector<std::string>());
  EXPECT_EQ(exchange.Count(TraceKind::kCommand), 13U);
  EXPECT_EQ(exchange.Count(TraceKind::kRetry), 3U);
  EXPECT_EQ(exchange.Count(TraceKind::kTimeout), 1U);
  EXPECT_EQ(exchange.Count(TraceKind::kReply), 10U);  // eight, the size, the end of the blocks
  EXPECT_EQ(exchange.Count(TraceKind::kFailure), 0U);
  EXPECT_EQ(exchange.DurationMs(), 10'334U);
  EXPECT_EQ(exchange.Codes(), std::vector{ResultOfWin32(ERROR_TIMEOUT)});

  const ExchangeEntry size = Only(exchange, "read the file size");
  EXPECT_EQ(size.end, ExchangeEnd::kReply);
  EXPECT_EQ(size.until_ms, size.elapsed_ms + 1003);
  EXPECT_EQ(Only(exchange, "set the port: set,").end, ExchangeEnd::kUntold);
  EXPECT_EQ(Only(exchange, "stop all output: dm").kind, TraceKind::kCommand);

  const ExchangeEntry blocks = Only(exchange, "the first block is requested");
  EXPECT_EQ(blocks.end, ExchangeEnd::kReply);
  EXPECT_EQ(blocks.until_ms, blocks.elapsed_ms + 2170);
  const ExchangeEntry reply = Only(exchange, "the blocks ended within 2170 ms");
  EXPECT_EQ(reply.kind, TraceKind::kReply);
  EXPECT_EQ(reply.since_ms, 885U);
  EXPECT_EQ(reply.text, "");
}

TEST(ExchangeTest, ARefusalIsAFailureWithItsCodeAndTheReceiversText) {
  const Exchange exchange = Parse(Recorded("quorin-refused.txt"));
  const ExchangeEntry refusal = Only(exchange, "The receiver sent: {refused}");
  EXPECT_EQ(refusal.kind, TraceKind::kFailure);
  EXPECT_EQ(refusal.code, ResultOfWin32(ERROR_DEVICE_NOT_CONNECTED));
  EXPECT_EQ(Only(exchange, "remove,NAME").end, ExchangeEnd::kFailure);
  const std::string text = ToText(exchange, false);
  EXPECT_NE(text.find("FAILURE"), std::string::npos);
  EXPECT_NE(text.find("0x8007048F, no connection, no complete reply, or refused"),
            std::string::npos);
}

TEST(ExchangeTest, ADownloadOfASilentVelmarReceiverIsCancelled) {
  const Exchange exchange = Parse(Recorded("velmar-silent.txt"));
  EXPECT_EQ(exchange.Count(TraceKind::kCommand), 10U);
  EXPECT_EQ(Only(exchange, "set the language of the port").end, ExchangeEnd::kUntold);
  EXPECT_EQ(Only(exchange, "log filehdra").end, ExchangeEnd::kReply);
  EXPECT_EQ(Only(exchange, "log filetransferb").end, ExchangeEnd::kCancelled);
  EXPECT_EQ(Only(exchange, "currentfile NAME all").end, ExchangeEnd::kReply);
  EXPECT_EQ(Only(exchange, "the wait was cancelled after 24299 ms").thread, 36U);
  EXPECT_EQ(Only(exchange, "waits until the command is sent").kind, TraceKind::kLink);
  EXPECT_NE(ToText(exchange, false).find("  204    cancel"), std::string::npos);
}

// A report cut at any place is read, and only its last entries differ.
TEST(ExchangeTest, ATruncatedReportIsReadUpToItsEnd) {
  const std::string whole = Recorded("quorin-retries.txt");
  for (size_t length = 0; length < whole.size(); length += 7) {
    const Exchange exchange = Parse(whole.substr(0, length));
    EXPECT_EQ(exchange.entries.empty(), length < 21) << length;
  }
  const Exchange cut = Parse(whole.substr(0, whole.size() - 5));
  ASSERT_EQ(cut.remarks.size(), 1U);
  EXPECT_EQ(cut.remarks[0], "The report ends in the middle of its last line.");
}

TEST(ExchangeTest, TextBeforeTheFirstStampGetsARemark) {
  const Exchange exchange = Parse("half a line\r\n00:00:01.0000      7 Bye!\r\n");
  ASSERT_EQ(exchange.entries.size(), 1U);
  EXPECT_EQ(exchange.entries[0].meaning, "the library is unloaded");
  ASSERT_EQ(exchange.remarks.size(), 1U);
  EXPECT_EQ(exchange.remarks[0], "The first 13 bytes are not part of a report.");
}

TEST(ExchangeTest, ATextThatIsNoReportHasNoEntries) {
  for (const char* text : {"",
                           "hello\r\n",
                           "12:00:00 36 Bye!\r\n",
                           "24:00:00.0000     36 Bye!\r\n",
                           "12:00:00.1000     36 Bye!\r\n",
                           "12:00:00.0000 36 Bye!\r\n",
                           "12:00:00.0000     x6 Bye!\r\n",
                           "a 12:00:00.0000     36 Bye!\r\n"}) {
    EXPECT_TRUE(Parse(text).entries.empty()) << text;
  }
}

TEST(ExchangeTest, AReplyMayHaveLineEndsInIt) {
  const Exchange exchange = Parse(
      "12:00:00.0000     36 CVelmarProtocol::DumpInvalidResponse - [0x8007048F] [\r\n<ERROR:a] "
      "[COM7]\r\n12:00:00.0001     36 Bye!\r\n");
  ASSERT_EQ(exchange.entries.size(), 2U);
  EXPECT_EQ(exchange.entries[0].meaning,
            "refused or incomplete. The receiver sent: \\x0D\\x0A<ERROR:a");
}

TEST(ExchangeTest, MidnightPassesAndClocksAreSetBack) {
  const Exchange night = Parse("23:59:59.0900      7 a\r\n00:00:00.0100      7 b\r\n");
  ASSERT_EQ(night.entries.size(), 2U);
  EXPECT_EQ(night.entries[1].since_ms, 200U);
  EXPECT_TRUE(night.remarks.empty());

  const Exchange set = Parse("12:00:00.0000      7 a\r\n11:59:00.0000      7 b\r\n");
  EXPECT_EQ(set.entries[1].since_ms, 0U);
  EXPECT_EQ(set.remarks, std::vector<std::string>{"The clock was set back during the report."});
}

// A line with characters of several bytes loses bytes at its end, and so its line end.
TEST(ExchangeTest, ALineOfAMultiByteCodePageMayRunIntoTheNext) {
  const std::string report =
      "12:00:00.0000      7 CSerialConnection::Open - OK [\x93\xFA\x96\x7B"
      "12:00:00.0005      7 Bye!\r\n";
  const Exchange exchange = ReadExchange(report, kJapanese);
  ASSERT_EQ(exchange.entries.size(), 2U);
  EXPECT_EQ(exchange.entries[0].meaning, "\xE6\x97\xA5\xE6\x9C\xAC is open");
  EXPECT_EQ(exchange.entries[1].since_ms, 5U);
  ASSERT_EQ(exchange.remarks.size(), 1U);
  EXPECT_NE(exchange.remarks[0].find("code page"), std::string::npos);
  // Its missing line end is no sign of a truncated report.
  EXPECT_EQ(ReadExchange(report.substr(0, report.find("Bye") - 21), kJapanese).remarks.size(), 1U);
  // In a line of ASCII only, it is text of the receiver.
  EXPECT_EQ(Parse("12:00:00.0000      7 a 12:00:00.0005      7 b\r\n").entries.size(), 1U);
}

TEST(ExchangeTest, ThreadsDoNotMix) {
  const Exchange exchange = Parse(
      "12:00:00.0000      1 CQuorinProtocol::GetReceiverInfo\r\n"
      "12:00:00.0001      1 CGetReceiverIDCmd::CGetReceiverIDCmd\r\n"
      "12:00:00.0002      1 CSerialConnection::Flush\r\n"
      "12:00:00.0003      1 CQuorinCommand::Execute - start reading. Timeout is [30000 msec]\r\n"
      "12:00:00.0100      2 CAbstractReceiver::GetFiles\r\n"
      "12:00:00.0200      1 CAbstractConnection::Read - wait timeout [COM7]\r\n");
  const ExchangeEntry command = Only(exchange, "print,/par/rcvid");
  EXPECT_EQ(command.end, ExchangeEnd::kTimeout);
  EXPECT_EQ(command.until_ms, 200U);
}

TEST(ExchangeTest, BlocksFollowOnlyARequestThatWasAnswered) {
  const Exchange exchange = Parse(
      "12:00:00.0000      7 CGetFileCmd::CGetFileCmd\r\n"
      "12:00:00.0000      7 CSerialConnection::Flush\r\n"
      "12:00:00.0000      7 CQuorinCommand::Execute - start reading. Timeout is [30000 msec]\r\n"
      "12:00:30.0000      7 CAbstractConnection::Read - wait timeout [COM7]\r\n"
      "12:00:30.0000      7 CSerialConnection::Flush\r\n");
  EXPECT_EQ(exchange.Count(TraceKind::kBlocks), 0U);
  EXPECT_EQ(exchange.entries.back().kind, TraceKind::kCommand);
}

TEST(ExchangeTest, ACommandThatWasNotSentIsNotTheOneThatIs) {
  const Exchange exchange = Parse(
      "12:00:00.0000      7 CPingCmd::CPingCmd\r\n"
      "12:00:00.0000      7 CAbstractReceiver::GetFiles\r\n"
      "12:00:00.0000      7 CSerialConnection::Flush\r\n");
  EXPECT_EQ(Only(exchange, "(not named)").kind, TraceKind::kCommand);
}

TEST(ExchangeTest, AnOpenedPortIsEmptiedWithoutACommand) {
  const Exchange exchange = Parse(
      "12:00:00.0000      7 CreateReceiverOnSerial - opening serial port [COM7]\r\n"
      "12:00:00.0000      7 CSerialConnection::Flush\r\n");
  EXPECT_EQ(exchange.Count(TraceKind::kCommand), 0U);
}

TEST(ExchangeTest, ACodeIsExplainedOnce) {
  const std::string refusal =
      "12:00:00.0000      7 CQuorinProtocol::DumpInvalidResponse - [0x8007048F] [no] [COM7]\r\n";
  EXPECT_EQ(Parse(refusal + refusal).Codes().size(), 1U);
}

TEST(ExchangeTest, AUtf16FileGetsARemark) {
  for (const char* mark : {"\xFF\xFE", "\xFE\xFF"}) {
    EXPECT_EQ(Parse(mark).remarks.size(), 2U) << "the marks are no line either";
  }
  EXPECT_EQ(Parse("a").remarks.size(), 1U);
}

constexpr char kSentCommand[] =
    "12:00:00.0000      7 CPingCmd::CPingCmd\r\n"
    "12:00:00.0300      7 CSerialConnection::Flush\r\n"
    "12:00:01.0000      7 CQuorinCommand::Execute - start reading. Timeout is [8000 msec]\r\n";

// The text leaves out the lines of sent commands, so its times leave them out, too.
TEST(ExchangeTest, TheTextHasALineForEachStep) {
  const Exchange exchange = Parse(kSentCommand);
  const std::string text = ToText(exchange, false);
  EXPECT_EQ(text.find("12:00:00.000           command library -> receiver"), 0U) << text;
  EXPECT_NE(text.find("\n12:00:01.000   +1.0 s  read"), std::string::npos) << text;
  EXPECT_EQ(text.find("Flush"), std::string::npos);
  EXPECT_NE(ToText(exchange, true).find("    | CSerialConnection::Flush\n"), std::string::npos);
}

TEST(ExchangeTest, ShowsAGapInTheUnitThatFits) {
  EXPECT_EQ(Gap(0), "");
  EXPECT_EQ(Gap(999), "+999 ms");
  EXPECT_EQ(Gap(1000), "+1.0 s");
}

TEST(ExchangePageTest, HostAndReceiverHaveAColumnEach) {
  const std::string page = ToPage(
      Parse(std::string(kSentCommand) + "12:00:01.0999      7 CAbstractReceiver::Abort\r\n"), "a");
  const auto has = [&page](const char* text) { return page.find(text) != std::string::npos; };
  EXPECT_TRUE(
      has("<tr class=\"command\"><td class=\"time\">12:00:00.000</td><td class=\"gap\"></td>"
          "<td class=\"thread\">7</td><td></td><td><b>"));
  EXPECT_TRUE(has("<td class=\"gap long\">+1.0 s</td>"));
  EXPECT_TRUE(has("<td class=\"gap\">+999 ms</td>"));
  EXPECT_TRUE(
      has("<tr class=\"cancel\"><td class=\"time\">12:00:01.999</td><td class=\"gap\"></td>"
          "<td class=\"thread\">7</td><td><b>"));
}

TEST(ExchangePageTest, AHostsCallLastsAsLongAsItsThread) {
  const std::string page = ToPage(Parse("12:00:00.0000      1 CAbstractReceiver::GetFiles\r\n"
                                        "12:00:00.0100      1 a note\r\n"
                                        "12:00:00.0905      2 another's\r\n"),
                                  "a");
  // A lane is 905 wide and the report 905 ms long, so each millisecond is 1 wide.
  EXPECT_NE(page.find("<rect class=\"fill-host\" x=\"80\" y=\"6\" width=\"100\""),
            std::string::npos);
}

TEST(ExchangePageTest, WhatWasCancelledHasNotFailed) {
  const std::string page = ToPage(Parse(Recorded("velmar-silent.txt")), "a");
  EXPECT_NE(page.find("<rect class=\"fill-retry\""), std::string::npos);
}

TEST(ExchangePageTest, DeviceTextCannotBecomeMarkup) {
  EXPECT_EQ(Escaped("<a b=\"c\" d='e'>&"), "&lt;a b=&quot;c&quot; d=&#39;e&#39;&gt;&amp;");
  const Exchange exchange = Parse(
      "12:00:00.0000      7 CAbstractReceiver::GetFiles\r\n"
      "12:00:00.0000      7 CreateReceiverOnSerial - opening serial port "
      "[</title><script>x</script>]\r\n"
      "12:00:00.0001      7 CQuorinProtocol::DumpInvalidResponse - [0x8007048F] "
      "[<img src=x onerror=y>] [COM7]\r\n"
      "12:00:00.0002      7 <b>a host's own line</b>\r\n");
  const std::string page = ToPage(exchange, "<i>name");
  for (const char* markup : {"<script", "<img", "<i>", "<b>a host"}) {
    EXPECT_EQ(page.find(markup), std::string::npos) << markup;
  }
  EXPECT_NE(page.find("&lt;img src=x onerror=y&gt;"), std::string::npos);
}

TEST(ExchangePageTest, NeedsNothingButItself) {
  const std::string page = ToPage(Parse(Recorded("quorin-retries.txt")), "a");
  for (const char* outside : {"http:", "https:", "src=", "href=", "url(", "@import", "<script"}) {
    EXPECT_EQ(page.find(outside), std::string::npos) << outside;
  }
  EXPECT_NE(page.find("default-src 'none'"), std::string::npos);
  EXPECT_NE(page.find("prefers-color-scheme: dark"), std::string::npos);
  EXPECT_NE(page.find("<tr class=\"retry\">"), std::string::npos);
  EXPECT_NE(page.find("<rect class=\"fill-retry\""), std::string::npos);
  EXPECT_NE(page.find("0x800705B4 no answer in time"), std::string::npos);
}

TEST(ExchangePageTest, ALongReportIsCutWithARemark) {
  Exchange exchange;
  exchange.entries.resize(kMostPageEntries + 1);
  EXPECT_NE(ToPage(exchange, "a").find("shows the first 20000 of 20001 entries"),
            std::string::npos);
}

}  // namespace
}  // namespace cli
