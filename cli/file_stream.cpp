#include "file_stream.h"

namespace cli {

std::unique_ptr<FileStream, ComReleaser> FileStream::Make(Destination& destination) {
  return std::unique_ptr<FileStream, ComReleaser>(new FileStream(destination));
}

STDMETHODIMP FileStream::QueryInterface(REFIID id, void** object) {
  if (object == nullptr) return E_POINTER;
  *object = nullptr;
  const bool known = IsEqualIID(id, IID_IUnknown) || IsEqualIID(id, IID_ISequentialStream) ||
                     IsEqualIID(id, IID_IStream);
  if (!known) return E_NOINTERFACE;
  *object = static_cast<IStream*>(this);
  AddRef();
  return S_OK;
}

STDMETHODIMP_(ULONG) FileStream::AddRef() { return ++references_; }

STDMETHODIMP_(ULONG) FileStream::Release() {
  const ULONG left = --references_;
  if (left == 0) delete this;
  return left;
}

STDMETHODIMP FileStream::Write(const void* data, ULONG size, ULONG* written) {
  if (written != nullptr) *written = 0;
  Destination* const destination = destination_;
  if (destination == nullptr) return STG_E_REVERTED;
  // After a failure the file has a hole: what follows must not hide it.
  if (first_error_ == ERROR_SUCCESS) first_error_ = destination->Write(data, size);
  if (first_error_ != ERROR_SUCCESS) return ResultOfWin32(first_error_);
  hash_.Add(data, size);
  received_ += size;
  if (written != nullptr) *written = size;
  return S_OK;
}

STDMETHODIMP FileStream::Read(void* /*data*/, ULONG /*size*/, ULONG* /*read*/) { return E_NOTIMPL; }

STDMETHODIMP FileStream::Seek(LARGE_INTEGER /*move*/,
                              DWORD /*origin*/,
                              ULARGE_INTEGER* /*position*/) {
  return E_NOTIMPL;
}

STDMETHODIMP FileStream::SetSize(ULARGE_INTEGER /*size*/) { return E_NOTIMPL; }

STDMETHODIMP FileStream::CopyTo(IStream* /*stream*/,
                                ULARGE_INTEGER /*size*/,
                                ULARGE_INTEGER* /*read*/,
                                ULARGE_INTEGER* /*written*/) {
  return E_NOTIMPL;
}

STDMETHODIMP FileStream::Commit(DWORD /*flags*/) { return S_OK; }

STDMETHODIMP FileStream::Revert() { return E_NOTIMPL; }

STDMETHODIMP FileStream::LockRegion(ULARGE_INTEGER /*offset*/,
                                    ULARGE_INTEGER /*size*/,
                                    DWORD /*type*/) {
  return E_NOTIMPL;
}

STDMETHODIMP FileStream::UnlockRegion(ULARGE_INTEGER /*offset*/,
                                      ULARGE_INTEGER /*size*/,
                                      DWORD /*type*/) {
  return E_NOTIMPL;
}

STDMETHODIMP FileStream::Stat(STATSTG* /*stat*/, DWORD /*flags*/) { return E_NOTIMPL; }

STDMETHODIMP FileStream::Clone(IStream** /*stream*/) { return E_NOTIMPL; }

}  // namespace cli
