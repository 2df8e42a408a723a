#include "velmar/velmar_protocol.h"

#include <thread>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "tests/support/memory_stream.h"
#include "tests/velmar/velmar_driver.h"

using rcvlink::HResultError;
using rcvlink::KernelHandle;
using rcvlink::UniqueBstr;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

const std::string kInterfaceMode = "interfacemode thisport novatel novatel on\r";
const std::string kUnlogAll = "unlogall thisport\r";
const std::string kVersion = "log versiona once\r";

std::string VersionReply() {
  return kOkPrompt +
         AsciiLog("VERSIONA", "1,GPSCARD,\"OEM6\",\"SN7\",\"HW\",\"SW\",\"B\",\"D\",\"T\"");
}

class Event : public KernelHandle {
 public:
  explicit Event(bool signalled) : KernelHandle(CreateEventW(nullptr, TRUE, signalled, nullptr)) {}
};

// --- The probe

TEST_F(VelmarDriver, AnswersTheProbe) {
  answers = {{kUnlogAll, kOkPrompt}};
  short answer = 0;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, -1);
  EXPECT_THAT(connection->Writes(), ElementsAre(kInterfaceMode, kUnlogAll));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, ARefusalOrSilenceIsNoReceiver) {
  short answer = 99;
  for (const std::string& reply : {kErrorPrompt, kErrorTextPrompt, std::string()}) {
    answers = {{kUnlogAll, reply}};
    EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
    EXPECT_EQ(answer, 0) << reply;
  }
}

TEST_F(VelmarDriver, ASignalledEventEndsTheProbeButNotTheLock) {
  const Event event(true);
  answers = {{kUnlogAll, kOkPrompt}};
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(event.get(), &answer), S_OK);
  EXPECT_EQ(answer, 0);
  EXPECT_THAT(connection->Writes(), IsEmpty());
  EXPECT_TRUE(report.HasStart("CVelmarProtocol::LockConnection - connection is locked [0x"));
}

TEST_F(VelmarDriver, TheEventIsCheckedAfterTheFirstCommand) {
  const Event event(false);
  before_command = [&](const std::string&) { SetEvent(event.get()); };
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(event.get(), &answer), S_OK);
  EXPECT_EQ(answer, 0);
  EXPECT_THAT(connection->Writes(), ElementsAre(kInterfaceMode));
}

// It only matters that the first of the two commands could be sent.
TEST_F(VelmarDriver, TheAnswerToTheFirstProbeCommandIsIgnored) {
  answers = {{kInterfaceMode, kErrorPrompt}, {kUnlogAll, kOkPrompt}};
  short answer = 0;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, -1);
  EXPECT_THAT(
      connection->calls,
      ElementsAre(
          "flush", "write " + kInterfaceMode, "flush", "write " + kUnlogAll, "read 8192 8000"));
  EXPECT_EQ(clock.paused, 500u);
}

// Any answer other than a single acknowledgement.
TEST_F(VelmarDriver, ALogIsNoAnswerToTheProbe) {
  answers = {{kUnlogAll, kOkPrompt + AsciiLog("A", "body")}};
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, 0);
}

// The flush before the second command may come just when the answer to the first one arrives.
TEST_F(VelmarDriver, TheRestOfAnAnswerThatAFlushHasCutIsNoAnswerToTheProbe) {
  answers = {{kUnlogAll, kOkPrompt.substr(2) + kOkPrompt}};
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, 0);
}

// An answer that comes after the check has timed out is discarded by the next command.
TEST_F(VelmarDriver, TheCommandAfterAFailedCheckWaitsForALateAnswer) {
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, 0);
  const DWORD paused = clock.paused;
  answers = {{kUnlogAll, kOkPrompt}};
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, -1);
  EXPECT_EQ(clock.paused - paused, 500u + 500u) << "before it, and after its question";
}

TEST_F(VelmarDriver, AFailedSecondProbeCommandIsNoReceiver) {
  answers = {{kUnlogAll, kOkPrompt + "<STATUS"}};
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, 0);
  EXPECT_TRUE(report.Has("CVelmarProtocol::DumpInvalidResponse - [0x80004001] [] [COM7]"));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, TheProbeWatchesTheEventWhileItWaits) {
  const Event event(false);
  DWORD watched = WAIT_FAILED;
  before_command = [&](const std::string& command) {
    if (command != kUnlogAll) return;
    connection->Give({S_OK, kOkPrompt, [&] {
                        SetEvent(event.get());
                        watched = WaitForSingleObject(connection->wait_rule.watched, 0);
                      }});
  };
  short answer = 99;
  driver.CheckConnection(event.get(), &answer);
  EXPECT_EQ(watched, WAIT_OBJECT_0);
  EXPECT_EQ(connection->wait_rule.watched, nullptr);
}

TEST(VelmarProbe, WithoutAConnectionIsNo) {
  EXPECT_FALSE(CVelmarProtocol::Probe(nullptr, nullptr));
}

TEST_F(VelmarDriver, AFailedProbeCommandIsNoReceiver) {
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, 0);
  EXPECT_TRUE(report.Has("CVelmarProtocol::DumpInvalidResponse - [0x80070006] [] [COM7]"));
}

// --- GetReceiverInfo

TEST_F(VelmarDriver, ReadsTheIdentity) {
  answers = {{kVersion, VersionReply()}};
  CReceiverInfo info{};
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, &info), S_OK);
  const UniqueBstr id(info.bstrReceiverId);
  const UniqueBstr model(info.bstrModel);
  EXPECT_STREQ(info.bstrReceiverId, L"SN7");
  EXPECT_STREQ(info.bstrModel, L"OEM6");
  EXPECT_EQ(info.dwFeatures, 13u);
  EXPECT_EQ(info.dwProtocol, 2u);
  EXPECT_EQ(info.dwVariant, 2u);
  EXPECT_THAT(percents, ElementsAre(0, 100));
  EXPECT_THAT(
      report.Lines(),
      ElementsAre("CVelmarProtocol::GetReceiverInfo",
                  "CVelmarProtocol::LockConnection - connection is locked " + driver.LockText(),
                  "CGetReceiverInfoCmd::CGetReceiverInfoCmd",
                  "CVelmarProtocol::UnlockConnection - connection is unlocked " + driver.LockText(),
                  "CVelmarProtocol::GetReceiverInfo - OK"));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, HoldsTheConnectionFromTheFirstToTheLastReportOfTheIdentity) {
  answers = {{kVersion, VersionReply()}};
  std::vector<bool> free;
  on_percent = [&](int) { free.push_back(IsFreeForOthers(driver)); };
  CReceiverInfo info{};
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, &info), S_OK);
  const UniqueBstr id(info.bstrReceiverId);
  const UniqueBstr model(info.bstrModel);
  EXPECT_THAT(free, ElementsAre(false, true));
}

// A receiver without components has an empty identity.
TEST_F(VelmarDriver, ReadsAnIdentityOfNothing) {
  answers = {{kVersion, kOkPrompt + AsciiLog("VERSIONA", "0")}};
  CReceiverInfo info{};
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, &info), S_OK);
  const UniqueBstr id(info.bstrReceiverId);
  const UniqueBstr model(info.bstrModel);
  EXPECT_STREQ(info.bstrReceiverId, L"");
  EXPECT_STREQ(info.bstrModel, L"");
}

TEST_F(VelmarDriver, AnIdentityThatFailsGivesItsCode) {
  answers = {{kVersion, kOkPrompt + "<VERSION"}};
  CReceiverInfo info{};
  info.dwFeatures = 77;
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, &info), E_NOTIMPL);
  EXPECT_EQ(info.bstrModel, nullptr);
  EXPECT_EQ(info.dwFeatures, 77u);
  EXPECT_THAT(percents, ElementsAre(0));
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_FALSE(report.Has("CVelmarProtocol::GetReceiverInfo - OK"));
}

TEST_F(VelmarDriver, AnAbortEndsTheIdentityAndIsCleared) {
  answers = {{kVersion, VersionReply()}};
  driver.Abort();
  CReceiverInfo info{};
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, &info), S_FALSE);
  EXPECT_EQ(info.bstrModel, nullptr);
  EXPECT_THAT(connection->Writes(), ElementsAre(kVersion));
  EXPECT_THAT(percents, ElementsAre(0));
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, &info), S_OK);
  const UniqueBstr id(info.bstrReceiverId);
  const UniqueBstr model(info.bstrModel);
}

TEST_F(VelmarDriver, WithoutVersionDataThereIsNoIdentity) {
  answers = {{kVersion, kOkPrompt}};
  wchar_t left_over[] = L"left over";
  CReceiverInfo info{};
  info.bstrReceiverId = left_over;
  info.bstrModel = left_over;
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, &info), S_FALSE);
  EXPECT_EQ(info.bstrReceiverId, nullptr);
  EXPECT_EQ(info.bstrModel, nullptr);
  EXPECT_TRUE(IsFreeForOthers(driver));  // this family unlocks after a failure
}

// It is unlocked even if it was not locked, and the report shows it.
TEST_F(VelmarDriver, UnlocksWithoutALock) {
  driver.LockConnection(nullptr);
  std::thread([&] {
    const Event event(true);
    CReceiverInfo info{};
    EXPECT_EQ(driver.GetReceiverInfo(event.get(), &info), S_FALSE);
  }).join();
  EXPECT_TRUE(report.HasStart("CVelmarProtocol::UnlockConnection - connection is unlocked"));
  EXPECT_FALSE(IsFreeForOthers(driver));
  driver.UnlockConnection();
}

// --- One command

// Ends with a given result and a reply of its own.
class Ending : public VelmarCommands::CVelmarCommand {
 public:
  explicit Ending(HRESULT result) : CVelmarCommand("x", 0), result_(result) {}
  HRESULT Execute(CIConnection* connection, HANDLE abort_event) override {
    EXPECT_NE(connection, nullptr);
    EXPECT_EQ(abort_event, nullptr);
    if (during) during();
    return result_;
  }
  std::function<void()> during;

 private:
  HRESULT result_;
};

TEST_F(VelmarDriver, WritesTheReplyOfAFailedCommandToTheReport) {
  Ending command(E_ACCESSDENIED);
  command.SetReply("some%s\x80text");
  EXPECT_EQ(driver.ExecuteCommand(command), E_ACCESSDENIED);
  EXPECT_TRUE(
      report.Has("CVelmarProtocol::DumpInvalidResponse - [0x80070005] [some%s\x80text] [COM7]"));
}

TEST_F(VelmarDriver, WritesNothingOfACommandThatDidNotFail) {
  for (const HRESULT result : {S_OK, S_FALSE}) {
    Ending command(result);
    command.SetReply("text");
    EXPECT_EQ(driver.ExecuteCommand(command), result);
  }
  EXPECT_THAT(report.Lines(), IsEmpty());
}

TEST_F(VelmarDriver, AConnectionWithoutANameHasAnEmptyOne) {
  connection->name_result = E_FAIL;
  Ending command(E_ACCESSDENIED);
  driver.ExecuteCommand(command);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CVelmarProtocol::DumpInvalidResponse - [0x80070005] [] []"));
}

TEST_F(VelmarDriver, AMissingReplyIsNotTraced) {
  Ending command(E_ACCESSDENIED);
  command.SetReply("text");
  command.FreeReply();
  HRESULT raised = S_OK;
  try {
    driver.ExecuteCommand(command);
  } catch (const HResultError& error) {
    raised = error.code();
  }
  EXPECT_EQ(raised, E_INVALIDARG);
}

TEST_F(VelmarDriver, AnAbortReachesTheCommandThatRuns) {
  Ending command(S_OK);
  command.during = [&] {
    EXPECT_FALSE(command.IsCancelled(nullptr));
    driver.Abort();
    EXPECT_TRUE(command.IsCancelled(nullptr));
  };
  driver.ExecuteCommand(command);
  Ending next(S_OK);
  driver.ExecuteCommand(next);
  driver.Abort();
  EXPECT_FALSE(next.IsCancelled(nullptr));
}

TEST_F(VelmarDriver, WithoutACallbackThereIsNoProgress) {
  driver.SetCallback(nullptr);
  EXPECT_EQ(driver.DeleteFile(L"a"), S_OK);
  EXPECT_THAT(percents, IsEmpty());
}

TEST_F(VelmarDriver, DoesNotOfferUploadsAndRts) {
  EXPECT_EQ(driver.UploadFile(nullptr, nullptr), static_cast<HRESULT>(0x80004001));
  EXPECT_EQ(driver.DCSetRcvRTSControl(1), static_cast<HRESULT>(0x80004001));
  EXPECT_THAT(connection->calls, IsEmpty());
}

TEST_F(VelmarDriver, NullArgumentsAreRefused) {
  EXPECT_EQ(driver.CheckConnection(nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.GetFiles(nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.DeleteFile(nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.RenameFile(nullptr, L"b"), E_INVALIDARG);
  EXPECT_EQ(driver.RenameFile(L"a", nullptr), E_INVALIDARG);
  MemoryStream stream;
  EXPECT_EQ(driver.DownloadFile(nullptr, nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.DownloadFile(L"a", nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.DownloadFile(nullptr, &stream, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.OnDataReceived(nullptr), E_INVALIDARG);
  EXPECT_THAT(connection->calls, IsEmpty());
  EXPECT_THAT(percents, IsEmpty());
}

TEST(VelmarDriverWithoutConnection, IsNotConnected) {
  constexpr HRESULT kNone = static_cast<HRESULT>(0x8007048F);
  CVelmarProtocol driver(nullptr);
  short answer = 0;
  CReceiverInfo info{};
  CFileList files;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), kNone);
  EXPECT_EQ(driver.GetReceiverInfo(nullptr, &info), kNone);
  EXPECT_EQ(driver.GetFiles(&files), kNone);
  EXPECT_EQ(driver.DeleteFile(L"a"), kNone);
  EXPECT_EQ(driver.RenameFile(L"a", L"b"), kNone);
  EXPECT_EQ(driver.DCSetRcvBaudrate(1), kNone);
  EXPECT_EQ(driver.DCSetRcvParity(1), kNone);
  EXPECT_EQ(driver.DCSetRcvStopbits(1), kNone);
  driver.Abort();
}

TEST(VelmarDriverEnd, DestroysItsConnection) {
  bool destroyed = false;
  auto owned = std::make_unique<ScriptedConnection>();
  owned->destroyed = &destroyed;
  { const CVelmarProtocol driver(std::move(owned)); }
  EXPECT_TRUE(destroyed);
}

}  // namespace
