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

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;

const std::string kInterfaceMode = "interfacemode thisport novatel novatel on\r";
const std::string kUnlogAll = "unlogall thisport\r";
const std::string kVersion = "log versiona once\r";
const std::string kDirectory = "log direnta once\r";
const std::string kConfig = "log comconfiga once\r";

std::string VersionReply() {
  return kOkPrompt +
         AsciiLog("VERSIONA", "1,GPSCARD,\"OEM6\",\"SN7\",\"HW\",\"SW\",\"B\",\"D\",\"T\"");
}

std::string ConfigReply(const std::string& port = "COM1") {
  return kOkPrompt +
         AsciiLog("COMCONFIGA", "1," + port + ",9600,E,7,2,XON,ON,OFF,NOVATEL,NOVATEL,ON");
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

// --- GetFiles

TEST_F(VelmarDriver, ListsFilesAndReportsTheirShare) {
  std::string reply = kOkPrompt;
  for (int i = 3; i >= 0; --i) {
    reply += AsciiLog("DIRENTA", "\"f" + std::to_string(i) + "\",10,0,20121231,235959", i);
  }
  answers = {{kDirectory, reply}};
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  ASSERT_EQ(files.Count(), 4);
  EXPECT_STREQ(files.At(0).bstrName, L"f3");
  EXPECT_EQ(files.At(0).stTime2.wYear, 2012);
  EXPECT_THAT(percents, ElementsAre(0, 90, 90, 92, 95, 97));
}

TEST_F(VelmarDriver, FillsTheRecordOfAFile) {
  answers = {{kDirectory, kOkPrompt + AsciiLog("DIRENTA", "\"a b\",1000,7,20130709,010203")}};
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  ASSERT_EQ(files.Count(), 1);
  const CFileInfo& file = files.At(0);
  EXPECT_EQ(file.dwSize, 1000u);
  EXPECT_STREQ(file.bstrName, L"a b");
  EXPECT_EQ(file.qwReserved, 0u);
  for (const SYSTEMTIME& time : {file.stTime1, file.stTime2}) {
    EXPECT_EQ(time.wYear, 2013);
    EXPECT_EQ(time.wMonth, 7);
    EXPECT_EQ(time.wDay, 9);
    EXPECT_EQ(time.wHour, 1);
    EXPECT_EQ(time.wMinute, 2);
    EXPECT_EQ(time.wSecond, 3);
  }
}

// The list belongs to the host: its entries stay.
TEST_F(VelmarDriver, AppendsToTheList) {
  answers = {{kDirectory, kOkPrompt + AsciiLog("DIRENTA", "a,1,0,20121231,235959")}};
  CFileList files;
  driver.GetFiles(&files);
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  EXPECT_EQ(files.Count(), 2);
}

// The logs before a gap in their numbers are still listed.
TEST_F(VelmarDriver, ADirectoryWithAGapIsListedAsFarAsItWent) {
  answers = {{kDirectory,
              kOkPrompt + AsciiLog("DIRENTA", "a,1,0,20121231,235959", 3) +
                  AsciiLog("DIRENTA", "b,1,0,20121231,235959", 1)}};
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  EXPECT_EQ(files.Count(), 2);
  EXPECT_THAT(percents, ElementsAre(0, 90, 90, 95));
}

TEST_F(VelmarDriver, ADirectoryThatIsRefusedIsAnEmptyOne) {
  for (const std::string& refusal : {kErrorPrompt, kErrorTextPrompt, std::string()}) {
    answers = {{kDirectory, refusal}};
    CFileList files;
    EXPECT_EQ(driver.GetFiles(&files), S_OK);
    EXPECT_EQ(files.Count(), 0);
  }
}

TEST_F(VelmarDriver, ADirectoryThatFailsGivesItsCode) {
  answers = {{kDirectory, kOkPrompt + "<DIRENT"}};
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), E_NOTIMPL);
  EXPECT_THAT(percents, ElementsAre(0));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, AnAbortLeavesTheListAlone) {
  answers = {{kDirectory, kOkPrompt + AsciiLog("DIRENTA", "a,1,0,20121231,235959")}};
  driver.Abort();
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_FALSE);
  EXPECT_EQ(files.Count(), 0);
  EXPECT_THAT(percents, ElementsAre(0));
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  EXPECT_EQ(files.Count(), 1);
}

TEST_F(VelmarDriver, HoldsTheConnectionWhileItLists) {
  answers = {{kDirectory, kOkPrompt + AsciiLog("DIRENTA", "a,1,0,20121231,235959")}};
  std::vector<bool> free;
  on_percent = [&](int) { free.push_back(IsFreeForOthers(driver)); };
  CFileList files;
  driver.GetFiles(&files);
  EXPECT_THAT(free, ElementsAre(false, false, false));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, AnEmptyDirectoryEndsAtNinety) {
  answers = {{kDirectory, kOkPrompt}};
  CFileList files;
  EXPECT_EQ(driver.GetFiles(&files), S_OK);
  EXPECT_EQ(files.Count(), 0);
  EXPECT_THAT(percents, ElementsAre(0, 90));
}

// --- DeleteFile, RenameFile

TEST_F(VelmarDriver, DeletesAndRenames) {
  EXPECT_EQ(driver.DeleteFile(L"a.pdc"), S_OK);
  EXPECT_EQ(driver.RenameFile(L"a", L"b"), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre("del file a.pdc\r", "rename a b\r"));
  EXPECT_THAT(percents, ElementsAre(0, 100, 0, 100));
}

TEST_F(VelmarDriver, ARefusedDeletionCountsAsDone) {
  answers = {{"del file a\r", kErrorTextPrompt}};
  EXPECT_EQ(driver.DeleteFile(L"a"), S_OK);
}

TEST_F(VelmarDriver, AChangeThatCannotBeSentGivesItsCode) {
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  EXPECT_EQ(driver.DeleteFile(L"a"), E_HANDLE);
  EXPECT_EQ(driver.RenameFile(L"a", L"b"), E_HANDLE);
  EXPECT_THAT(percents, ElementsAre(0, 0));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, HoldsTheConnectionWhileItChangesAFile) {
  std::vector<bool> free;
  on_percent = [&](int) { free.push_back(IsFreeForOthers(driver)); };
  driver.DeleteFile(L"a");
  driver.RenameFile(L"a", L"b");
  EXPECT_THAT(free, ElementsAre(false, false, false, false));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

// Names are sent unchanged in the code page of the thread.
TEST_F(VelmarDriver, NamesAreInTheCodePageOfTheThread) {
  constexpr LCID kGreek = 0x0408;
  const LCID before = GetThreadLocale();
  SetThreadLocale(kGreek);
  driver.DeleteFile(L"\x3B1 \"%s\"");
  driver.RenameFile(L"\x3B1", L"\x3B2");
  SetThreadLocale(before);
  EXPECT_THAT(connection->Writes(), ElementsAre("del file \xE1 \"%s\"\r", "rename \xE1 \xE2\r"));
}

TEST_F(VelmarDriver, EmptyNamesAreSentToo) {
  EXPECT_EQ(driver.DeleteFile(L""), S_OK);
  EXPECT_EQ(driver.RenameFile(L"", L""), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre("del file \r", "rename  \r"));
}

TEST_F(VelmarDriver, AnAbortBetweenOperationsEndsTheNextAfterItsCommand) {
  driver.Abort();
  EXPECT_EQ(driver.DeleteFile(L"a"), S_FALSE);
  EXPECT_THAT(connection->Writes(), ElementsAre("del file a\r"));
  EXPECT_EQ(driver.DeleteFile(L"a"), S_OK);
}

TEST_F(VelmarDriver, AnAbortDuringARenameEndsIt) {
  before_command = [&](const std::string&) { driver.Abort(); };
  EXPECT_EQ(driver.RenameFile(L"a", L"b"), S_FALSE);
  EXPECT_THAT(connection->calls, Contains("cancel"));
  EXPECT_THAT(percents, ElementsAre(0));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

// --- Port settings

TEST_F(VelmarDriver, ChangesOneSettingOfItsPort) {
  answers = {{kConfig, ConfigReply()}};
  EXPECT_EQ(driver.DCSetRcvBaudrate(115200), S_OK);
  EXPECT_EQ(driver.DCSetRcvParity(2), S_OK);
  EXPECT_EQ(driver.DCSetRcvStopbits(1), S_OK);
  EXPECT_THAT(connection->Writes(),
              ElementsAre(kConfig,
                          "COM 115200 E 7 2 XON\r",
                          kConfig,
                          "COM 9600 O 7 2 XON\r",
                          kConfig,
                          "COM 9600 E 7 1 XON\r"));
}

TEST_F(VelmarDriver, SendsNothingWithoutAPortName) {
  answers = {{kConfig, ConfigReply("COM9")}};
  EXPECT_EQ(driver.DCSetRcvBaudrate(115200), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig));
}

TEST_F(VelmarDriver, AnAbortEndsAPortSettingBeforeItIsSent) {
  answers = {{kConfig, ConfigReply()}};
  driver.Abort();
  EXPECT_EQ(driver.DCSetRcvParity(1), S_FALSE);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig));
}

TEST_F(VelmarDriver, APortSettingClearsTheAbort) {
  answers = {{kConfig, ConfigReply()}};
  driver.Abort();
  EXPECT_EQ(driver.DCSetRcvBaudrate(57600), S_FALSE);
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_EQ(driver.DCSetRcvBaudrate(57600), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig, kConfig, "COM 57600 E 7 2 XON\r"));
}

// The abort is checked only between the two commands: one that comes with the second stays set for
// the next operation.
TEST_F(VelmarDriver, AnAbortWithTheSettingItselfOutlivesIt) {
  answers = {{kConfig, ConfigReply()}};
  before_command = [&](const std::string& command) {
    if (command.starts_with("COM ")) driver.Abort();
  };
  EXPECT_EQ(driver.DCSetRcvStopbits(1), S_OK);
  before_command = nullptr;
  EXPECT_EQ(driver.DeleteFile(L"a"), S_FALSE);
  EXPECT_EQ(driver.DeleteFile(L"a"), S_OK);
}

TEST_F(VelmarDriver, APortSettingThatCannotBeReadGivesItsCode) {
  answers = {{kConfig, kOkPrompt + "<COMCONFIG"}};
  EXPECT_EQ(driver.DCSetRcvBaudrate(1), E_NOTIMPL);
  EXPECT_EQ(driver.DCSetRcvParity(1), E_NOTIMPL);
  EXPECT_EQ(driver.DCSetRcvStopbits(1), E_NOTIMPL);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig, kConfig, kConfig));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, APortSettingThatCannotBeSentGivesItsCode) {
  answers = {{kConfig, ConfigReply()}, {"COM 9600 N 7 2 XON\r", kOkPrompt + "<"}};
  EXPECT_EQ(driver.DCSetRcvParity(0), E_NOTIMPL);
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, APortSettingThatIsRefusedCountsAsDone) {
  for (const std::string& refusal : {kErrorPrompt, kErrorTextPrompt, std::string()}) {
    answers = {{kConfig, ConfigReply()}, {"COM 9600 O 7 2 XON\r", refusal}};
    EXPECT_EQ(driver.DCSetRcvParity(2), S_OK);
  }
}

TEST_F(VelmarDriver, SendsItsSettingsAsTheyAre) {
  answers = {{kConfig, ConfigReply()}};
  EXPECT_EQ(driver.DCSetRcvBaudrate(4294967295), S_OK);
  EXPECT_EQ(driver.DCSetRcvBaudrate(0), S_OK);
  EXPECT_EQ(driver.DCSetRcvParity(0), S_OK);
  EXPECT_EQ(driver.DCSetRcvParity(1), S_OK);
  EXPECT_EQ(driver.DCSetRcvParity(255), S_OK);
  EXPECT_EQ(driver.DCSetRcvStopbits(255), S_OK);
  std::vector<std::string> sent;
  for (const std::string& command : connection->Writes()) {
    if (command != kConfig) sent.push_back(command);
  }
  EXPECT_THAT(sent,
              ElementsAre("COM 4294967295 E 7 2 XON\r",
                          "COM 0 E 7 2 XON\r",
                          "COM 9600 N 7 2 XON\r",
                          "COM 9600 E 7 2 XON\r",
                          "COM 9600 N 7 2 XON\r",
                          "COM 9600 E 7 255 XON\r"));
}

// The header of the log names the port in use.
TEST_F(VelmarDriver, ChangesThePortThatItUses) {
  const std::string ports =
      "2,COM1,9600,N,8,1,N,ON,OFF,NOVATEL,NOVATEL,ON,COM2,38400,O,7,2,CTS,ON,OFF,NOVATEL,NOVATEL,"
      "ON";
  answers = {{kConfig, kOkPrompt + AsciiLog("COMCONFIGA", ports, 0, "COM2")}};
  EXPECT_EQ(driver.DCSetRcvBaudrate(115200), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig, "COM 115200 O 7 2 CTS\r"));
}

TEST_F(VelmarDriver, PortSettingsReportNoProgress) {
  answers = {{kConfig, ConfigReply()}};
  driver.DCSetRcvParity(1);
  EXPECT_THAT(percents, IsEmpty());
}

TEST_F(VelmarDriver, PortSettingsHoldTheConnection) {
  answers = {{kConfig, ConfigReply()}};
  std::vector<bool> free;
  before_command = [&](const std::string&) { free.push_back(IsFreeForOthers(driver)); };
  driver.DCSetRcvBaudrate(1);
  driver.DCSetRcvParity(1);
  driver.DCSetRcvStopbits(1);
  EXPECT_THAT(free, ElementsAre(false, false, false, false, false, false));
  EXPECT_TRUE(IsFreeForOthers(driver));
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
