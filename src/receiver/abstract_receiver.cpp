#include "receiver/abstract_receiver.h"

#include <mutex>
#include <utility>

#include "platform/hresult.h"
#include "report/report_file.h"

using rcvlink::kNotConnected;
using rcvlink::Trace;

CAbstractReceiver::CAbstractReceiver(std::unique_ptr<CIProtocol> driver)
    : driver_(std::move(driver)) {
  if (driver_) driver_->SetCallback(this);
}

HRESULT CAbstractReceiver::Reserved1() { return driver_ ? E_NOTIMPL : kNotConnected; }

HRESULT CAbstractReceiver::Reserved2() { return Reserved1(); }

template <typename... Parameters, typename... Arguments>
HRESULT CAbstractReceiver::PassOn(const wchar_t* name,
                                  HRESULT (CIProtocol::*operation)(Parameters...),
                                  Arguments... arguments) {
  if (!driver_) return kNotConnected;
  Trace(L"CAbstractReceiver::%s\r\n", name);
  return (driver_.get()->*operation)(arguments...);
}

HRESULT CAbstractReceiver::CheckConnection(HANDLE abort_event, short* answer) {
  return PassOn(L"CheckConnection", &CIProtocol::CheckConnection, abort_event, answer);
}

HRESULT CAbstractReceiver::GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) {
  return PassOn(L"GetReceiverInfo", &CIProtocol::GetReceiverInfo, abort_event, info);
}

HRESULT CAbstractReceiver::GetFiles(CFileList* files) {
  return PassOn(L"GetFiles", &CIProtocol::GetFiles, files);
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
  return WithProgress(progress, [&] {
    return PassOn(L"DownloadFile", &CIProtocol::DownloadFile, name, stream, progress);
  });
}

HRESULT CAbstractReceiver::UploadFile(const CFileInfo* info,
                                      IStream* stream,
                                      CProgressCallback* progress) {
  return WithProgress(progress,
                      [&] { return PassOn(L"UploadFile", &CIProtocol::UploadFile, info, stream); });
}

HRESULT CAbstractReceiver::DeleteFile(const wchar_t* name) {
  return PassOn(L"DeleteFile", &CIProtocol::DeleteFile, name);
}

HRESULT CAbstractReceiver::RenameFile(const wchar_t* old_name, const wchar_t* new_name) {
  return PassOn(L"RenameFile", &CIProtocol::RenameFile, old_name, new_name);
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
  return PassOn(L"DCSetRcvBaudrate", &CIProtocol::DCSetRcvBaudrate, baud_rate);
}

HRESULT CAbstractReceiver::DCSetRcvRTSControl(BYTE rts) {
  return PassOn(L"DCSetRcvRTSControl", &CIProtocol::DCSetRcvRTSControl, rts);
}

HRESULT CAbstractReceiver::DCSetRcvParity(BYTE parity) {
  return PassOn(L"DCSetRcvParity", &CIProtocol::DCSetRcvParity, parity);
}

HRESULT CAbstractReceiver::DCSetRcvStopbits(BYTE stop_bits) {
  return PassOn(L"DCSetRcvStopbits", &CIProtocol::DCSetRcvStopbits, stop_bits);
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
