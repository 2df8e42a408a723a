// Finds the receiver on a COM port and downloads one of its files:
//   download COM7 LOG0801A.JPS copy.jps
#include <windows.h>

#include <objidl.h>
#include <shlwapi.h>

#include <cstdio>

#include "rcvlink.h"

static void ShowPercent(void*, unsigned char percent) { std::printf("\r%3u %%", percent); }

int wmain(int argc, wchar_t** argv) {
  if (argc != 4) return std::puts("usage: download PORT NAME FILE"), 2;

  void* receiver = nullptr;  // the search reads it, so it must be null
  long result = devapi::SearchReceiver(argv[1], eInstanceSerial, eProtocolAny, nullptr, &receiver);
  if (result != S_OK) return std::printf("no receiver: 0x%08lX\n", result), 1;

  CReceiverInfo info = {};
  if (devapi::GetReceiverInfo(receiver, nullptr, &info) == S_OK) {
    std::printf("%ls %ls\n", info.bstrModel, info.bstrReceiverId);
    SysFreeString(info.bstrModel);
    SysFreeString(info.bstrReceiverId);
  } else {
    devapi::UnlockConnection(receiver);  // after a failure the receiver is still locked
  }

  IStream* file = nullptr;
  if (SUCCEEDED(SHCreateStreamOnFileW(argv[3], STGM_CREATE | STGM_WRITE, &file))) {
    CProgressCallback progress = {ShowPercent, nullptr};
    result = devapi::DownloadFile(receiver, argv[2], file, &progress);
    file->Release();
    std::printf("\ndownload: 0x%08lX\n", result);
  }
  devapi::CloseReceiver(receiver);
  return file && result == S_OK ? 0 : 1;
}
