// The interface of a receiver to the exported functions. A receiver's handle is the address of this
// object.
#ifndef RCVLINK_RECEIVER_RECEIVER_H_
#define RCVLINK_RECEIVER_RECEIVER_H_

#include "platform/api_types.h"
#include "platform/win32.h"
#include "receiver/file_list.h"

// Every operation gives 0x8007048F when the receiver has no driver, else the driver's result.
//
// The order of the operations is fixed: a host that has a handle has the address of this object,
// and code that calls through it finds the operations by their order.
class CIReceiver {
 public:
  using ProgressFunction = decltype(CProgressCallback::pfnProgress);

  virtual ~CIReceiver() = default;

  // They keep two places of the order free; E_NOTIMPL. No exported function calls them.
  virtual HRESULT Reserved1() = 0;
  virtual HRESULT Reserved2() = 0;
  virtual HRESULT CheckConnection(HANDLE abort_event, short* answer) = 0;
  virtual HRESULT GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) = 0;
  virtual HRESULT GetFiles(CFileList* files) = 0;
  virtual HRESULT DownloadFile(const wchar_t* name,
                               IStream* stream,
                               CProgressCallback* progress) = 0;
  virtual HRESULT UploadFile(const CFileInfo* info,
                             IStream* stream,
                             CProgressCallback* progress) = 0;
  virtual HRESULT DeleteFile(const wchar_t* name) = 0;
  virtual HRESULT RenameFile(const wchar_t* old_name, const wchar_t* new_name) = 0;
  virtual HRESULT Abort() = 0;
  virtual HRESULT LockConnection(HANDLE abort_event) = 0;
  // S_OK whatever the driver gives: a host that calls it after a failed GetReceiverInfo does not
  // know whether it holds the lock.
  virtual HRESULT UnlockConnection() = 0;
  virtual HRESULT DCSetRcvBaudrate(DWORD baud_rate) = 0;
  virtual HRESULT DCSetRcvRTSControl(BYTE rts) = 0;
  virtual HRESULT DCSetRcvParity(BYTE parity) = 0;
  virtual HRESULT DCSetRcvStopbits(BYTE stop_bits) = 0;
  virtual HRESULT SetProgressCallback(ProgressFunction function, void* context) = 0;
  // Ends the operation that is running, as Abort does but without its line in the report: for a
  // receiver that is removed meanwhile. Not for hosts, so it comes after their operations.
  virtual void Stop() = 0;
};

#endif  // RCVLINK_RECEIVER_RECEIVER_H_
