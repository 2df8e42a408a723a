// The interface of a family's driver, and the one through which a driver reports progress.
#ifndef RCVLINK_RECEIVER_PROTOCOL_H_
#define RCVLINK_RECEIVER_PROTOCOL_H_

#include <cstdint>

#include "platform/api_types.h"
#include "platform/win32.h"
#include "receiver/file_list.h"

// Gets a driver's progress during long operations, in percent.
class CIProtocolCallback {
 public:
  virtual void OnProgress(BYTE percent) = 0;

 protected:
  ~CIProtocolCallback() = default;
};

// A driver of one family of receivers. Operations that a family does not offer give E_NOTIMPL.
// Results are those of rcvlink.h. The order of the operations is that of CIReceiver, and is fixed
// for the same reason (receiver.h).
class CIProtocol {
 public:
  virtual ~CIProtocol() = default;

  // *answer: -1 when the receiver answered, 0 when not.
  virtual HRESULT CheckConnection(HANDLE abort_event, short* answer) = 0;
  virtual HRESULT GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) = 0;
  // Appends the receiver's files to the list.
  virtual HRESULT GetFiles(CFileList* files) = 0;
  virtual HRESULT DownloadFile(const wchar_t* name,
                               IStream* stream,
                               CProgressCallback* progress) = 0;
  virtual HRESULT UploadFile(const CFileInfo* info, IStream* stream) = 0;
  virtual HRESULT DeleteFile(const wchar_t* name) = 0;
  virtual HRESULT RenameFile(const wchar_t* old_name, const wchar_t* new_name) = 0;
  // The callback is not owned; null removes it.
  virtual void SetCallback(CIProtocolCallback* callback) = 0;
  // Any thread may call it. It does not wait for the connection lock, which the operation that it
  // is to end holds.
  virtual void Abort() = 0;
  virtual HRESULT LockConnection(HANDLE abort_event) = 0;
  // No HRESULT but the answer of ReleaseMutex: not 0 when the calling thread held the lock.
  virtual HRESULT UnlockConnection() = 0;
  virtual HRESULT DCSetRcvBaudrate(DWORD baud_rate) = 0;
  virtual HRESULT DCSetRcvRTSControl(BYTE rts) = 0;
  virtual HRESULT DCSetRcvParity(BYTE parity) = 0;
  virtual HRESULT DCSetRcvStopbits(BYTE stop_bits) = 0;
};

#endif  // RCVLINK_RECEIVER_PROTOCOL_H_
