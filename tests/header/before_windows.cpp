// A host that includes <windows.h> afterwards.
#include "rcvlink.h"

#include <windows.h>

#include <objidl.h>

long Host(IStream* stream, CFileInfo* file, DCB* settings) {
  void* receiver = nullptr;
  devapi::CreateReceiverOnSerial(nullptr, eProtocolAny, settings, nullptr, &receiver);
  return devapi::DownloadFile(receiver, file->bstrName, stream, nullptr);
}
