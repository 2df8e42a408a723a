// Handles and their users: which receivers are registered, and for how long.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <cwctype>
#include <string>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::ElementsAre;
using testing::IsEmpty;

namespace {

// Calls every function that takes a receiver's handle.
void ExpectUnknown(void* handle) {
  wchar_t name[] = L"A.log";
  short answer = 7;
  CReceiverInfo info{};
  CFileInfo file{};
  MemoryStream stream;
  void* list = nullptr;
  EXPECT_EQ(devapi::GetReceiverInfo(handle, nullptr, &info), E_INVALIDARG);
  EXPECT_EQ(devapi::CheckConnection(handle, nullptr, &answer), E_INVALIDARG);
  EXPECT_EQ(devapi::LockConnection(handle, nullptr), E_INVALIDARG);
  EXPECT_EQ(devapi::UnlockConnection(handle), E_INVALIDARG);
  EXPECT_EQ(devapi::Abort(handle), E_INVALIDARG);
  EXPECT_EQ(devapi::OpenFileList(handle, &list), E_INVALIDARG);
  EXPECT_EQ(devapi::DownloadFile(handle, name, &stream, nullptr), E_INVALIDARG);
  EXPECT_EQ(devapi::UploadFile(handle, &file, &stream, nullptr), E_INVALIDARG);
  EXPECT_EQ(devapi::DeleteFileW(handle, name), E_INVALIDARG);
  EXPECT_EQ(devapi::RenameFile(handle, name, name), E_INVALIDARG);
  EXPECT_EQ(devapi::DCSetRcvBaudrate(handle, 9600), E_INVALIDARG);
  EXPECT_EQ(devapi::DCSetRcvParity(handle, 0), E_INVALIDARG);
  EXPECT_EQ(devapi::DCSetRcvRTSControl(handle, 0), E_INVALIDARG);
  EXPECT_EQ(devapi::DCSetRcvStopbits(handle, 0), E_INVALIDARG);
  EXPECT_EQ(devapi::CloseReceiver(handle), E_INVALIDARG);
  EXPECT_EQ(answer, 7);
  EXPECT_EQ(list, nullptr);
  EXPECT_EQ(stream.writes, 0U);
}

TEST(ApiHandles, ThatWereNeverGivenAreUnknown) {
  int something = 0;
  const host::Report report;
  ExpectUnknown(nullptr);
  ExpectUnknown(&something);
  ExpectUnknown(INVALID_HANDLE_VALUE);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CloseReceiver - receiver not found [HANDLE]",
                          "CloseReceiver - receiver not found [HANDLE]",
                          "CloseReceiver - receiver not found [HANDLE]"));
}

TEST(ApiHandles, NothingIsFoundByNameWhileNothingIsOpen) {
  std::wstring name = L"COM10";
  void* handle = &name;
  EXPECT_EQ(devapi::OpenReceiver(name.data(), &handle), S_FALSE);
  EXPECT_EQ(devapi::OpenReceiver(nullptr, &handle), S_FALSE);
  EXPECT_EQ(handle, &name);
  EXPECT_EQ(devapi::OpenReceiver(name.data(), nullptr), E_INVALIDARG);
  EXPECT_EQ(devapi::DestroyReceiver(name.data()), S_FALSE);
  EXPECT_EQ(devapi::DestroyReceiver(nullptr), E_INVALIDARG);
}

TEST(ApiHandles, CountTheirUsers) {
  const bed::SimulatedPort port({"quorin"});
  host::Receiver receiver(port);
  void* const handle = receiver.Release();
  std::wstring name = port.name();
  const std::string text = host::Narrow(name);
  const host::Report report;

  void* again = nullptr;
  EXPECT_EQ(devapi::OpenReceiver(name.data(), &again), S_OK);
  EXPECT_EQ(again, handle);
  std::wstring lower = name;
  for (wchar_t& character : lower) character = static_cast<wchar_t>(std::towlower(character));
  EXPECT_EQ(devapi::OpenReceiver(lower.data(), &again), S_FALSE);
  EXPECT_EQ(devapi::DestroyReceiver(lower.data()), S_FALSE);
  EXPECT_EQ(devapi::CloseReceiver(handle), S_FALSE);
  EXPECT_EQ(devapi::UnlockConnection(handle), S_OK) << "it is gone too early";
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
  EXPECT_THAT(report.Lines(),
              ElementsAre("OpenReceiver - ref [2] [" + text + "]",
                          "CloseReceiver - ref [1] [" + text + "]",
                          "CQuorinProtocol::UnlockConnection - connection is unlocked [HANDLE]",
                          "CAbstractReceiver::Abort",
                          "CAbstractConnection::Cancel [" + text + "]",
                          "CloseReceiver - removed [" + text + "]",
                          "CAbstractConnection::Cancel [" + text + "]",
                          "CAbstractConnection::Disconnect - disconnected [" + text + "]"));
  ExpectUnknown(handle);
  EXPECT_EQ(devapi::OpenReceiver(name.data(), &again), S_FALSE);
}

TEST(ApiHandles, AreDestroyedByName) {
  const bed::SimulatedPort port({"quorin"});
  host::Receiver receiver(port);
  void* const handle = receiver.Release();
  std::wstring name = port.name();
  const std::string text = host::Narrow(name);
  void* again = nullptr;
  ASSERT_EQ(devapi::OpenReceiver(name.data(), &again), S_OK);
  const host::Report report;

  EXPECT_EQ(devapi::DestroyReceiver(name.data()), S_FALSE);
  EXPECT_THAT(report.Lines(), IsEmpty());
  EXPECT_EQ(devapi::UnlockConnection(handle), S_OK) << "it is gone too early";
  EXPECT_EQ(devapi::DestroyReceiver(name.data()), S_OK);
  EXPECT_THAT(report.LinesWith("DestroyReceiver"),
              ElementsAre("DestroyReceiver - removed [" + text + "]"));
  EXPECT_THAT(report.LinesWith("CAbstractReceiver"), IsEmpty()) << "it was aborted";
  EXPECT_THAT(report.LinesWith("CAbstractConnection::Disconnect"),
              ElementsAre("CAbstractConnection::Disconnect - disconnected [" + text + "]"));
  EXPECT_EQ(devapi::DestroyReceiver(name.data()), S_FALSE);
  ExpectUnknown(handle);
}

TEST(ApiHandles, OfAFileListIsNoReceiver) {
  const bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  void* list = nullptr;
  ASSERT_EQ(devapi::OpenFileList(receiver.get(), &list), S_OK);
  ExpectUnknown(list);
  long count = -7;
  EXPECT_EQ(devapi::GetFilesCount(receiver.get(), &count), E_INVALIDARG);
  EXPECT_EQ(devapi::CloseFileList(receiver.get()), E_INVALIDARG);
  EXPECT_EQ(count, -7);
  EXPECT_EQ(devapi::CloseFileList(list), S_OK);
}

TEST(ApiHandles, RefuseMissingArguments) {
  const bed::SimulatedPort port({"quorin"});
  const host::Receiver receiver(port);
  void* const handle = receiver.get();
  const size_t before = port.Transcript().size();
  MemoryStream stream;
  wchar_t name[] = L"A.log";
  EXPECT_EQ(devapi::GetReceiverInfo(handle, nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(devapi::CheckConnection(handle, nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(devapi::OpenFileList(handle, nullptr), E_INVALIDARG);
  EXPECT_EQ(devapi::DownloadFile(handle, nullptr, &stream, nullptr), E_INVALIDARG);
  EXPECT_EQ(devapi::DownloadFile(handle, name, nullptr, nullptr), E_INVALIDARG);
  EXPECT_EQ(devapi::DeleteFileW(handle, nullptr), E_INVALIDARG);
  EXPECT_EQ(port.Transcript().size(), before) << "the receiver was asked nevertheless";
}

}  // namespace
