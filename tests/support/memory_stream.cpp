#include "tests/support/memory_stream.h"

HRESULT MemoryStream::Refuse() {
  ++other_calls;
  return E_NOTIMPL;
}

HRESULT MemoryStream::QueryInterface(REFIID, void** object) {
  ++other_calls;
  *object = nullptr;
  return E_NOINTERFACE;
}

ULONG MemoryStream::AddRef() {
  ++other_calls;
  return ++references;
}

ULONG MemoryStream::Release() {
  ++other_calls;
  return --references;
}

HRESULT MemoryStream::Read(void*, ULONG, ULONG*) { return Refuse(); }

HRESULT MemoryStream::Write(const void* data, ULONG size, ULONG* written) {
  thread = GetCurrentThreadId();
  if (writes++ >= fail_at_write) return failure;
  bytes.append(static_cast<const char*>(data), size);
  if (written) *written = size;
  return S_OK;
}

HRESULT MemoryStream::Seek(LARGE_INTEGER, DWORD, ULARGE_INTEGER*) { return Refuse(); }

HRESULT MemoryStream::SetSize(ULARGE_INTEGER) { return Refuse(); }

HRESULT MemoryStream::CopyTo(IStream*, ULARGE_INTEGER, ULARGE_INTEGER*, ULARGE_INTEGER*) {
  return Refuse();
}

HRESULT MemoryStream::Commit(DWORD) { return Refuse(); }

HRESULT MemoryStream::Revert() { return Refuse(); }

HRESULT MemoryStream::LockRegion(ULARGE_INTEGER, ULARGE_INTEGER, DWORD) { return Refuse(); }

HRESULT MemoryStream::UnlockRegion(ULARGE_INTEGER, ULARGE_INTEGER, DWORD) { return Refuse(); }

HRESULT MemoryStream::Stat(STATSTG*, DWORD) { return Refuse(); }

HRESULT MemoryStream::Clone(IStream**) { return Refuse(); }
