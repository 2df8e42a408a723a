// Opens a Quorin receiver and ends without closing it:
//   host_end PORT REPORT          at rest
//   host_end PORT REPORT FILE     in the middle of a download of that file on another thread
#include <windows.h>

#include <objidl.h>
#include <shlwapi.h>

#include <cstdio>
#include <string>
#include <thread>

#include "rcvlink.h"

namespace {

void ShowProgress(void* arrived, unsigned char percent) {
  if (percent > 0) SetEvent(arrived);
}

// Starts the download; returns when the first bytes have arrived.
void StartDownload(void* receiver, const std::wstring& name) {
  static const HANDLE arrived = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  std::thread([receiver, name] {
    std::wstring file = name;
    CProgressCallback progress{ShowProgress, arrived};
    IStream* const stream = SHCreateMemStream(nullptr, 0);
    devapi::DownloadFile(receiver, file.data(), stream, &progress);
    std::puts("the download is over");
  }).detach();
  WaitForSingleObject(arrived, INFINITE);
}

}  // namespace

int wmain(int argc, wchar_t** argv) {
  if (argc < 3) return 2;
  dump_hlp::CreateReportFile(argv[2]);
  DCB settings{};
  settings.DCBlength = sizeof(DCB);
  settings.BaudRate = CBR_9600;
  settings.fBinary = TRUE;
  settings.ByteSize = 8;
  void* receiver = nullptr;
  const long result =
      devapi::CreateReceiverOnSerial(argv[1], eProtocolQuorin, &settings, nullptr, &receiver);
  if (result != S_OK) return 1;
  if (argc > 3) StartDownload(receiver, argv[3]);
  return 0;
}
