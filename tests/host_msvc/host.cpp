// A host with Microsoft's ABI, linked against rcvlink.lib. It has no C runtime and declares the few
// Windows functions that it needs. Exit code: 0 if every check passed, else the line of the first
// that failed.
#include "rcvlink.h"

extern "C" {
__declspec(dllimport) void __stdcall ExitProcess(unsigned int code);
__declspec(dllimport) unsigned long __stdcall GetTempPathW(unsigned long size, wchar_t* path);
__declspec(dllimport) unsigned long __stdcall GetFileAttributesW(const wchar_t* path);
__declspec(dllimport) int __stdcall DeleteFileW(const wchar_t* path);
int _fltused = 0;
}

namespace {

constexpr long kOk = 0;
constexpr long kFalse = 1;
constexpr long kInvalidArgument = static_cast<long>(0x80070057);
constexpr long kNotImplemented = static_cast<long>(0x80004001);
constexpr long kUnexpected = static_cast<long>(0x8000FFFF);
constexpr long kFileNotFound = static_cast<long>(0x80070002);
constexpr unsigned long kHidden = 2;
constexpr unsigned long kNoFile = 0xFFFFFFFF;

wchar_t missing_port[] = L"COM255";
wchar_t no_name[] = L"";

// Uses every exported function, so that each must link.
using Function = void (*)();
template <typename F>
Function Erase(F* function) {
  return reinterpret_cast<Function>(function);
}
bool AllAreLinked() {
  // Imported addresses are known only at run time, and there is no C runtime to initialise globals.
  const volatile Function kAll[] = {
      Erase(&devapi::SearchReceiver),
      Erase(&devapi::CreateReceiverOnSerial),
      Erase(&devapi::CreateReceiverOnUSB),
      Erase(&devapi::OpenReceiver),
      Erase(&devapi::CloseReceiver),
      Erase(&devapi::DestroyReceiver),
      Erase(&devapi::GetReceiverInfo),
      Erase(&devapi::CheckConnection),
      Erase(&devapi::LockConnection),
      Erase(&devapi::UnlockConnection),
      Erase(&devapi::Abort),
      Erase(&devapi::OpenFileList),
      Erase(&devapi::GetFilesCount),
      Erase(&devapi::GetFileInfo),
      Erase(&devapi::CloseFileList),
      Erase(&devapi::DownloadFile),
      Erase(&devapi::UploadFile),
      Erase(&devapi::DeleteFileW),
      Erase(&devapi::RenameFile),
      Erase(&devapi::DCSetRcvBaudrate),
      Erase(&devapi::DCSetRcvParity),
      Erase(&devapi::DCSetRcvRTSControl),
      Erase(&devapi::DCSetRcvStopbits),
      Erase(static_cast<void (*)(const char*)>(&dump_hlp::CreateReportFile)),
      Erase(static_cast<void (*)(const wchar_t*)>(&dump_hlp::CreateReportFile)),
      Erase(static_cast<void (*)(const char*, char*)>(&dump_hlp::DumpReportString)),
      Erase(static_cast<void (*)(const wchar_t*, char*)>(&dump_hlp::DumpReportString)),
      Erase(&dump_hlp::CloseReportFile),
      Erase(&SearchReceiverOnSerial),
      Erase(&GetConnection),
  };
  for (const volatile Function& function : kAll) {
    if (!function) return false;
  }
  return true;
}

bool ReportIsWritten() {
  wchar_t path[300];
  unsigned long length = GetTempPathW(260, path);
  const wchar_t name[] = L"rcvlink-msvc-host.txt";
  for (const wchar_t c : name) path[length++] = c;
  DeleteFileW(path);
  dump_hlp::CreateReportFile(name);
  dump_hlp::DumpReportString(L"a line of the host\r\n", nullptr);
  dump_hlp::CloseReportFile();
  const unsigned long attributes = GetFileAttributesW(path);
  return attributes != kNoFile && (attributes & kHidden) != 0 && DeleteFileW(path) != 0;
}

#define CHECK(condition) \
  if (!(condition)) return __LINE__

int Run() {
  CHECK(AllAreLinked());
  void* handle = nullptr;
  long count = 0;
  CFileInfo file = {};
  CReceiverInfo info = {};
  CHECK(GetConnection(no_name, eInstanceAny, nullptr) == kNotImplemented);
  CHECK(devapi::OpenReceiver(no_name, nullptr) == kInvalidArgument);
  CHECK(devapi::OpenReceiver(no_name, &handle) == kFalse);
  CHECK(devapi::CloseReceiver(&handle) == kInvalidArgument);
  CHECK(devapi::GetReceiverInfo(&handle, nullptr, &info) == kInvalidArgument);
  CHECK(devapi::GetFilesCount(&handle, &count) == kInvalidArgument);
  CHECK(devapi::GetFileInfo(&handle, 0, &file) == kInvalidArgument);
  CHECK(devapi::SearchReceiver(
            missing_port, static_cast<EInstanceType>(3), eProtocolAny, nullptr, &handle) ==
        kUnexpected);
  CHECK(devapi::SearchReceiver(missing_port, eInstanceSerial, eProtocolAny, nullptr, &handle) ==
        kFileNotFound);
  CHECK(SearchReceiverOnSerial(missing_port, eProtocolQuorin, nullptr, &handle) == kFileNotFound);
  CHECK(handle == nullptr);
  CHECK(ReportIsWritten());
  return kOk;
}

}  // namespace

extern "C" void HostMain() { ExitProcess(static_cast<unsigned int>(Run())); }
