#include "tests/support/memory_stream.h"

HRESULT MemoryStream::QueryInterface(REFIID, void** object) {
  *object = nullptr;
  return E_NOINTERFACE;
}

HRESULT MemoryStream::Write(const void* data, ULONG size, ULONG* written) {
  if (writes++ >= fail_at_write) return failure;
  bytes.append(static_cast<const char*>(data), size);
  if (written) *written = size;
  return S_OK;
}

HRESULT MemoryStream::Seek(LARGE_INTEGER, DWORD, ULARGE_INTEGER*) { return E_NOTIMPL; }

HRESULT MemoryStream::CopyTo(IStream*, ULARGE_INTEGER, ULARGE_INTEGER*, ULARGE_INTEGER*) {
  return E_NOTIMPL;
}

HRESULT MemoryStream::LockRegion(ULARGE_INTEGER, ULARGE_INTEGER, DWORD) { return E_NOTIMPL; }

HRESULT MemoryStream::UnlockRegion(ULARGE_INTEGER, ULARGE_INTEGER, DWORD) { return E_NOTIMPL; }
