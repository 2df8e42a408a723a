// Identity and model.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/quorin_driver.h"
#include "tests/support/report_capture.h"

using rcvlink::kNotConnected;
using rcvlink::kTimedOut;

using testing::ElementsAre;

namespace {

constexpr char kGetId[] = "print,/par/rcvid\r\n";
constexpr char kGetModel[] = "print,/par/rcv/model\r\n";

class QuorinReceiverInfo : public QuorinDriverTest {
 protected:
  QuorinReceiverInfo() {
    receiver.Reply(kGetId, " QR00421");
    receiver.Reply(kGetModel, "\r\n MODEL-1 ");
  }
  ~QuorinReceiverInfo() override {
    SysFreeString(info.bstrReceiverId);
    SysFreeString(info.bstrModel);
  }

  HRESULT Get() { return driver.GetReceiverInfo(nullptr, &info); }
  // After a failure there are no strings, and the connection is still locked.
  void ExpectNothingButTheLock() {
    EXPECT_EQ(info.bstrReceiverId, nullptr);
    EXPECT_EQ(info.bstrModel, nullptr);
    EXPECT_FALSE(IsFreeForOthers(driver));
    EXPECT_EQ(driver.UnlockConnection(), 1);
    EXPECT_TRUE(IsFreeForOthers(driver));
  }

  CReceiverInfo info{};
};

TEST_F(QuorinReceiverInfo, FillsTheRecord) {
  wchar_t reserved[] = L"mine";
  info = {77, 78, nullptr, reserved, nullptr, 79, 80};
  EXPECT_EQ(Get(), S_OK);
  EXPECT_STREQ(info.bstrReceiverId, L"QR00421");
  EXPECT_STREQ(info.bstrModel, L"MODEL-1 ");
  EXPECT_EQ(SysStringLen(info.bstrModel), 8U);
  EXPECT_EQ(info.dwFeatures, 9U);
  EXPECT_EQ(info.dwProtocol, 1U);
  EXPECT_EQ(info.dwVariant, 1U);
  EXPECT_EQ(info.dwPadding, 78U);
  EXPECT_EQ(info.bstrReserved, reserved);
}

TEST_F(QuorinReceiverInfo, AsksForIdentityThenModel) {
  Get();
  EXPECT_THAT(Said(), ElementsAre("%%print,/par/rcvid\r\n", "%%print,/par/rcv/model\r\n"));
  EXPECT_THAT(progress.percents, ElementsAre(0, 50, 100));
}

TEST_F(QuorinReceiverInfo, AsksForTheModelAfterFiftyPercent) {
  std::vector<std::string> heard_at_half;
  progress.on_progress = [&](BYTE percent) {
    if (percent == 50) heard_at_half = Said();
  };
  Get();
  EXPECT_THAT(heard_at_half, ElementsAre("%%print,/par/rcvid\r\n"));
}

TEST_F(QuorinReceiverInfo, ReleasesTheConnectionBeforeItIsComplete) {
  std::vector<bool> free;
  progress.on_progress = [&](BYTE) { free.push_back(IsFreeForOthers(driver)); };
  EXPECT_EQ(Get(), S_OK);
  EXPECT_THAT(free, ElementsAre(false, false, true));
}

TEST_F(QuorinReceiverInfo, IsTraced) {
  const ReportCapture report;
  Get();
  EXPECT_EQ(report.Lines().front(), "CQuorinProtocol::GetReceiverInfo");
  EXPECT_EQ(report.Lines().back(), "CQuorinProtocol::GetReceiverInfo - OK");
}

TEST_F(QuorinReceiverInfo, IsTracedEvenWithoutARecord) {
  const ReportCapture report;
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, nullptr), E_INVALIDARG);
  EXPECT_THAT(report.Lines(), ElementsAre("CQuorinProtocol::GetReceiverInfo"));
}

TEST_F(QuorinReceiverInfo, MayBeEmptyTexts) {
  receiver.Reply(kGetId, "");
  receiver.Reply(kGetModel, "");
  EXPECT_EQ(Get(), S_OK);
  EXPECT_EQ(SysStringLen(info.bstrReceiverId), 0U);
  EXPECT_EQ(info.dwVariant, 1U);
}

TEST_F(QuorinReceiverInfo, ForgetsTheStringsThatWereInTheRecord) {
  wchar_t old_id[] = L"old";
  wchar_t old_model[] = L"older";
  info.bstrReceiverId = old_id;
  info.bstrModel = old_model;
  receiver.On(kGetId, [](const std::string&) {});
  EXPECT_EQ(Get(), kTimedOut);
  ExpectNothingButTheLock();
}

TEST_F(QuorinReceiverInfo, FailsOnARefusal) {
  const ReportCapture report;
  receiver.Reply(kGetId, "{no}", "ER");
  EXPECT_EQ(Get(), kNotConnected);
  EXPECT_THAT(progress.percents, ElementsAre(0));
  EXPECT_FALSE(report.Has("CQuorinProtocol::GetReceiverInfo - OK"));
  ExpectNothingButTheLock();
}

TEST_F(QuorinReceiverInfo, FailsOnARefusalOfTheModel) {
  receiver.Reply(kGetModel, "{no}", "ER");
  EXPECT_EQ(Get(), kNotConnected);
  EXPECT_THAT(progress.percents, ElementsAre(0, 50));
  ExpectNothingButTheLock();
}

TEST_F(QuorinReceiverInfo, FailsWithACommandThatCannotBeWritten) {
  receiver.FailWriteOf(kGetModel, E_HANDLE);
  EXPECT_EQ(Get(), E_HANDLE);
  ExpectNothingButTheLock();
}

TEST_F(QuorinReceiverInfo, IsNotDoneWithABlankReply) {
  receiver.Reply(kGetId, "QR", "  ");
  EXPECT_EQ(Get(), S_FALSE);
  EXPECT_THAT(progress.percents, ElementsAre(0));
  ExpectNothingButTheLock();
}

TEST_F(QuorinReceiverInfo, IsNotDoneWithABlankReplyForTheModel) {
  receiver.Reply(kGetModel, "HVA3", "  ");
  EXPECT_EQ(Get(), S_FALSE);
  ExpectNothingButTheLock();
}

TEST_F(QuorinReceiverInfo, IsNotDoneWhenAReadGivesNothing) {
  receiver.On(kGetId, [this](const std::string&) { connection->GiveRead(""); });
  EXPECT_EQ(Get(), S_FALSE);
  ExpectNothingButTheLock();
}

TEST_F(QuorinReceiverInfo, IsAbortedBetweenTheTwo) {
  progress.on_progress = [&](BYTE percent) {
    if (percent == 0) driver.Abort();
  };
  EXPECT_EQ(Get(), S_FALSE);
  EXPECT_THAT(Said(), ElementsAre("%%print,/par/rcvid\r\n"));
  EXPECT_THAT(progress.percents, ElementsAre(0));
  ExpectNothingButTheLock();
}

TEST_F(QuorinReceiverInfo, IsAbortedAfterTheModel) {
  receiver.On(kGetModel, [this](const std::string& tag) {
    connection->Give({S_OK, Message("RE", tag + "M"), [this] { driver.Abort(); }});
  });
  EXPECT_EQ(Get(), S_FALSE);
  EXPECT_THAT(progress.percents, ElementsAre(0, 50));
  ExpectNothingButTheLock();
}

TEST_F(QuorinReceiverInfo, IsAbortedWhileItWaits) {
  receiver.On(kGetId, [this](const std::string&) {
    connection->Give({S_FALSE, "", [this] { driver.Abort(); }});
  });
  EXPECT_EQ(Get(), S_FALSE);
  ExpectNothingButTheLock();
}

// The answer has another kind than the one that was waited for. The abort is taken all the same, and
// ends no further operation.
TEST_F(QuorinReceiverInfo, IsAbortedWithABlankReply) {
  receiver.On(kGetId, [this](const std::string& tag) {
    connection->Give({S_OK, Message("  ", tag + "QR"), [this] { driver.Abort(); }});
  });
  receiver.Reply("remove,A.log\r\n", "");
  EXPECT_EQ(Get(), S_FALSE);
  ExpectNothingButTheLock();
  EXPECT_EQ(driver.DeleteFile(L"A.log"), S_OK);
}

TEST_F(QuorinReceiverInfo, FailsOnARefusalThatComesWithAnAbort) {
  receiver.On(kGetId, [this](const std::string& tag) {
    connection->Give({S_OK, Message("ER", tag + "{no}"), [this] { driver.Abort(); }});
  });
  EXPECT_EQ(Get(), kNotConnected);
  ExpectNothingButTheLock();
  EXPECT_EQ(driver.DeleteFile(L"A.log"), S_FALSE) << "the abort is still there";
}

class QuorinVariant : public QuorinReceiverInfo,
                      public testing::WithParamInterface<std::pair<const char*, DWORD>> {};

TEST_P(QuorinVariant, IsThatOfTheFirstFourCharacters) {
  receiver.Reply(kGetModel, GetParam().first);
  EXPECT_EQ(Get(), S_OK);
  EXPECT_EQ(info.dwVariant, GetParam().second);
}

INSTANTIATE_TEST_SUITE_P(Models,
                         QuorinVariant,
                         testing::Values(std::pair("HVA3", 2U),
                                         std::pair("HVB5", 2U),
                                         std::pair("HVA3-G3T", 2U),
                                         std::pair("HVB5X", 2U),
                                         std::pair(" HVA3", 2U),
                                         std::pair("HVA", 1U),
                                         std::pair("HVB", 1U),
                                         std::pair("HVA5", 1U),
                                         std::pair("HVB3", 1U),
                                         std::pair("hva3", 1U),
                                         std::pair("XHVA3", 1U)));

}  // namespace
