// The object of a receiver's handle. It owns the driver of the family that answered, writes each
// operation to the report and passes it to the driver, and calls the host's progress function.
#ifndef RCVLINK_RECEIVER_ABSTRACT_RECEIVER_H_
#define RCVLINK_RECEIVER_ABSTRACT_RECEIVER_H_

#include <memory>

#include "platform/api_types.h"
#include "platform/critical_section.h"
#include "receiver/protocol.h"
#include "receiver/receiver.h"

class CAbstractReceiver : public CIReceiver, public CIProtocolCallback {
 public:
  // Raises the HRESULT of the Win32 error when its lock cannot be created.
  explicit CAbstractReceiver(std::unique_ptr<CIProtocol> driver);

  HRESULT Reserved1() override;
  HRESULT Reserved2() override;
  HRESULT CheckConnection(HANDLE abort_event, short* answer) override;
  HRESULT GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) override;
  HRESULT GetFiles(CFileList* files) override;
  HRESULT DownloadFile(const wchar_t* name, IStream* stream, CProgressCallback* progress) override;
  HRESULT UploadFile(const CFileInfo* info, IStream* stream, CProgressCallback* progress) override;
  HRESULT DeleteFile(const wchar_t* name) override;
  HRESULT RenameFile(const wchar_t* old_name, const wchar_t* new_name) override;
  HRESULT Abort() override;
  HRESULT LockConnection(HANDLE abort_event) override;
  HRESULT UnlockConnection() override;
  HRESULT DCSetRcvBaudrate(DWORD baud_rate) override;
  HRESULT DCSetRcvRTSControl(BYTE rts) override;
  HRESULT DCSetRcvParity(BYTE parity) override;
  HRESULT DCSetRcvStopbits(BYTE stop_bits) override;
  HRESULT SetProgressCallback(ProgressFunction function, void* context) override;
  void Stop() override;

  void OnProgress(BYTE percent) override;

 private:
  // Writes an operation into the report and passes it on to the driver.
  template <typename... Parameters, typename... Arguments>
  HRESULT PassOn(const wchar_t* name,
                 HRESULT (CIProtocol::*operation)(Parameters...),
                 Arguments... arguments);

  // Runs a transfer with the host's progress function, which is never called after the transfer.
  template <typename Transfer>
  HRESULT WithProgress(const CProgressCallback* progress, Transfer transfer);

  // Guards the next two members, and is held during each call of the function, so that the function
  // is not removed while it runs.
  rcvlink::CriticalSection lock_;
  ProgressFunction progress_function_ = nullptr;
  void* progress_context_ = nullptr;
  std::unique_ptr<CIProtocol> driver_;  // declared last, destroyed first: it may report progress
};

#endif  // RCVLINK_RECEIVER_ABSTRACT_RECEIVER_H_
