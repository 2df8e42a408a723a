/* A host in plain C, which loads the DLL itself: lists the files of the receiver on a COM port.
 *   list C:\folder\rcvlink.dll COM7
 */
#include <windows.h>

#include <stdio.h>

#include "rcvlink_c.h"

static void ShowFiles(const struct RcvlinkFunctions* rcvlink, void* receiver) {
  void* files = NULL;
  long count = 0;
  const long result = rcvlink->OpenFileList(receiver, &files);
  if (result != S_OK) {
    printf("no list: 0x%08lX\n", (unsigned long)result);
    return;
  }
  rcvlink->GetFilesCount(files, &count);
  for (long i = 0; i < count; ++i) {
    struct CFileInfo file = {0};
    if (rcvlink->GetFileInfo(files, i, &file) != S_OK) continue;
    printf("%10u %ls\n", file.dwSize, file.bstrName);
    SysFreeString(file.bstrName);
  }
  rcvlink->CloseFileList(files);
}

int wmain(int argc, wchar_t** argv) {
  if (argc != 3) {
    puts("usage: list DLL PORT");
    return 2;
  }
  struct RcvlinkFunctions rcvlink;
  if (!RcvlinkLoad(LoadLibraryW(argv[1]), &rcvlink)) {
    puts("that is no rcvlink.dll");
    return 1;
  }
  /* The path of a USB device begins with backslashes, the name of a serial port does not. */
  const enum EInstanceType link = argv[2][0] == L'\\' ? eInstanceUSB : eInstanceSerial;
  void* receiver = NULL; /* the search reads it */
  const long result = rcvlink.SearchReceiver(argv[2], link, eProtocolAny, NULL, &receiver);
  if (result != S_OK) {
    printf("no receiver: 0x%08lX\n", (unsigned long)result);
    return 1;
  }
  ShowFiles(&rcvlink, receiver);
  rcvlink.CloseReceiver(receiver);
  return 0;
}
