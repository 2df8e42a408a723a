/// @file rcvlink_c.h
/// rcvlink for hosts in plain C, and for those that load the DLL themselves.
///
/// The exported names are those of C++ compilers. `RcvlinkLoad` finds each function under one of its
/// two names and fills a table of pointers; the functions, their results, owners and threads are
/// described in rcvlink.h. The report's functions that C++ overloads have an A (char) or a W (wchar_t)
/// at the end.
///
///     struct RcvlinkFunctions rcvlink;
///     if (!RcvlinkLoad(LoadLibraryW(L"C:\\Program Files\\Host\\rcvlink.dll"), &rcvlink)) return 1;
///     rcvlink.SearchReceiver(port, eInstanceSerial, eProtocolAny, NULL, &receiver);
///
/// Load the DLL by its full path. A report function may raise a C++ exception (see rcvlink.h), which
/// ends a host in C.
#ifndef RCVLINK_RCVLINK_C_H_
#define RCVLINK_RCVLINK_C_H_

#include <windows.h>

#include <string.h>

#ifndef RCVLINK_API_RCVLINK_H_  // a C++ host may include both headers, rcvlink.h first
/// @cond of the reference, which has these records from rcvlink.h

enum EInstanceType { eInstanceAny = 0, eInstanceSerial = 1, eInstanceUSB = 2 };

enum EProtocol { eProtocolAny = 0, eProtocolQuorin = 1, eProtocolVelmar = 2 };

/// 40 bytes.
struct CReceiverInfo {
  unsigned int dwFeatures;
  unsigned int dwPadding;
  wchar_t* bstrReceiverId;  ///< BSTR; the host frees it
  wchar_t* bstrReserved;    ///< set it to null
  wchar_t* bstrModel;       ///< BSTR; the host frees it
  unsigned int dwProtocol;
  unsigned int dwVariant;
};

/// 56 bytes.
struct CFileInfo {
  unsigned int dwSize;
  unsigned int dwPadding;
  wchar_t* bstrName;  ///< BSTR; the host frees it
  SYSTEMTIME stTime1;
  SYSTEMTIME stTime2;
  unsigned long long qwReserved;
};

/// 16 bytes.
struct CProgressCallback {
  void (*pfnProgress)(void* pContext, unsigned char percent);
  void* pContext;
};

/// @endcond
#endif

struct IStream;  // COM's stream (objidl.h)

/// The functions of the library, by the names that they have in rcvlink.h.
struct RcvlinkFunctions {
  /// @cond of the reference, which has these functions from rcvlink.h
  long (*SearchReceiver)(wchar_t* port,
                         enum EInstanceType type,
                         enum EProtocol protocol,
                         void* abortEvent,
                         void** receiver);
  long (*CreateReceiverOnSerial)(wchar_t* port,
                                 enum EProtocol protocol,
                                 struct _DCB* settings,
                                 void* abortEvent,
                                 void** receiver);
  long (*CreateReceiverOnUSB)(wchar_t* device,
                              enum EProtocol protocol,
                              void* abortEvent,
                              void** receiver);
  long (*OpenReceiver)(wchar_t* port, void** receiver);
  long (*CloseReceiver)(void* receiver);
  long (*DestroyReceiver)(wchar_t* port);
  long (*GetReceiverInfo)(void* receiver, void* abortEvent, struct CReceiverInfo* info);
  long (*CheckConnection)(void* receiver, void* abortEvent, short* answer);
  long (*LockConnection)(void* receiver, void* abortEvent);
  long (*UnlockConnection)(void* receiver);
  long (*Abort)(void* receiver);
  long (*OpenFileList)(void* receiver, void** fileList);
  long (*GetFilesCount)(void* fileList, long* count);
  long (*GetFileInfo)(void* fileList, long index, struct CFileInfo* info);
  long (*CloseFileList)(void* fileList);
  long (*DownloadFile)(void* receiver,
                       wchar_t* name,
                       struct IStream* stream,
                       struct CProgressCallback* progress);
  long (*UploadFile)(void* receiver,
                     const struct CFileInfo* info,
                     struct IStream* stream,
                     struct CProgressCallback* progress);
  long (*DeleteFileW)(void* receiver, wchar_t* name);
  long (*RenameFile)(void* receiver, wchar_t* oldName, wchar_t* newName);
  long (*DCSetRcvBaudrate)(void* receiver, unsigned long baudRate);
  long (*DCSetRcvParity)(void* receiver, unsigned char parity);
  long (*DCSetRcvRTSControl)(void* receiver, unsigned char rts);
  long (*DCSetRcvStopbits)(void* receiver, unsigned char stopBits);
  void (*CreateReportFileA)(const char* name);
  void (*CreateReportFileW)(const wchar_t* name);
  void (*DumpReportStringA)(const char* format, char* arguments);
  void (*DumpReportStringW)(const wchar_t* format, char* arguments);
  void (*CloseReportFile)(void);
  long (*SearchReceiverOnSerial)(wchar_t* port,
                                 enum EProtocol protocol,
                                 void* abortEvent,
                                 void** receiver);
  long (*GetConnection)(wchar_t* name, enum EInstanceType type, void** connection);
  /// @endcond
};

/// How many functions there are.
#define RCVLINK_FUNCTION_COUNT 30

/// The exported names, in the order of `RcvlinkFunctions`: that of GNU's compilers, then that of
/// Microsoft's.
static const char* const kRcvlinkNames[RCVLINK_FUNCTION_COUNT][2] = {
    {"_ZN6devapi14SearchReceiverEPw13EInstanceType9EProtocolPvPS3_",
     "?SearchReceiver@devapi@@YAJPEA_WW4EInstanceType@@W4EProtocol@@PEAXPEAPEAX@Z"},
    {"_ZN6devapi22CreateReceiverOnSerialEPw9EProtocolP4_DCBPvPS4_",
     "?CreateReceiverOnSerial@devapi@@YAJPEA_WW4EProtocol@@PEAU_DCB@@PEAXPEAPEAX@Z"},
    {"_ZN6devapi19CreateReceiverOnUSBEPw9EProtocolPvPS2_",
     "?CreateReceiverOnUSB@devapi@@YAJPEA_WW4EProtocol@@PEAXPEAPEAX@Z"},
    {"_ZN6devapi12OpenReceiverEPwPPv", "?OpenReceiver@devapi@@YAJPEA_WPEAPEAX@Z"},
    {"_ZN6devapi13CloseReceiverEPv", "?CloseReceiver@devapi@@YAJPEAX@Z"},
    {"_ZN6devapi15DestroyReceiverEPw", "?DestroyReceiver@devapi@@YAJPEA_W@Z"},
    {"_ZN6devapi15GetReceiverInfoEPvS0_P13CReceiverInfo",
     "?GetReceiverInfo@devapi@@YAJPEAX0PEAUCReceiverInfo@@@Z"},
    {"_ZN6devapi15CheckConnectionEPvS0_Ps", "?CheckConnection@devapi@@YAJPEAX0PEAF@Z"},
    {"_ZN6devapi14LockConnectionEPvS0_", "?LockConnection@devapi@@YAJPEAX0@Z"},
    {"_ZN6devapi16UnlockConnectionEPv", "?UnlockConnection@devapi@@YAJPEAX@Z"},
    {"_ZN6devapi5AbortEPv", "?Abort@devapi@@YAJPEAX@Z"},
    {"_ZN6devapi12OpenFileListEPvPS0_", "?OpenFileList@devapi@@YAJPEAXPEAPEAX@Z"},
    {"_ZN6devapi13GetFilesCountEPvPl", "?GetFilesCount@devapi@@YAJPEAXPEAJ@Z"},
    {"_ZN6devapi11GetFileInfoEPvlP9CFileInfo", "?GetFileInfo@devapi@@YAJPEAXJPEAUCFileInfo@@@Z"},
    {"_ZN6devapi13CloseFileListEPv", "?CloseFileList@devapi@@YAJPEAX@Z"},
    {"_ZN6devapi12DownloadFileEPvPwP7IStreamP17CProgressCallback",
     "?DownloadFile@devapi@@YAJPEAXPEA_WPEAUIStream@@PEAUCProgressCallback@@@Z"},
    {"_ZN6devapi10UploadFileEPvPK9CFileInfoP7IStreamP17CProgressCallback",
     "?UploadFile@devapi@@YAJPEAXPEBUCFileInfo@@PEAUIStream@@PEAUCProgressCallback@@@Z"},
    {"_ZN6devapi11DeleteFileWEPvPw", "?DeleteFileW@devapi@@YAJPEAXPEA_W@Z"},
    {"_ZN6devapi10RenameFileEPvPwS1_", "?RenameFile@devapi@@YAJPEAXPEA_W1@Z"},
    {"_ZN6devapi16DCSetRcvBaudrateEPvm", "?DCSetRcvBaudrate@devapi@@YAJPEAXK@Z"},
    {"_ZN6devapi14DCSetRcvParityEPvh", "?DCSetRcvParity@devapi@@YAJPEAXE@Z"},
    {"_ZN6devapi18DCSetRcvRTSControlEPvh", "?DCSetRcvRTSControl@devapi@@YAJPEAXE@Z"},
    {"_ZN6devapi16DCSetRcvStopbitsEPvh", "?DCSetRcvStopbits@devapi@@YAJPEAXE@Z"},
    {"_ZN8dump_hlp16CreateReportFileEPKc", "?CreateReportFile@dump_hlp@@YAXPEBD@Z"},
    {"_ZN8dump_hlp16CreateReportFileEPKw", "?CreateReportFile@dump_hlp@@YAXPEB_W@Z"},
    {"_ZN8dump_hlp16DumpReportStringEPKcPc", "?DumpReportString@dump_hlp@@YAXPEBDPEAD@Z"},
    {"_ZN8dump_hlp16DumpReportStringEPKwPc", "?DumpReportString@dump_hlp@@YAXPEB_WPEAD@Z"},
    {"_ZN8dump_hlp15CloseReportFileEv", "?CloseReportFile@dump_hlp@@YAXXZ"},
    {"_Z22SearchReceiverOnSerialPw9EProtocolPvPS1_",
     "?SearchReceiverOnSerial@@YAJPEA_WW4EProtocol@@PEAXPEAPEAX@Z"},
    {"_Z13GetConnectionPw13EInstanceTypePP12CIConnection",
     "?GetConnection@@YAJPEA_WW4EInstanceType@@PEAPEAVCIConnection@@@Z"}};

/// Fills the table from a loaded rcvlink.dll.
/// @param module    may be null, as LoadLibraryW gives it
/// @param functions the table
/// @return nonzero: every function is there. 0: `module` is null or another DLL, and the table may be
///         filled in part.
static inline int RcvlinkLoad(HMODULE module, struct RcvlinkFunctions* functions) {
  char* const table = (char*)functions;
  size_t i;
  if (module == NULL) return 0;
  for (i = 0; i < RCVLINK_FUNCTION_COUNT; ++i) {
    FARPROC function = GetProcAddress(module, kRcvlinkNames[i][0]);
    if (function == NULL) function = GetProcAddress(module, kRcvlinkNames[i][1]);
    if (function == NULL) return 0;
    memcpy(table + i * sizeof(function), &function, sizeof(function));
  }
  return 1;
}

#endif  // RCVLINK_RCVLINK_C_H_
