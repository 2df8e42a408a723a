#include "receiver/abstract_receiver.h"

#include <mutex>
#include <utility>

#include "platform/hresult.h"
#include "report/report_file.h"

CAbstractReceiver::CAbstractReceiver(std::unique_ptr<CIProtocol> driver)
    : driver_(std::move(driver)) {
  if (driver_) driver_->SetCallback(this);
}

HRESULT CAbstractReceiver::Reserved1() { return driver_ ? E_NOTIMPL : kNotConnected; }

HRESULT CAbstractReceiver::Reserved2() { return Reserved1(); }

HRESULT CAbstractReceiver::CheckConnection(HANDLE abort_event, short* answer) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::CheckConnection\r\n");
  return driver_->CheckConnection(abort_event, answer);
}

HRESULT CAbstractReceiver::GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::GetReceiverInfo\r\n");
  return driver_->GetReceiverInfo(abort_event, info);
}

HRESULT CAbstractReceiver::GetFiles(CFileList* files) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::GetFiles\r\n");
  return driver_->GetFiles(files);
}

template <typename Transfer>
HRESULT CAbstractReceiver::WithProgress(const CProgressCallback* progress, Transfer transfer) {
  if (progress) {
    SetProgressCallback(progress->pfnProgress, progress->pContext);
  } else {
    SetProgressCallback(nullptr, nullptr);
  }
  // Removes the function also when the transfer raises an exception: the host may free its record
  // as soon as the call returns.
  struct Removal {
    CAbstractReceiver& receiver;
    ~Removal() { receiver.SetProgressCallback(nullptr, nullptr); }
  };
  const Removal removal{*this};
  return transfer();
}

HRESULT CAbstractReceiver::DownloadFile(const wchar_t* name,
                                        IStream* stream,
                                        CProgressCallback* progress) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::DownloadFile\r\n");
  return WithProgress(progress, [&] { return driver_->DownloadFile(name, stream, progress); });
}

HRESULT CAbstractReceiver::UploadFile(const CFileInfo* info,
                                      IStream* stream,
                                      CProgressCallback* progress) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::UploadFile\r\n");
  return WithProgress(progress, [&] { return driver_->UploadFile(info, stream); });
}

HRESULT CAbstractReceiver::DeleteFile(const wchar_t* name) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::DeleteFile\r\n");
  return driver_->DeleteFile(name);
}

HRESULT CAbstractReceiver::RenameFile(const wchar_t* old_name, const wchar_t* new_name) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::RenameFile\r\n");
  return driver_->RenameFile(old_name, new_name);
}

HRESULT CAbstractReceiver::Abort() {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::Abort\r\n");
  driver_->Abort();
  return S_OK;
}

HRESULT CAbstractReceiver::LockConnection(HANDLE abort_event) {
  return driver_ ? driver_->LockConnection(abort_event) : kNotConnected;
}

HRESULT CAbstractReceiver::UnlockConnection() {
  if (!driver_) return kNotConnected;
  driver_->UnlockConnection();
  return S_OK;
}

HRESULT CAbstractReceiver::DCSetRcvBaudrate(DWORD baud_rate) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::DCSetRcvBaudrate\r\n");
  return driver_->DCSetRcvBaudrate(baud_rate);
}

HRESULT CAbstractReceiver::DCSetRcvRTSControl(BYTE rts) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::DCSetRcvRTSControl\r\n");
  return driver_->DCSetRcvRTSControl(rts);
}

HRESULT CAbstractReceiver::DCSetRcvParity(BYTE parity) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::DCSetRcvParity\r\n");
  return driver_->DCSetRcvParity(parity);
}

HRESULT CAbstractReceiver::DCSetRcvStopbits(BYTE stop_bits) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::DCSetRcvStopbits\r\n");
  return driver_->DCSetRcvStopbits(stop_bits);
}

HRESULT CAbstractReceiver::SetProgressCallback(ProgressFunction function, void* context) {
  if (!driver_) return kNotConnected;
  const std::scoped_lock lock(lock_);
  progress_function_ = function;
  progress_context_ = context;
  return S_OK;
}

void CAbstractReceiver::Stop() {
  if (driver_) driver_->Abort();
}

void CAbstractReceiver::OnProgress(BYTE percent) {
  const std::scoped_lock lock(lock_);
  if (progress_function_) progress_function_(progress_context_, percent);
}
