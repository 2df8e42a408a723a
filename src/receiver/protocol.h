// What a receiver object asks of a protocol driver, and what a driver tells it in return.
#ifndef RCVLINK_RECEIVER_PROTOCOL_H_
#define RCVLINK_RECEIVER_PROTOCOL_H_

#include <cstdint>

#include "platform/api_types.h"
#include "platform/win32.h"
#include "receiver/file_list.h"

// The way up: a driver's progress during long operations, in percent.
class CIProtocolCallback {
 public:
  virtual void OnProgress(BYTE percent) = 0;

 protected:
  ~CIProtocolCallback() = default;
};

// A driver of one family of receivers. Operations that a family does not offer give E_NOTIMPL.
// The order of the operations is fixed; results are those of rcvlink.h.
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
  // From any thread; takes no connection lock.
  virtual void Abort() = 0;
  virtual HRESULT LockConnection(HANDLE abort_event) = 0;
  // The release's own answer: non-zero when the calling thread held the connection.
  virtual HRESULT UnlockConnection() = 0;
  virtual HRESULT DCSetRcvBaudrate(DWORD baud_rate) = 0;
  virtual HRESULT DCSetRcvRTSControl(BYTE rts) = 0;
  virtual HRESULT DCSetRcvParity(BYTE parity) = 0;
  virtual HRESULT DCSetRcvStopbits(BYTE stop_bits) = 0;
};

#endif  // RCVLINK_RECEIVER_PROTOCOL_H_
