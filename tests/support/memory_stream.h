// A COM stream that keeps what is written to it, and fails when the test says so.
#ifndef RCVLINK_TESTS_SUPPORT_MEMORY_STREAM_H_
#define RCVLINK_TESTS_SUPPORT_MEMORY_STREAM_H_

#include <cstddef>
#include <string>

#include "platform/api_types.h"

#include <objidl.h>

// Lives on the stack of a test: the reference count is only compared, it frees nothing.
class MemoryStream : public IStream {
 public:
  std::string bytes;                   // what came so far
  size_t writes = 0;                   // how often Write was called
  size_t fail_at_write = SIZE_MAX;     // the write (from 0) that fails, and all after it
  HRESULT failure = STG_E_MEDIUMFULL;  // with this
  ULONG references = 1;

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID, void** object) override;
  ULONG STDMETHODCALLTYPE AddRef() override { return ++references; }
  ULONG STDMETHODCALLTYPE Release() override { return --references; }
  HRESULT STDMETHODCALLTYPE Read(void*, ULONG, ULONG*) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE Write(const void* data, ULONG size, ULONG* written) override;
  HRESULT STDMETHODCALLTYPE Seek(LARGE_INTEGER, DWORD, ULARGE_INTEGER*) override;
  HRESULT STDMETHODCALLTYPE SetSize(ULARGE_INTEGER) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE CopyTo(IStream*,
                                   ULARGE_INTEGER,
                                   ULARGE_INTEGER*,
                                   ULARGE_INTEGER*) override;
  HRESULT STDMETHODCALLTYPE Commit(DWORD) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE Revert() override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE LockRegion(ULARGE_INTEGER, ULARGE_INTEGER, DWORD) override;
  HRESULT STDMETHODCALLTYPE UnlockRegion(ULARGE_INTEGER, ULARGE_INTEGER, DWORD) override;
  HRESULT STDMETHODCALLTYPE Stat(STATSTG*, DWORD) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE Clone(IStream**) override { return E_NOTIMPL; }
};

#endif  // RCVLINK_TESTS_SUPPORT_MEMORY_STREAM_H_
