#include "api/file_lists.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <memory>
#include <string>

#include "api/registry.h"
#include "platform/hresult.h"
#include "platform/text.h"
#include "tests/support/report_capture.h"
#include "tests/support/stub_receiver.h"

using rcvlink::CopyBstr;
using rcvlink::Receivers;
using rcvlink::UniqueBstr;

namespace {

constexpr HRESULT kInvalid = static_cast<HRESULT>(0x80070057);
const SYSTEMTIME kTime = {2026, 3, 0, 1, 12, 30, 59, 0};

class FileListHandles : public testing::Test {
 protected:
  FileListHandles() {
    auto owned = std::make_shared<StubReceiver>();
    receiver = owned.get();
    receiver->fill = [](CFileList& files) {
      files.Append(CopyBstr(L"one.jps"), 100, kTime);
      files.Append(CopyBstr(L"two.jps"), 0xFFFFFFFF, kTime);
    };
    Receivers().Insert(L"COM7", std::move(owned), &handle);
  }
  ~FileListHandles() override { devapi::CloseReceiver(handle); }

  StubReceiver* receiver;
  void* handle = nullptr;
};

TEST_F(FileListHandles, ListAsTheReceiverGaveIt) {
  void* list = nullptr;
  ASSERT_EQ(devapi::OpenFileList(handle, &list), S_OK);
  long count = 0;
  EXPECT_EQ(devapi::GetFilesCount(list, &count), S_OK);
  EXPECT_EQ(count, 2);
  CFileInfo file;
  memset(&file, 0xEE, sizeof(file));
  const ReportCapture report;
  EXPECT_EQ(devapi::GetFileInfo(list, 1, &file), S_OK);
  const UniqueBstr name(file.bstrName);
  EXPECT_STREQ(file.bstrName, L"two.jps");
  EXPECT_EQ(file.dwSize, 0xFFFFFFFFu);
  EXPECT_EQ(file.dwPadding, 0u);
  EXPECT_EQ(file.qwReserved, 0u);
  EXPECT_EQ(file.stTime1.wYear, 2026);
  EXPECT_EQ(file.stTime2.wHour, 12);
  EXPECT_THAT(report.Lines(), testing::ElementsAre("GetFileInfo - [two.jps] [4294967295]"));
  EXPECT_EQ(devapi::CloseFileList(list), S_OK);
}

TEST_F(FileListHandles, EachCopyOfANameIsTheHosts) {
  void* list = nullptr;
  devapi::OpenFileList(handle, &list);
  CFileInfo first{};
  CFileInfo second{};
  devapi::GetFileInfo(list, 0, &first);
  devapi::GetFileInfo(list, 0, &second);
  const UniqueBstr first_name(first.bstrName);
  const UniqueBstr second_name(second.bstrName);
  EXPECT_NE(first.bstrName, second.bstrName);
  devapi::CloseFileList(list);
  EXPECT_STREQ(first.bstrName, L"one.jps");
}

TEST_F(FileListHandles, IndexesEndBelowTheCount) {
  void* list = nullptr;
  devapi::OpenFileList(handle, &list);
  CFileInfo file{};
  EXPECT_EQ(devapi::GetFileInfo(list, 2, &file), kInvalid);
  EXPECT_EQ(devapi::GetFileInfo(list, 0x7FFFFFFF, &file), kInvalid);
  devapi::CloseFileList(list);
}

TEST_F(FileListHandles, NullPointersAndUnknownListsAreRefused) {
  void* list = nullptr;
  long count = 0;
  CFileInfo file{};
  EXPECT_EQ(devapi::GetFilesCount(&count, &count), kInvalid);  // before a list was opened
  EXPECT_EQ(devapi::OpenFileList(handle, nullptr), kInvalid);
  EXPECT_TRUE(receiver->calls.empty());
  devapi::OpenFileList(handle, &list);
  EXPECT_EQ(devapi::GetFilesCount(list, nullptr), kInvalid);
  EXPECT_EQ(devapi::GetFilesCount(handle, &count), kInvalid);  // a handle of the other kind
  EXPECT_EQ(devapi::GetFileInfo(list, 0, nullptr), kInvalid);
  EXPECT_EQ(devapi::GetFileInfo(nullptr, 0, &file), kInvalid);
  EXPECT_EQ(devapi::GetFileInfo(nullptr, -1, &file), kInvalid);
  EXPECT_EQ(devapi::CloseFileList(handle), kInvalid);
  EXPECT_EQ(devapi::Abort(list), kInvalid);
  EXPECT_EQ(devapi::CloseFileList(list), S_OK);
  EXPECT_EQ(devapi::CloseFileList(list), kInvalid);
  EXPECT_EQ(devapi::GetFilesCount(list, &count), kInvalid);
}

TEST_F(FileListHandles, AFailureMakesNoList) {
  int untouched = 0;
  void* list = &untouched;
  receiver->result = E_OUTOFMEMORY;
  EXPECT_EQ(devapi::OpenFileList(handle, &list), E_OUTOFMEMORY);
  EXPECT_EQ(list, &untouched);
}

TEST_F(FileListHandles, AnotherSuccessMakesAListAndComesBack) {
  void* list = nullptr;
  receiver->result = S_FALSE;
  receiver->fill = nullptr;
  EXPECT_EQ(devapi::OpenFileList(handle, &list), S_FALSE);
  long count = 99;
  EXPECT_EQ(devapi::GetFilesCount(list, &count), S_OK);
  EXPECT_EQ(count, 0);
  EXPECT_EQ(devapi::CloseFileList(list), S_OK);
}

TEST_F(FileListHandles, AListOutlivesItsReceiver) {
  void* list = nullptr;
  devapi::OpenFileList(handle, &list);
  devapi::CloseReceiver(handle);
  CFileInfo file{};
  EXPECT_EQ(devapi::GetFileInfo(list, 0, &file), S_OK);
  const UniqueBstr name(file.bstrName);
  EXPECT_STREQ(file.bstrName, L"one.jps");
  devapi::CloseFileList(list);
}

}  // namespace
