// A host that includes everything of Windows first: file times are the platform's own records.
#include <windows.h>

#include <objidl.h>

#include "rcvlink.h"

long Host(IStream* stream, CFileInfo* file, DCB* settings, HANDLE abort_event) {
  FILETIME time;
  SystemTimeToFileTime(&file->stTime1, &time);
  void* receiver = nullptr;
  devapi::CreateReceiverOnSerial(nullptr, eProtocolAny, settings, abort_event, &receiver);
  return devapi::DownloadFile(receiver, file->bstrName, stream, nullptr) +
         devapi::DeleteFileW(receiver, file->bstrName);
}
