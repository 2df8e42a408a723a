// The driver without downloads: arguments, lock, abort, and operations that it does not support.
#include "quorin/quorin_protocol.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <thread>

#include "platform/hresult.h"
#include "quorin/commands.h"
#include "tests/quorin/quorin_driver.h"
#include "tests/support/memory_stream.h"
#include "tests/support/report_capture.h"

using rcvlink::kNotConnected;
using rcvlink::kTimedOut;

using namespace QuorinCommands;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

constexpr uint32_t kFlags = 4098;

TEST(QuorinProtocolWithoutConnection, IsNotConnected) {
  QuorinDriver driver(nullptr);
  short answer = 5;
  CReceiverInfo info{};
  CFileList files;
  MemoryStream stream;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), kNotConnected);
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, &info), kNotConnected);
  EXPECT_EQ(driver.GetFiles(&files), kNotConnected);
  EXPECT_EQ(driver.DownloadFile(L"A", &stream, nullptr), kNotConnected);
  EXPECT_EQ(driver.DeleteFile(L"A"), kNotConnected);
}

TEST(QuorinProtocolWithoutConnection, LooksAtTheArgumentsFirst) {
  QuorinDriver driver(nullptr);
  MemoryStream stream;
  EXPECT_EQ(driver.CheckConnection(nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.GetFiles(nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.DownloadFile(nullptr, &stream, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.DownloadFile(L"A", nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.DeleteFile(nullptr), E_INVALIDARG);
}

TEST(QuorinProtocolWithoutConnection, FailsPortSettingsThroughTheirFirstCommand) {
  QuorinDriver driver(nullptr);
  EXPECT_EQ(driver.DCSetRcvBaudrate(9600), E_INVALIDARG);
  EXPECT_EQ(driver.DCSetRcvRTSControl(1), E_INVALIDARG);
  EXPECT_EQ(driver.DCSetRcvParity(1), E_INVALIDARG);
  EXPECT_EQ(driver.DCSetRcvStopbits(1), E_INVALIDARG);
}

TEST(QuorinProtocolWithoutConnection, AbortsNothing) {
  QuorinDriver driver(nullptr);
  driver.Abort();
  EXPECT_EQ(driver.DCSetRcvBaudrate(9600), E_INVALIDARG);
}

TEST(QuorinProtocolWithoutConnection, LeavesTheRecordAlone) {
  QuorinDriver driver(nullptr);
  wchar_t text[] = L"mine";
  CReceiverInfo info{};
  info.bstrModel = text;
  driver.GetReceiverInfo(nullptr, &info);
  EXPECT_EQ(info.bstrModel, text);
}

class QuorinProtocol : public QuorinDriverTest {};

TEST_F(QuorinProtocol, ChecksArgumentsBeforeAnythingElse) {
  MemoryStream stream;
  EXPECT_EQ(driver.CheckConnection(nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.GetFiles(nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.DownloadFile(nullptr, &stream, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.DownloadFile(L"A", nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.DeleteFile(nullptr), E_INVALIDARG);
  EXPECT_THAT(connection->calls, IsEmpty());
  EXPECT_THAT(progress.percents, IsEmpty());
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(QuorinProtocol, KeepsAnAbortForAnOperationWithItsArguments) {
  driver.Abort();
  EXPECT_EQ(driver.DeleteFile(nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.DeleteFile(L"A"), S_FALSE);
}

TEST_F(QuorinProtocol, NeitherUploadsNorRenames) {
  CFileInfo info{};
  MemoryStream stream;
  EXPECT_EQ(driver.UploadFile(&info, &stream), E_NOTIMPL);
  EXPECT_EQ(driver.UploadFile(nullptr, nullptr), E_NOTIMPL);
  EXPECT_EQ(driver.RenameFile(L"A", L"B"), E_NOTIMPL);
  EXPECT_EQ(driver.RenameFile(nullptr, nullptr), E_NOTIMPL);
  EXPECT_THAT(connection->calls, IsEmpty());
}

TEST(QuorinProtocolLifetime, EndsThatOfTheConnection) {
  bool destroyed = false;
  auto connection = std::make_unique<ScriptedConnection>();
  connection->destroyed = &destroyed;
  {
    const QuorinDriver driver(std::move(connection));
    EXPECT_FALSE(destroyed);
  }
  EXPECT_TRUE(destroyed);
}

TEST_F(QuorinProtocol, CanDoWithoutACallback) {
  driver.SetCallback(nullptr);
  receiver.Reply("remove,A\r\n", "");
  EXPECT_EQ(driver.DeleteFile(L"A"), S_OK);
  EXPECT_THAT(progress.percents, IsEmpty());
}

// One command.
TEST_F(QuorinProtocol, GivesTheOutcomeOfACommand) {
  receiver.Reply("ask\r\n", "");
  CQuorinCommand command("ask\r\n", kFlags);
  EXPECT_EQ(driver.ExecuteCommand(command), S_OK);
}

TEST_F(QuorinProtocol, GivesTheFailureThatEndedACommand) {
  receiver.FailWriteOf("ask\r\n", E_HANDLE);
  CQuorinCommand command("ask\r\n", kFlags);
  EXPECT_EQ(driver.ExecuteCommand(command), E_HANDLE);
}

TEST_F(QuorinProtocol, GivesTheCodeOfACommandsFailedRead) {
  CQuorinCommand command("ask\r\n", kFlags);
  EXPECT_EQ(driver.ExecuteCommand(command), kTimedOut);
}

TEST_F(QuorinProtocol, GivesNothingOfACommandThatWasCancelled) {
  CQuorinCommand command("ask\r\n", kFlags);
  command.Cancel();
  EXPECT_EQ(driver.ExecuteCommand(command), S_OK);
  EXPECT_EQ(command.Kind(), ReplyKind::kNone);
}

// What the report says of failed replies.
TEST_F(QuorinProtocol, ReportsARefusalWithItsTextAndTheName) {
  const ReportCapture report;
  receiver.Reply("ask\r\n", "{4,no 100%s}", "ER");
  CQuorinCommand command("ask\r\n", kFlags);
  EXPECT_EQ(driver.ExecuteCommand(command), kNotConnected);
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DumpInvalidResponse - [0x8007048F] [{4,no 100%s}] [COM7]"));
}

TEST_F(QuorinProtocol, ReportsAFailedReadWithTheName) {
  const ReportCapture report;
  CQuorinCommand command("ask\r\n", kFlags);
  driver.ExecuteCommand(command);
  EXPECT_TRUE(report.Has("CQuorinProtocol::DumpInvalidResponse - [0x800705B4] [COM7]"));
}

TEST_F(QuorinProtocol, ReportsAFailureWithoutANameWhenThereIsNone) {
  const ReportCapture report;
  connection->name_result = E_OUTOFMEMORY;
  CQuorinCommand command("ask\r\n", kFlags);
  driver.ExecuteCommand(command);
  EXPECT_TRUE(report.Has("CQuorinProtocol::DumpInvalidResponse - [0x800705B4] []"));
  receiver.Reply("ask\r\n", "no", "ER");
  driver.ExecuteCommand(command);
  EXPECT_TRUE(report.Has("CQuorinProtocol::DumpInvalidResponse - [0x8007048F] [no] []"));
}

TEST_F(QuorinProtocol, ReportsNoReplyThatIsFine) {
  const ReportCapture report;
  receiver.Reply("ask\r\n", "fine");
  CQuorinCommand command("ask\r\n", kFlags);
  driver.ExecuteCommand(command);
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::DumpInvalidResponse"));
}

TEST_F(QuorinProtocol, ReportsNoFailureOfAWrite) {
  const ReportCapture report;
  receiver.FailWriteOf("ask\r\n", E_HANDLE);
  CQuorinCommand command("ask\r\n", kFlags);
  driver.ExecuteCommand(command);
  EXPECT_FALSE(report.HasStart("CQuorinProtocol::DumpInvalidResponse"));
}

// The abort.
TEST_F(QuorinProtocol, AbortCancelsTheConnection) {
  driver.Abort();
  EXPECT_THAT(connection->calls, ElementsAre("cancel"));
}

TEST_F(QuorinProtocol, AbortCancelsTheCommandThatRuns) {
  connection->Give({S_OK, "RE0", [this] { driver.Abort(); }});
  connection->GiveRead("01x");
  CQuorinCommand command("ask\r\n", 0);
  driver.ExecuteCommand(command);
  EXPECT_TRUE(command.IsCancelled(nullptr));
  EXPECT_EQ(connection->AnswersLeft(), 1U);
}

TEST_F(QuorinProtocol, AbortLeavesACommandAloneThatHasRun) {
  receiver.Reply("ask\r\n", "");
  CQuorinCommand command("ask\r\n", kFlags);
  driver.ExecuteCommand(command);
  driver.Abort();
  EXPECT_FALSE(command.IsCancelled(nullptr));
}

TEST_F(QuorinProtocol, AbortTakesNoLockOfTheConnection) {
  ASSERT_EQ(driver.LockConnection(nullptr), S_OK);
  std::thread([this] { driver.Abort(); }).join();
  EXPECT_THAT(connection->calls, ElementsAre("cancel"));
  driver.UnlockConnection();
}

TEST_F(QuorinProtocol, AbortEndsOneOperationOnly) {
  receiver.Reply("remove,A\r\n", "");
  driver.Abort();
  driver.Abort();
  EXPECT_EQ(driver.DeleteFile(L"A"), S_FALSE);
  EXPECT_EQ(driver.DeleteFile(L"A"), S_OK);
}

// Removing a file.
class QuorinDeleteFile : public QuorinDriverTest {};

TEST_F(QuorinDeleteFile, SendsTheNameAndWaitsForTheReply) {
  const ReportCapture report;
  receiver.Reply("remove,A0101.log\r\n", "");
  EXPECT_EQ(driver.DeleteFile(L"A0101.log"), S_OK);
  EXPECT_THAT(Said(), ElementsAre("%%remove,A0101.log\r\n"));
  EXPECT_THAT(progress.percents, ElementsAre(0, 100));
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DeleteFile - connection is locked " + driver.LockText()));
  EXPECT_TRUE(report.Has("CQuorinProtocol::DeleteFile - OK"));
}

TEST_F(QuorinDeleteFile, SendsTheNameInTheCodePageOfTheThread) {
  char expected[16] = {};
  WideCharToMultiByte(CP_THREAD_ACP, 0, L"\u00C4.log", -1, expected, 16, nullptr, nullptr);
  driver.DeleteFile(L"\u00C4.log");
  EXPECT_THAT(Said(), ElementsAre("%%remove," + std::string(expected) + "\r\n"));
}

TEST_F(QuorinDeleteFile, HoldsTheConnectionMeanwhile) {
  bool free = true;
  receiver.Reply("remove,A\r\n", "");
  receiver.on_hear = [&](const std::string&) { free = IsFreeForOthers(driver); };
  driver.DeleteFile(L"A");
  EXPECT_FALSE(free);
}

TEST_F(QuorinDeleteFile, FailsOnARefusal) {
  const ReportCapture report;
  receiver.Reply("remove,A\r\n", "{no such file}", "ER");
  EXPECT_EQ(driver.DeleteFile(L"A"), kNotConnected);
  EXPECT_THAT(progress.percents, ElementsAre(0));
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_FALSE(report.Has("CQuorinProtocol::DeleteFile - OK"));
}

TEST_F(QuorinDeleteFile, FailsWithoutAReply) {
  EXPECT_EQ(driver.DeleteFile(L"A"), kTimedOut);
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(QuorinDeleteFile, DoesNothingAfterAnAbort) {
  driver.Abort();
  EXPECT_EQ(driver.DeleteFile(L"A"), S_FALSE);
  EXPECT_THAT(Said(), IsEmpty());
  EXPECT_THAT(progress.percents, IsEmpty());
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(QuorinDeleteFile, IsAbortedWhileItWaits) {
  connection->Give({S_FALSE, "", [this] { driver.Abort(); }});
  EXPECT_EQ(driver.DeleteFile(L"A"), S_FALSE);
  EXPECT_THAT(progress.percents, ElementsAre(0));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(QuorinDeleteFile, IsAbortedThoughTheReplyCame) {
  receiver.On("remove,A\r\n", [this](const std::string& tag) {
    connection->Give({S_OK, Message("RE", tag), [this] { driver.Abort(); }});
  });
  EXPECT_EQ(driver.DeleteFile(L"A"), S_FALSE);
  EXPECT_THAT(progress.percents, ElementsAre(0));
}

}  // namespace
