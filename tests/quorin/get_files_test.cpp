// The directory through the driver.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/hresult.h"
#include "quorin/directory_message.h"
#include "tests/quorin/quorin_driver.h"
#include "tests/support/report_capture.h"

using rcvlink::kNotConnected;
using rcvlink::kTimedOut;

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr char kListCommand[] = "print,/log/&[name,size,time]\r\n";

class QuorinGetFiles : public QuorinDriverTest {
 protected:
  void Answer(const std::vector<std::string>& bodies) {
    receiver.On(kListCommand, [=, this](const std::string& tag) {
      for (const std::string& body : bodies) connection->GiveRead(Message("RE", tag + body));
    });
  }
  void ExpectNothing() {
    EXPECT_EQ(files.Count(), 0);
    EXPECT_TRUE(IsFreeForOthers(driver));
  }

  CFileList files;
};

TEST_F(QuorinGetFiles, FillsARecordForEachFile) {
  Answer({"{{A0101.log,1234,86400}", "{B0202.log,4294967295,0}}"});
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  ASSERT_EQ(files.Count(), 2);
  const CFileInfo& first = files.At(0);
  EXPECT_STREQ(first.bstrName, L"A0101.log");
  EXPECT_EQ(SysStringLen(first.bstrName), 9U);
  EXPECT_EQ(first.dwSize, 1234U);
  EXPECT_EQ(first.dwPadding, 0U);
  EXPECT_EQ(first.qwReserved, 0U);
  EXPECT_EQ(first.stTime1.wYear, 1988);
  EXPECT_EQ(first.stTime1.wMonth, 1);
  EXPECT_EQ(first.stTime1.wDay, 2);
  EXPECT_EQ(first.stTime1.wDayOfWeek, 6);
  EXPECT_EQ(memcmp(&first.stTime1, &first.stTime2, sizeof(first.stTime1)), 0);
  EXPECT_STREQ(files.At(1).bstrName, L"B0202.log");
  EXPECT_EQ(files.At(1).dwSize, 4294967295U);
}

TEST_F(QuorinGetFiles, AppendsToTheList) {
  Answer({"{{A,1,0}}"});
  driver.GetFiles(&files);
  driver.GetFiles(&files);
  EXPECT_EQ(files.Count(), 2);
}

TEST_F(QuorinGetFiles, GivesNoneForAnEmptyDirectory) {
  Answer({"{}"});
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  ExpectNothing();
  EXPECT_THAT(progress.percents, ElementsAre(0, 90));
}

TEST_F(QuorinGetFiles, SharesTheLastTenPercentAmongTheFiles) {
  Answer({"{{A,1,0}", "{B,1,0}", "{C,1,0}}"});
  driver.GetFiles(&files);
  EXPECT_THAT(progress.percents, ElementsAre(0, 90, 90, 93, 96));
}

TEST_F(QuorinGetFiles, ReportsTheProgressOfAFileOnceItIsInTheList) {
  Answer({"{{A,1,0}", "{B,1,0}}"});
  std::vector<long> counts;
  progress.on_progress = [&](BYTE) { counts.push_back(files.Count()); };
  driver.GetFiles(&files);
  EXPECT_THAT(counts, ElementsAre(0, 0, 1, 2));
}

TEST_F(QuorinGetFiles, HoldsTheConnectionUntilTheListIsRead) {
  Answer({"{{A,1,0}}"});
  std::vector<bool> free;
  progress.on_progress = [&](BYTE) { free.push_back(IsFreeForOthers(driver)); };
  receiver.on_hear = [&](const std::string&) { free.push_back(IsFreeForOthers(driver)); };
  driver.GetFiles(&files);
  EXPECT_THAT(free, ElementsAre(true, false, true, true));
}

TEST_F(QuorinGetFiles, IsTraced) {
  const ReportCapture report;
  Answer({"{}"});
  driver.GetFiles(&files);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CGetFileListCmd::CGetFileListCmd",
                          "CQuorinProtocol::GetFiles - connection is locked " + driver.LockText(),
                          "CQuorinCommand::Execute - start reading. Timeout is [30000 msec]",
                          "CQuorinProtocol::GetFiles - connection is unlocked " + driver.LockText(),
                          "CQuorinProtocol::GetFiles - OK"));
}

TEST_F(QuorinGetFiles, FailsOnARefusal) {
  const ReportCapture report;
  receiver.Reply(kListCommand, "{{A,1,0}}", "ER");
  EXPECT_EQ(driver.GetFiles(&files), kNotConnected);
  ExpectNothing();
  EXPECT_THAT(progress.percents, ElementsAre(0));
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::GetFiles - connection is unlocked"));
  EXPECT_FALSE(report.Has("CQuorinProtocol::GetFiles - OK"));
}

TEST_F(QuorinGetFiles, FailsWhenTheListBreaksOff) {
  Answer({"{{A,1,0}"});
  EXPECT_EQ(driver.GetFiles(&files), kTimedOut);
  ExpectNothing();
}

TEST_F(QuorinGetFiles, FailsWhenTheCommandCannotBeWritten) {
  receiver.FailWriteOf(kListCommand, E_HANDLE);
  EXPECT_EQ(driver.GetFiles(&files), E_HANDLE);
  ExpectNothing();
}

TEST_F(QuorinGetFiles, AsksForNothingAfterAnAbort) {
  driver.Abort();
  EXPECT_EQ(driver.GetFiles(&files), S_FALSE);
  EXPECT_THAT(Said(), IsEmpty());
  EXPECT_THAT(progress.percents, ElementsAre(0));
  ExpectNothing();
  Answer({"{{A,1,0}}"});
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
}

TEST_F(QuorinGetFiles, IsAbortedWhileItWaits) {
  connection->Give({S_FALSE, "", [this] { driver.Abort(); }});
  EXPECT_EQ(driver.GetFiles(&files), S_FALSE);
  ExpectNothing();
}

TEST_F(QuorinGetFiles, IsAbortedAmongTheMessages) {
  receiver.On(kListCommand, [this](const std::string& tag) {
    connection->Give({S_OK, Message("RE", tag + "{{A,1,0}"), [this] { driver.Abort(); }});
    connection->GiveRead(Message("RE", tag + "{B,1,0}}"));
  });
  EXPECT_EQ(driver.GetFiles(&files), S_FALSE);
  EXPECT_THAT(progress.percents, ElementsAre(0));
  ExpectNothing();
}

TEST_F(QuorinGetFiles, IsAbortedThoughTheListCame) {
  receiver.On(kListCommand, [this](const std::string& tag) {
    connection->Give({S_OK, Message("RE", tag + "{{A,1,0}}"), [this] { driver.Abort(); }});
  });
  EXPECT_EQ(driver.GetFiles(&files), S_FALSE);
  EXPECT_THAT(progress.percents, ElementsAre(0));
  ExpectNothing();
}

TEST_F(QuorinGetFiles, HasTheSameTimesAsTheReceiver) {
  Answer({"{{A,1,1000000000}}"});
  driver.GetFiles(&files);
  ASSERT_EQ(files.Count(), 1);
  const auto expected = QuorinCommands::TimeFromReceiver(1000000000);
  ASSERT_TRUE(expected.has_value());
  EXPECT_EQ(memcmp(&files.At(0).stTime1, &*expected, sizeof(SYSTEMTIME)), 0);
  EXPECT_EQ(memcmp(&files.At(0).stTime2, &*expected, sizeof(SYSTEMTIME)), 0);
}

}  // namespace
