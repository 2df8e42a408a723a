// Finds the receiver on a COM port and downloads one of its files:
//   download COM7 LOG0801A.JPS copy.jps
#include <windows.h>

#include <objidl.h>
#include <shlwapi.h>

#include <cstdio>
#include <cwchar>

#include "rcvlink.h"

static void ShowPercent(void*, unsigned char percent) { std::printf("\r%3u %%", percent); }

// The size that the receiver lists for a file; -1 when it has no such file.
static long long ListedSize(void* receiver, const wchar_t* name) {
  void* files = nullptr;
  if (devapi::OpenFileList(receiver, &files) != S_OK) return -1;
  long long size = -1;
  CFileInfo file = {};
  for (long i = 0; devapi::GetFileInfo(files, i, &file) == S_OK; ++i) {
    if (std::wcscmp(file.bstrName, name) == 0) size = file.dwSize;
    SysFreeString(file.bstrName);
  }
  devapi::CloseFileList(files);
  return size;
}

// Some failures of a download give S_OK, so the size counts: bytes in the stream, or -1.
static long long Download(void* receiver, wchar_t* name, IStream* stream) {
  CProgressCallback progress = {ShowPercent, nullptr};
  const long result = devapi::DownloadFile(receiver, name, stream, &progress);
  std::printf("\ndownload: 0x%08lX\n", result);
  STATSTG state = {};
  if (result != S_OK || FAILED(stream->Stat(&state, STATFLAG_NONAME))) return -1;
  return static_cast<long long>(state.cbSize.QuadPart);
}

static bool Save(IStream* stream, const wchar_t* path) {
  IStream* file = nullptr;
  if (FAILED(SHCreateStreamOnFileW(path, STGM_CREATE | STGM_WRITE, &file))) return false;
  ULARGE_INTEGER all;
  all.QuadPart = ~0ULL;
  const bool saved = SUCCEEDED(stream->Seek({}, STREAM_SEEK_SET, nullptr)) &&
                     SUCCEEDED(stream->CopyTo(file, all, nullptr, nullptr));
  file->Release();
  return saved;
}

int wmain(int argc, wchar_t** argv) {
  if (argc != 4) return std::puts("usage: download PORT NAME FILE"), 2;

  void* receiver = nullptr;  // the search reads it, so it must be null
  const long found =
      devapi::SearchReceiver(argv[1], eInstanceSerial, eProtocolAny, nullptr, &receiver);
  if (found != S_OK) return std::printf("no receiver: 0x%08lX\n", found), 1;

  // The file of this computer is made when all bytes have come.
  bool saved = false;
  const long long size = ListedSize(receiver, argv[2]);
  IStream* const bytes = SHCreateMemStream(nullptr, 0);
  if (size > 0 && bytes && Download(receiver, argv[2], bytes) == size) saved = Save(bytes, argv[3]);
  if (bytes) bytes->Release();
  devapi::CloseReceiver(receiver);
  std::puts(saved ? "saved" : "not saved");
  return saved ? 0 : 1;
}
