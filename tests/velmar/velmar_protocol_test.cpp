#include "velmar/velmar_protocol.h"

#include <thread>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "tests/velmar/velmar_driver.h"

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

// Whether another thread could take the connection.
bool IsFree(CVelmarProtocol& driver) {
  HRESULT result = E_FAIL;
  std::thread([&] {
    const Event at_once(true);
    result = driver.LockConnection(at_once.get());
    if (result == S_OK) driver.UnlockConnection();
  }).join();
  return result == S_OK;
}

// --- The probe

TEST_F(VelmarDriver, AnswersTheProbe) {
  answers = {{kUnlogAll, kOkPrompt}};
  short answer = 0;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, -1);
  EXPECT_THAT(connection->Writes(), ElementsAre(kInterfaceMode, kUnlogAll));
  EXPECT_TRUE(IsFree(driver));
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

TEST_F(VelmarDriver, TheEventIsLookedAtBehindTheFirstCommand) {
  const Event event(false);
  before_command = [&](const std::string&) { SetEvent(event.get()); };
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(event.get(), &answer), S_OK);
  EXPECT_EQ(answer, 0);
  EXPECT_THAT(connection->Writes(), ElementsAre(kInterfaceMode));
}

TEST_F(VelmarDriver, AFailedProbeCommandIsNoReceiver) {
  connection->on_write = [](std::string_view) { return E_HANDLE; };
  short answer = 99;
  EXPECT_EQ(driver.CheckConnection(nullptr, &answer), S_OK);
  EXPECT_EQ(answer, 0);
  EXPECT_TRUE(report.Has("CVelmarProtocol::DumpInvalidResponse - [0x80070006] [] [COM7]"));
}

TEST_F(VelmarDriver, ACheckThatCannotHaveTheLockIsCancelled) {
  driver.LockConnection(nullptr);
  short answer = 99;
  std::thread([&] {
    const Event event(true);
    EXPECT_EQ(driver.CheckConnection(event.get(), &answer), S_FALSE);
  }).join();
  EXPECT_EQ(answer, 99);
  EXPECT_TRUE(report.HasStart("CVelmarProtocol::LockConnection - is cancelled [0x"));
  EXPECT_EQ(driver.UnlockConnection(), 1);
  EXPECT_EQ(driver.UnlockConnection(), 0);
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
  EXPECT_TRUE(IsFree(driver));
  EXPECT_TRUE(report.Has("CVelmarProtocol::GetReceiverInfo - OK"));
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
  EXPECT_TRUE(IsFree(driver));  // this family lets go after a failure
}

// It is unlocked whether or not it was locked, and the report shows it.
TEST_F(VelmarDriver, UnlocksWithoutALock) {
  driver.LockConnection(nullptr);
  std::thread([&] {
    const Event event(true);
    CReceiverInfo info{};
    EXPECT_EQ(driver.GetReceiverInfo(event.get(), &info), S_FALSE);
  }).join();
  EXPECT_TRUE(report.HasStart("CVelmarProtocol::UnlockConnection - connection is unlocked"));
  EXPECT_FALSE(IsFree(driver));
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
  EXPECT_TRUE(IsFree(driver));
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
  EXPECT_EQ(driver.DownloadFile(nullptr, nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(driver.OnDataReceived(nullptr), E_INVALIDARG);
  EXPECT_THAT(connection->calls, IsEmpty());
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
