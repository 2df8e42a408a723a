// The table of rcvlink_c.h, which a host without C++ fills at run time.
#include <gtest/gtest.h>
#include <windows.h>

#include "rcvlink.h"
// After rcvlink.h, whose records it then uses. A header for C has C's casts.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wold-style-cast"
#include "rcvlink_c.h"
#pragma GCC diagnostic pop

namespace {

template <typename Function>
const void* AddressOf(Function* function) {
  return reinterpret_cast<const void*>(function);
}

class CHeader : public testing::Test {
 protected:
  CHeader() { loaded_ = RcvlinkLoad(GetModuleHandleW(L"rcvlink.dll"), &table_) != 0; }

  bool loaded_ = false;
  RcvlinkFunctions table_{};
};

TEST_F(CHeader, EachPointerIsThatOfItsFunction) {
  ASSERT_TRUE(loaded_);
  EXPECT_EQ(AddressOf(table_.SearchReceiver), AddressOf(&devapi::SearchReceiver));
  EXPECT_EQ(AddressOf(table_.CreateReceiverOnSerial), AddressOf(&devapi::CreateReceiverOnSerial));
  EXPECT_EQ(AddressOf(table_.CreateReceiverOnUSB), AddressOf(&devapi::CreateReceiverOnUSB));
  EXPECT_EQ(AddressOf(table_.OpenReceiver), AddressOf(&devapi::OpenReceiver));
  EXPECT_EQ(AddressOf(table_.CloseReceiver), AddressOf(&devapi::CloseReceiver));
  EXPECT_EQ(AddressOf(table_.DestroyReceiver), AddressOf(&devapi::DestroyReceiver));
  EXPECT_EQ(AddressOf(table_.GetReceiverInfo), AddressOf(&devapi::GetReceiverInfo));
  EXPECT_EQ(AddressOf(table_.CheckConnection), AddressOf(&devapi::CheckConnection));
  EXPECT_EQ(AddressOf(table_.LockConnection), AddressOf(&devapi::LockConnection));
  EXPECT_EQ(AddressOf(table_.UnlockConnection), AddressOf(&devapi::UnlockConnection));
  EXPECT_EQ(AddressOf(table_.Abort), AddressOf(&devapi::Abort));
  EXPECT_EQ(AddressOf(table_.OpenFileList), AddressOf(&devapi::OpenFileList));
  EXPECT_EQ(AddressOf(table_.GetFilesCount), AddressOf(&devapi::GetFilesCount));
  EXPECT_EQ(AddressOf(table_.GetFileInfo), AddressOf(&devapi::GetFileInfo));
  EXPECT_EQ(AddressOf(table_.CloseFileList), AddressOf(&devapi::CloseFileList));
  EXPECT_EQ(AddressOf(table_.DownloadFile), AddressOf(&devapi::DownloadFile));
  EXPECT_EQ(AddressOf(table_.UploadFile), AddressOf(&devapi::UploadFile));
  EXPECT_EQ(AddressOf(table_.DeleteFileW), AddressOf(&devapi::DeleteFileW));
  EXPECT_EQ(AddressOf(table_.RenameFile), AddressOf(&devapi::RenameFile));
  EXPECT_EQ(AddressOf(table_.DCSetRcvBaudrate), AddressOf(&devapi::DCSetRcvBaudrate));
  EXPECT_EQ(AddressOf(table_.DCSetRcvParity), AddressOf(&devapi::DCSetRcvParity));
  EXPECT_EQ(AddressOf(table_.DCSetRcvRTSControl), AddressOf(&devapi::DCSetRcvRTSControl));
  EXPECT_EQ(AddressOf(table_.DCSetRcvStopbits), AddressOf(&devapi::DCSetRcvStopbits));
  using Name = void(const char*);
  using WideName = void(const wchar_t*);
  using Entry = void(const char*, char*);
  using WideEntry = void(const wchar_t*, char*);
  EXPECT_EQ(AddressOf(table_.CreateReportFileA), AddressOf<Name>(&dump_hlp::CreateReportFile));
  EXPECT_EQ(AddressOf(table_.CreateReportFileW), AddressOf<WideName>(&dump_hlp::CreateReportFile));
  EXPECT_EQ(AddressOf(table_.DumpReportStringA), AddressOf<Entry>(&dump_hlp::DumpReportString));
  EXPECT_EQ(AddressOf(table_.DumpReportStringW), AddressOf<WideEntry>(&dump_hlp::DumpReportString));
  EXPECT_EQ(AddressOf(table_.CloseReportFile), AddressOf(&dump_hlp::CloseReportFile));
  EXPECT_EQ(AddressOf(table_.SearchReceiverOnSerial), AddressOf(&SearchReceiverOnSerial));
  EXPECT_EQ(AddressOf(table_.GetConnection), AddressOf(&GetConnection));
}

TEST_F(CHeader, BothNamesAreThoseOfTheFunction) {
  for (const auto& names : kRcvlinkNames) {
    const HMODULE module = GetModuleHandleW(L"rcvlink.dll");
    EXPECT_NE(GetProcAddress(module, names[0]), nullptr) << names[0];
    EXPECT_EQ(GetProcAddress(module, names[0]), GetProcAddress(module, names[1])) << names[1];
  }
}

TEST_F(CHeader, AnotherDllIsRefused) {
  EXPECT_EQ(RcvlinkLoad(GetModuleHandleW(L"kernel32.dll"), &table_), 0);
  EXPECT_EQ(RcvlinkLoad(nullptr, &table_), 0);
}

}  // namespace
