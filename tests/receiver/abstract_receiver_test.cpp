#include "receiver/abstract_receiver.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <vector>

#include "tests/support/memory_stream.h"
#include "tests/support/report_capture.h"

namespace {

using testing::_;
using testing::NiceMock;
using testing::Return;

class MockProtocol : public CIProtocol {
 public:
  MOCK_METHOD(HRESULT, CheckConnection, (HANDLE, short*), (override));
  MOCK_METHOD(HRESULT, GetReceiverInfo, (HANDLE, CReceiverInfo*), (override));
  MOCK_METHOD(HRESULT, GetFiles, (CFileList*), (override));
  MOCK_METHOD(HRESULT, DownloadFile, (const wchar_t*, IStream*, CProgressCallback*), (override));
  MOCK_METHOD(HRESULT, UploadFile, (const CFileInfo*, IStream*), (override));
  MOCK_METHOD(HRESULT, DeleteFile, (const wchar_t*), (override));
  MOCK_METHOD(HRESULT, RenameFile, (const wchar_t*, const wchar_t*), (override));
  MOCK_METHOD(void, SetCallback, (CIProtocolCallback*), (override));
  MOCK_METHOD(void, Abort, (), (override));
  MOCK_METHOD(HRESULT, LockConnection, (HANDLE), (override));
  MOCK_METHOD(HRESULT, UnlockConnection, (), (override));
  MOCK_METHOD(HRESULT, DCSetRcvBaudrate, (DWORD), (override));
  MOCK_METHOD(HRESULT, DCSetRcvRTSControl, (BYTE), (override));
  MOCK_METHOD(HRESULT, DCSetRcvParity, (BYTE), (override));
  MOCK_METHOD(HRESULT, DCSetRcvStopbits, (BYTE), (override));
};

constexpr HRESULT kAnyResult = 0x1234;
constexpr HRESULT kNoDriver = static_cast<HRESULT>(0x8007048F);

class Receiver : public testing::Test {
 protected:
  Receiver() {
    auto owned = std::make_unique<NiceMock<MockProtocol>>();
    driver = owned.get();
    ON_CALL(*driver, SetCallback(_)).WillByDefault([this](CIProtocolCallback* given) {
      callback = given;
    });
    receiver = std::make_unique<CAbstractReceiver>(std::move(owned));
  }

  ReportCapture report;
  NiceMock<MockProtocol>* driver;
  CIProtocolCallback* callback = nullptr;
  std::unique_ptr<CAbstractReceiver> receiver;
  MemoryStream stream;
  const HANDLE event = reinterpret_cast<HANDLE>(0x10);
};

TEST_F(Receiver, GivesItselfToTheDriver) { EXPECT_EQ(callback, receiver.get()); }

TEST_F(Receiver, ItsAddressIsThatOfTheInterface) {
  EXPECT_EQ(static_cast<void*>(static_cast<CIReceiver*>(receiver.get())),
            static_cast<void*>(receiver.get()));
}

TEST_F(Receiver, HandsEachOperationOnAndWritesItsLine) {
  short answer = 0;
  CReceiverInfo info{};
  CFileList files;
  CFileInfo file{};
  EXPECT_CALL(*driver, CheckConnection(event, &answer)).WillOnce(Return(kAnyResult));
  EXPECT_CALL(*driver, GetReceiverInfo(event, &info)).WillOnce(Return(kAnyResult));
  EXPECT_CALL(*driver, GetFiles(&files)).WillOnce(Return(kAnyResult));
  EXPECT_CALL(*driver, UploadFile(&file, &stream)).WillOnce(Return(kAnyResult));
  EXPECT_CALL(*driver, DeleteFile(testing::StrEq(L"a"))).WillOnce(Return(kAnyResult));
  EXPECT_CALL(*driver, RenameFile(testing::StrEq(L"a"), testing::StrEq(L"b")))
      .WillOnce(Return(kAnyResult));
  EXPECT_CALL(*driver, DCSetRcvBaudrate(57600)).WillOnce(Return(kAnyResult));
  EXPECT_CALL(*driver, DCSetRcvRTSControl(3)).WillOnce(Return(kAnyResult));
  EXPECT_CALL(*driver, DCSetRcvParity(4)).WillOnce(Return(kAnyResult));
  EXPECT_CALL(*driver, DCSetRcvStopbits(5)).WillOnce(Return(kAnyResult));
  EXPECT_EQ(receiver->CheckConnection(event, &answer), kAnyResult);
  EXPECT_EQ(receiver->GetReceiverInfo(event, &info), kAnyResult);
  EXPECT_EQ(receiver->GetFiles(&files), kAnyResult);
  EXPECT_EQ(receiver->UploadFile(&file, &stream, nullptr), kAnyResult);
  EXPECT_EQ(receiver->DeleteFile(L"a"), kAnyResult);
  EXPECT_EQ(receiver->RenameFile(L"a", L"b"), kAnyResult);
  EXPECT_EQ(receiver->DCSetRcvBaudrate(57600), kAnyResult);
  EXPECT_EQ(receiver->DCSetRcvRTSControl(3), kAnyResult);
  EXPECT_EQ(receiver->DCSetRcvParity(4), kAnyResult);
  EXPECT_EQ(receiver->DCSetRcvStopbits(5), kAnyResult);
  EXPECT_THAT(report.Lines(),
              testing::ElementsAre("CAbstractReceiver::CheckConnection",
                                   "CAbstractReceiver::GetReceiverInfo",
                                   "CAbstractReceiver::GetFiles",
                                   "CAbstractReceiver::UploadFile",
                                   "CAbstractReceiver::DeleteFile",
                                   "CAbstractReceiver::RenameFile",
                                   "CAbstractReceiver::DCSetRcvBaudrate",
                                   "CAbstractReceiver::DCSetRcvRTSControl",
                                   "CAbstractReceiver::DCSetRcvParity",
                                   "CAbstractReceiver::DCSetRcvStopbits"));
}

TEST_F(Receiver, WritesItsLineBeforeTheDriverWorks) {
  EXPECT_CALL(*driver, DeleteFile(_)).WillOnce([this](const wchar_t*) {
    EXPECT_TRUE(report.Has("CAbstractReceiver::DeleteFile"));
    return S_OK;
  });
  receiver->DeleteFile(L"a");
}

TEST_F(Receiver, AbortAlwaysSucceeds) {
  EXPECT_CALL(*driver, Abort());
  EXPECT_EQ(receiver->Abort(), S_OK);
  EXPECT_TRUE(report.Has("CAbstractReceiver::Abort"));
}

TEST_F(Receiver, StopAbortsWithoutALine) {
  EXPECT_CALL(*driver, Abort());
  receiver->Stop();
  EXPECT_TRUE(report.Lines().empty());
}

TEST_F(Receiver, LocksWithoutALine) {
  EXPECT_CALL(*driver, LockConnection(event)).WillOnce(Return(S_FALSE));
  EXPECT_EQ(receiver->LockConnection(event), S_FALSE);
  EXPECT_TRUE(report.Lines().empty());
}

TEST_F(Receiver, UnlockSucceedsWhateverTheDriverReturns) {
  EXPECT_CALL(*driver, UnlockConnection()).WillOnce(Return(0)).WillOnce(Return(1));
  EXPECT_EQ(receiver->UnlockConnection(), S_OK);
  EXPECT_EQ(receiver->UnlockConnection(), S_OK);
  EXPECT_TRUE(report.Lines().empty());
}

TEST_F(Receiver, ReservedOperationsAreNotOffered) {
  EXPECT_EQ(receiver->Reserved1(), static_cast<HRESULT>(0x80004001));
  EXPECT_EQ(receiver->Reserved2(), static_cast<HRESULT>(0x80004001));
}

void Collect(void* context, unsigned char percent) {
  static_cast<std::vector<int>*>(context)->push_back(percent);
}

TEST_F(Receiver, SettingTheProgressFunctionSucceedsWithoutALine) {
  EXPECT_EQ(receiver->SetProgressCallback(Collect, nullptr), S_OK);
  EXPECT_EQ(receiver->SetProgressCallback(nullptr, nullptr), S_OK);
  EXPECT_TRUE(report.Lines().empty());
}

TEST_F(Receiver, ProgressReachesTheHostDuringATransferOnly) {
  std::vector<int> percents;
  CProgressCallback progress = {Collect, &percents};
  EXPECT_CALL(*driver, DownloadFile(testing::StrEq(L"a"), &stream, &progress))
      .WillOnce([this](const wchar_t*, IStream*, CProgressCallback*) {
        callback->OnProgress(42);
        return kAnyResult;
      });
  callback->OnProgress(1);
  EXPECT_EQ(receiver->DownloadFile(L"a", &stream, &progress), kAnyResult);
  callback->OnProgress(99);
  EXPECT_EQ(percents, std::vector<int>{42});
  EXPECT_TRUE(report.Has("CAbstractReceiver::DownloadFile"));
}

// The function is set before a transfer waits for the receiver's lock.
TEST_F(Receiver, TheLaterOfTwoTransfersGetsTheProgressOfBoth) {
  std::vector<int> first, second;
  CProgressCallback to_first = {Collect, &first};
  CProgressCallback to_second = {Collect, &second};
  EXPECT_CALL(*driver, DownloadFile(testing::StrEq(L"second"), _, _))
      .WillOnce([this](const wchar_t*, IStream*, CProgressCallback*) {
        callback->OnProgress(20);
        return S_OK;
      });
  EXPECT_CALL(*driver, DownloadFile(testing::StrEq(L"first"), _, _))
      .WillOnce([&](const wchar_t*, IStream*, CProgressCallback*) {
        callback->OnProgress(1);
        receiver->DownloadFile(L"second", &stream, &to_second);
        callback->OnProgress(2);
        return S_OK;
      });
  receiver->DownloadFile(L"first", &stream, &to_first);
  EXPECT_EQ(first, std::vector<int>{1});
  EXPECT_EQ(second, std::vector<int>{20});
}

TEST_F(Receiver, ProgressReachesTheHostDuringAnUpload) {
  std::vector<int> percents;
  CProgressCallback progress = {Collect, &percents};
  EXPECT_CALL(*driver, UploadFile(_, _)).WillOnce([this](const CFileInfo*, IStream*) {
    callback->OnProgress(7);
    return E_NOTIMPL;
  });
  EXPECT_EQ(receiver->UploadFile(nullptr, &stream, &progress), E_NOTIMPL);
  callback->OnProgress(99);
  EXPECT_EQ(percents, std::vector<int>{7});
}

TEST_F(Receiver, TransfersWithoutAProgressRecord) {
  EXPECT_CALL(*driver, DownloadFile(_, _, nullptr))
      .Times(2)
      .WillRepeatedly([this](const wchar_t*, IStream*, CProgressCallback*) {
        callback->OnProgress(42);
        return S_OK;
      });
  EXPECT_EQ(receiver->DownloadFile(L"a", &stream, nullptr), S_OK);
  EXPECT_EQ(receiver->DownloadFile(L"a", &stream, nullptr), S_OK);
}

TEST_F(Receiver, TransfersWithARecordThatHasNoFunction) {
  CProgressCallback progress = {nullptr, this};
  EXPECT_CALL(*driver, DownloadFile(_, _, _))
      .WillOnce([this](const wchar_t*, IStream*, CProgressCallback*) {
        callback->OnProgress(42);
        return S_OK;
      });
  EXPECT_EQ(receiver->DownloadFile(L"a", &stream, &progress), S_OK);
}

// Abort is called while a transfer runs, from within the host's progress function too.
TEST_F(Receiver, AbortMayComeFromTheProgressFunction) {
  CProgressCallback progress = {
      [](void* context, unsigned char) { static_cast<CAbstractReceiver*>(context)->Abort(); },
      receiver.get()};
  EXPECT_CALL(*driver, Abort());
  EXPECT_CALL(*driver, DownloadFile(_, _, _))
      .WillOnce([this](const wchar_t*, IStream*, CProgressCallback*) {
        callback->OnProgress(1);
        return S_OK;
      });
  receiver->DownloadFile(L"a", &stream, &progress);
}

TEST(ReceiverWithoutDriver, HasNothingToStop) {
  CAbstractReceiver receiver(nullptr);
  EXPECT_NO_FATAL_FAILURE(receiver.Stop());
}

TEST(ReceiverWithoutDriver, IsNotConnected) {
  const ReportCapture report;
  CAbstractReceiver receiver(nullptr);
  short answer = 0;
  CReceiverInfo info{};
  CFileList files;
  MemoryStream stream;
  EXPECT_EQ(receiver.Reserved1(), kNoDriver);
  EXPECT_EQ(receiver.Reserved2(), kNoDriver);
  EXPECT_EQ(receiver.CheckConnection(nullptr, &answer), kNoDriver);
  EXPECT_EQ(receiver.GetReceiverInfo(nullptr, &info), kNoDriver);
  EXPECT_EQ(receiver.GetFiles(&files), kNoDriver);
  EXPECT_EQ(receiver.DownloadFile(L"a", &stream, nullptr), kNoDriver);
  EXPECT_EQ(receiver.UploadFile(nullptr, &stream, nullptr), kNoDriver);
  EXPECT_EQ(receiver.DeleteFile(L"a"), kNoDriver);
  EXPECT_EQ(receiver.RenameFile(L"a", L"b"), kNoDriver);
  EXPECT_EQ(receiver.Abort(), kNoDriver);
  EXPECT_EQ(receiver.LockConnection(nullptr), kNoDriver);
  EXPECT_EQ(receiver.UnlockConnection(), kNoDriver);
  EXPECT_EQ(receiver.DCSetRcvBaudrate(9600), kNoDriver);
  EXPECT_EQ(receiver.DCSetRcvRTSControl(0), kNoDriver);
  EXPECT_EQ(receiver.DCSetRcvParity(0), kNoDriver);
  EXPECT_EQ(receiver.DCSetRcvStopbits(0), kNoDriver);
  EXPECT_EQ(receiver.SetProgressCallback(nullptr, nullptr), kNoDriver);
  EXPECT_TRUE(report.Lines().empty());
}

}  // namespace
