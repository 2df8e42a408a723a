// A whole download on a scripted connection: the commands around the block transfer.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstddef>
#include <cstdio>
#include <initializer_list>
#include <string>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/download_fixture.h"

using rcvlink::kNotConnected;
using rcvlink::kTimedOut;

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::Not;

namespace {

using QuorinDownload = QuorinDownloadTest;

std::string LinkName(const testing::TestParamInfo<bool>& is_usb) {
  return is_usb.param ? "USB" : "Serial";
}

TEST_F(QuorinDownload, RaisesTheSpeedGetsTheFileAndPutsTheSpeedBack) {
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  ExpectSaid({kSpeedUp, kStart, kBlocks, kRestore});
  EXPECT_EQ(connection->speed, 9600U);
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(QuorinDownload, ReportsProgress) {
  Download();
  // 512 * 99 / 600 + 1
  EXPECT_THAT(progress.percents, ElementsAre(0, 1, 85, 100));
}

TEST_F(QuorinDownload, IsTraced) {
  Download();
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DownloadFile - connection is locked " + driver.LockText()));
  EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadFile - file size [A0101.log] is 600 bytes"));
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::DownloadFile - download"));
}

TEST_F(QuorinDownload, HoldsTheConnectionMeanwhile) {
  std::vector<bool> free;
  progress.on_progress = [&](BYTE) { free.push_back(IsFreeForOthers(driver)); };
  Download();
  EXPECT_THAT(free, ElementsAre(false, false, false, false));
}

TEST_F(QuorinDownload, LeavesTheReferencesOfTheStream) {
  Download();
  EXPECT_EQ(stream.references, 1U);
}

TEST_F(QuorinDownload, SendsTheNameInTheCodePageOfTheThread) {
  char name[16] = {};
  WideCharToMultiByte(CP_THREAD_ACP, 0, L"\u00C4 b", -1, name, 16, nullptr, nullptr);
  const std::string narrow = name;
  receiver.Reply("print,/log/" + narrow + "&size\r\n", "600");
  driver.DownloadFile(L"\u00C4 b", &stream, nullptr);
  EXPECT_THAT(Said(), Contains("%%get,\"" + narrow + "\":{500,512}\r\n"));
}

// The speed.
class QuorinDownloadAtSpeed : public QuorinDownload, public testing::WithParamInterface<DWORD> {};

TEST_P(QuorinDownloadAtSpeed, IsNotReconfigured) {
  connection->speed = GetParam();
  EXPECT_EQ(Download(), S_OK);
  ExpectSaid({kStart, kBlocks});
}

INSTANTIATE_TEST_SUITE_P(Fast, QuorinDownloadAtSpeed, testing::Values(115200, 115201, 460800));

TEST_F(QuorinDownload, RaisesASpeedJustBelow) {
  connection->speed = 115199;
  receiver.Reply("set,cur/term/rate,115199\r\n", "");
  EXPECT_EQ(Download(), S_OK);
  ExpectSaid({kSpeedUp, kStart, kBlocks, {"%%set,cur/term/rate,115199\r\n", "speed 115199"}});
}

TEST_F(QuorinDownload, EndsWhenTheKindOfLinkIsNotKnown) {
  connection->instance_type_result = E_HANDLE;
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_THAT(Said(), IsEmpty());
  EXPECT_THAT(progress.percents, ElementsAre(0));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(QuorinDownload, EndsWhenTheSpeedIsNotKnown) {
  connection->speed_result = E_HANDLE;
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_THAT(Said(), IsEmpty());
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(QuorinDownload, GoesOnSlowlyWhenTheReceiverRefusesItsPort) {
  receiver.Reply(kGetPort, "{no}", "ER");
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  ExpectSaid({{"%%print,/cur/term\r\n"}, kStart, kBlocks});
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DownloadFile - receiver speed up is failed [0x8007048F]"));
}

TEST_F(QuorinDownload, GoesOnSlowlyWhenTheCommandCannotBeSent) {
  receiver.FailWriteOf(kRaise, E_HANDLE);
  EXPECT_EQ(Download(), S_OK);
  ExpectSaid({{"%%print,/cur/term\r\n", kRaise}, kStart, kBlocks});
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DownloadFile - receiver speed up is failed [0x80070006]"));
}

TEST_F(QuorinDownload, GoesOnSlowlyWhenTheReceiverNamesNoPort) {
  receiver.Reply(kGetPort, "usb");
  EXPECT_EQ(Download(), S_OK);
  ExpectSaid({{"%%print,/cur/term\r\n"}, kStart, kBlocks});
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DownloadFile - receiver speed up is failed [0x00000001]"));
}

TEST_F(QuorinDownload, SlowsTheReceiverDownAgainWhenTheHostCannotFollow) {
  connection->set_speed_result = E_HANDLE;
  EXPECT_EQ(Download(), S_OK);
  EXPECT_EQ(stream.bytes, content);
  ExpectSaid(
      {kSpeedUp, {"%%print,/cur/term\r\n", "set,/par/dev/ser/b/rate,9600\r\n"}, kStart, kBlocks});
  EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadFile - host speed up is failed [0x80070006]"));
}

// A receiver that no longer answers is asked for its port only once.
TEST_F(QuorinDownload, SlowsTheReceiverDownOnce) {
  connection->set_speed_result = E_HANDLE;
  int asked = 0;
  receiver.On(kGetPort, [&](const std::string& tag) {
    if (++asked == 1) connection->GiveRead(Message("RE", tag + "/dev/ser/b"));
  });
  Download();
  EXPECT_EQ(asked, 2) << "to raise it, and to slow it down";
}

// But an abort interrupts only one command.
TEST_F(QuorinDownload, SlowsTheReceiverDownThoughAnAbortCutsTheFirstTryOff) {
  connection->set_speed_result = E_HANDLE;
  int asked = 0;
  receiver.On(kGetPort, [&](const std::string& tag) {
    if (++asked == 2) driver.Abort();
    connection->GiveRead(Message("RE", tag + "/dev/ser/b"));
  });
  EXPECT_EQ(Download(), S_FALSE);
  const std::vector<std::string> question = {"%%print,/cur/term\r\n"};
  ExpectSaid({kSpeedUp, question, question, {"set,/par/dev/ser/b/rate,9600\r\n"}});
}

// A host that aborts again and again wants no third question.
TEST_F(QuorinDownload, GivesUpToSlowTheReceiverDownAfterTwoAborts) {
  connection->set_speed_result = E_HANDLE;
  int asked = 0;
  receiver.On(kGetPort, [&](const std::string& tag) {
    if (++asked >= 2) driver.Abort();
    connection->GiveRead(Message("RE", tag + "/dev/ser/b"));
  });
  EXPECT_EQ(Download(), S_FALSE);
  const std::vector<std::string> question = {"%%print,/cur/term\r\n"};
  ExpectSaid({kSpeedUp, question, question});
}

TEST_F(QuorinDownload, TakesAHostThatHadNothingToChange) {
  connection->set_speed_result = S_FALSE;
  EXPECT_EQ(Download(), S_OK);
  ExpectSaid({kSpeedUp, kStart, kBlocks, kRestore});
}

// Over both links. The expected commands leave out the speed, which is raised and put back on a
// serial link.
class QuorinDownloadOverBoth : public QuorinDownload, public testing::WithParamInterface<bool> {
 protected:
  QuorinDownloadOverBoth() {
    if (is_usb) UseUsb();
  }

  void ExpectSaidWithin(std::initializer_list<std::vector<std::string>> said) {
    const std::vector<std::string> all = Joined(said);
    if (is_usb) {
      ExpectSaid({all});
    } else {
      ExpectSaid({kSpeedUp, all, kRestore});
    }
  }

  const bool is_usb = GetParam();
};

// The speed is put back after every failure, and the failure is the result.
class QuorinFailedDownload : public QuorinDownloadOverBoth {
 protected:
  void ExpectFailure(HRESULT failure, std::initializer_list<std::vector<std::string>> said) {
    const DWORD speed = connection->speed;
    EXPECT_EQ(Download(), failure);
    ExpectSaidWithin(said);
    EXPECT_EQ(connection->speed, speed);
    EXPECT_TRUE(IsFreeForOthers(driver));
    char code[16] = {};
    std::snprintf(code, sizeof(code), "[0x%08X]", static_cast<unsigned>(failure));
    EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadFile - download [A0101.log] is failed " +
                           std::string(code)));
  }
  static std::vector<std::string> Start(size_t count) {
    return {kStart.begin(), kStart.begin() + static_cast<std::ptrdiff_t>(count)};
  }
};

INSTANTIATE_TEST_SUITE_P(Over, QuorinDownloadOverBoth, testing::Bool(), LinkName);
INSTANTIATE_TEST_SUITE_P(Over, QuorinFailedDownload, testing::Bool(), LinkName);

TEST_P(QuorinFailedDownload, OfAReceiverThatDoesNotAnswer) {
  receiver.On("\n", [](const std::string&) {});
  ExpectFailure(kTimedOut, {Start(1)});
}

TEST_P(QuorinFailedDownload, OfASizeThatIsRefused) {
  receiver.Reply(kGetSize, "{no such file}", "ER");
  ExpectFailure(kNotConnected, {Start(2)});
  EXPECT_THAT(progress.percents, ElementsAre(0));
}

TEST_P(QuorinFailedDownload, OfAFileOfSizeZero) {
  receiver.Reply(kGetSize, "0");
  ExpectFailure(E_FAIL, {Start(2)});
  EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadFile - file [A0101.log] size is zero"));
  EXPECT_EQ(stream.writes, 0U);
}

TEST_P(QuorinFailedDownload, OfAFileWithoutASize) {
  receiver.Reply(kGetSize, "");
  ExpectFailure(E_FAIL, {Start(2)});
  EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadFile - file [A0101.log] size is zero"));
}

TEST_P(QuorinFailedDownload, OfAFileOfNegativeSize) {
  receiver.Reply(kGetSize, "-5");
  ExpectFailure(E_INVALIDARG, {kStart, {"#"}});
  EXPECT_TRUE(report.Has("CQuorinProtocol::DownloadFile - file size [A0101.log] is -5 bytes"));
}

TEST_P(QuorinFailedDownload, OfAFileThatIsRefused) {
  receiver.Reply(kGetFile, "{no}", "ER");
  ExpectFailure(kNotConnected, {Start(3)});
  EXPECT_THAT(progress.percents, ElementsAre(0));
}

TEST_P(QuorinFailedDownload, OfATransferThatCannotBeStarted) {
  receiver.FailWriteOf("\x15", E_HANDLE);
  ExpectFailure(E_HANDLE, {kStart});
  EXPECT_THAT(progress.percents, ElementsAre(0, 1));
}

TEST_P(QuorinFailedDownload, OfATransferThatStaysSilent) {
  receiver.On("\x15", [](const std::string&) {});
  ExpectFailure(kTimedOut, {kStart, {"\x15", "\x15", "\x15", "#"}});
}

TEST_P(QuorinFailedDownload, OfALastBlockOfNegativeLength) {
  receiver.On("\x15", [this](const std::string&) {
    const std::string block = BlockStream::Make(0x04, 0xFFFF, "", 0);
    connection->GiveRead(is_usb ? block : block.substr(0, 3));  // the part that is read
  });
  ExpectFailure(kNotConnected, {kStart, {"#"}});
}

TEST_P(QuorinFailedDownload, IsThatOfTheTransferThoughTheEndCannotBeWritten) {
  receiver.On("\x15", [](const std::string&) {});
  receiver.FailWriteOf("#", E_HANDLE);
  ExpectFailure(kTimedOut, {kStart, {"\x15", "\x15", "\x15", "#"}});
}

TEST_P(QuorinFailedDownload, OfTheLink) {
  constexpr auto kFailure = static_cast<HRESULT>(0xE0001009);
  receiver.On("\x15", [&](const std::string&) { connection->GiveResult(kFailure); });
  ExpectFailure(kFailure, {kStart, {"#"}});
}

TEST_P(QuorinFailedDownload, OfAnAckThatCannotBeWritten) {
  receiver.FailWriteOf("\x06", E_HANDLE);
  ExpectFailure(E_HANDLE, {kStart, {"\x06", "#"}});
}

TEST_F(QuorinDownload, ThatFailsAtASpeedThatWasNotRaisedPutsNothingBack) {
  connection->speed = 115200;
  receiver.Reply(kGetSize, "0");
  EXPECT_EQ(Download(), E_FAIL);
  ExpectSaid({{kStart[0], kStart[1]}});
}

TEST_F(QuorinDownload, OverALinkOfNoKnownKindIsUnexpected) {
  connection->instance_type = static_cast<EInstanceType>(3);
  EXPECT_EQ(Download(), E_UNEXPECTED);
  ExpectSaid({kStart, {"#"}});
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DownloadFile - download [A0101.log] is failed [0x8000FFFF]"));
}

TEST_P(QuorinDownloadOverBoth, StartsTheTransferOnAnEmptyLine) {
  Download();
  const auto& calls = connection->calls;
  const auto start = std::ranges::find(calls, "write \x15");
  ASSERT_NE(start, calls.end());
  EXPECT_THAT(*(start - 2), testing::StartsWith("read "));
  EXPECT_EQ(*(start - 1), "flush");
  EXPECT_EQ(*(start + 1), is_usb ? "read 512 30000" : "read 3 3000");
  EXPECT_EQ(*(start + 2), is_usb ? "read 6 30000" : "read 515 3000");
  EXPECT_EQ(*(start + 3), "write \x06");
}

TEST_P(QuorinDownloadOverBoth, IsNotDoneWhenTheReceiverEndsIt) {
  receiver.On("\x15", [this](const std::string&) {
    connection->GiveRead("#" + std::string(is_usb ? 517 : 2, '\0'));
  });
  EXPECT_EQ(Download(), S_FALSE);
  ExpectSaidWithin({kStart});
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::DownloadFile - download"));
}

TEST_F(QuorinDownload, SucceedsThoughTheStreamFails) {
  stream.fail_at_write = 0;
  EXPECT_EQ(Download(), S_OK);
  ExpectSaid({kSpeedUp, kStart, {"#"}, kRestore});
}

// Failures of putting the speed back.
TEST_F(QuorinDownload, FailsWhenTheReceiverRefusesTheOldSpeed) {
  receiver.Reply(kPutBack, "{no}", "ER");
  EXPECT_EQ(Download(), kNotConnected);
  EXPECT_EQ(stream.bytes, content);
  ExpectSaid({kSpeedUp, kStart, kBlocks, {kRestore[0]}});
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(QuorinDownload, FailsWhenTheHostCannotGoBack) {
  receiver.On(kPutBack, [this](const std::string& tag) {
    connection->set_speed_result = E_HANDLE;
    connection->GiveRead(Message("RE", tag));
  });
  EXPECT_EQ(Download(), E_HANDLE);
  EXPECT_EQ(stream.bytes, content);
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(QuorinDownload, ReturnsAFailedPutBackRatherThanAFailedTransfer) {
  receiver.Reply(kGetSize, "0");
  receiver.FailWriteOf(kPutBack, E_HANDLE);
  EXPECT_EQ(Download(), E_HANDLE);
}

// Half a line would come before the command that puts the speed back.
TEST_F(QuorinDownload, SendsEverythingWholeAtTheRaisedSpeed) {
  std::vector<std::string> cut;
  const auto answer = connection->on_write;
  bool raised = false;
  connection->on_write = [&](std::string_view bytes) {
    const bool is_control = bytes.size() == 1 && bytes != "\n";
    if (raised && !is_control && !connection->wait_rule.shielded) cut.emplace_back(bytes);
    raised = raised || bytes == kRaise;
    return answer(bytes);
  };
  EXPECT_EQ(Download(), S_OK);
  EXPECT_THAT(cut, testing::IsEmpty());
}

TEST_F(QuorinDownload, SendsTheOldSpeedWhole) {
  bool shielded = false;
  receiver.on_hear = [&](const std::string& command) {
    if (command == kPutBack) shielded = connection->wait_rule.shielded;
  };
  Download();
  EXPECT_TRUE(shielded);
  EXPECT_FALSE(connection->wait_rule.shielded);
}

// Aborts at particular points. A sweep tests all other points.
TEST_F(QuorinDownload, DoesNothingAfterAnAbort) {
  driver.Abort();
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_THAT(Said(), IsEmpty());
  EXPECT_THAT(progress.percents, IsEmpty());
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::DownloadFile"));
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_EQ(Download(), S_OK);
}

TEST_F(QuorinDownload, RaisesNothingWhenAbortedDuringThePortQuery) {
  receiver.On(kGetPort, [this](const std::string& tag) {
    connection->Give({S_OK, Message("RE", tag + "/dev/ser/b"), [this] { driver.Abort(); }});
  });
  EXPECT_EQ(Download(), S_FALSE);
  ExpectSaid({{"%%print,/cur/term\r\n"}});
  EXPECT_EQ(connection->speed, 9600U);
}

TEST_F(QuorinDownload, RaisesBothOrNoneWhenAbortedDuringTheSetting) {
  receiver.On(kRaise, [this](const std::string&) { driver.Abort(); });
  EXPECT_EQ(Download(), S_FALSE);
  ExpectSaid({kSpeedUp, kRestore});
}

TEST_F(QuorinDownload, IsAbortedDuringTheSizeQuery) {
  receiver.On(kGetSize, [this](const std::string& tag) {
    connection->Give({S_OK, Message("RE", tag + "600"), [this] { driver.Abort(); }});
  });
  EXPECT_EQ(Download(), S_FALSE);
  ExpectSaid({kSpeedUp, {kStart[0], kStart[1]}, kRestore});
}

TEST_F(QuorinDownload, IsAbortedBeforeTheTransferStarts) {
  receiver.On(kGetFile, [this](const std::string& tag) {
    connection->Give({S_OK, Message("RE", tag), [this] { driver.Abort(); }});
  });
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_THAT(Said(), Not(Contains("\x15")));
  EXPECT_EQ(connection->speed, 9600U);
}

TEST_F(QuorinDownload, IsAbortedThoughItIsComplete) {
  receiver.On("#", [this](const std::string&) { driver.Abort(); });
  EXPECT_EQ(Download(), S_FALSE);
  EXPECT_EQ(stream.bytes, content);
  ExpectSaid({kSpeedUp, kStart, kBlocks, kRestore});
  receiver.On("#", [](const std::string&) {});
  EXPECT_EQ(Download(), S_OK);
}

}  // namespace
