// A host that never includes <windows.h>.
#include "rcvlink.h"

long Host() {
  CFileInfo file = {};
  void* receiver = nullptr;
  long result = devapi::OpenReceiver(nullptr, &receiver);
  return result + devapi::GetFileInfo(nullptr, 0, &file) + file.stTime1.wYear;
}
