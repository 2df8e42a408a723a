// A COM stream that keeps what is written to it, and fails when the test says so.
#ifndef RCVLINK_TESTS_SUPPORT_MEMORY_STREAM_H_
#define RCVLINK_TESTS_SUPPORT_MEMORY_STREAM_H_

#include <windows.h>

#include <objidl.h>

#include <cstddef>
#include <cstdint>
#include <string>

// Lives on the stack of a test: the reference count is only compared, it frees nothing.
class MemoryStream : public IStream {
 public:
  std::string bytes;                   // what came so far
  size_t writes = 0;                   // how often Write was called
  size_t fail_at_write = SIZE_MAX;     // the write (from 0) that fails, and all after it
  HRESULT failure = STG_E_MEDIUMFULL;  // with this
  size_t other_calls = 0;              // calls of anything but Write
  DWORD thread = 0;                    // the thread of the last Write
  ULONG references = 1;

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID id, void** object) override;
  ULONG STDMETHODCALLTYPE AddRef() override;
  ULONG STDMETHODCALLTYPE Release() override;
  HRESULT STDMETHODCALLTYPE Read(void* data, ULONG size, ULONG* read) override;
  HRESULT STDMETHODCALLTYPE Write(const void* data, ULONG size, ULONG* written) override;
  HRESULT STDMETHODCALLTYPE Seek(LARGE_INTEGER move, DWORD from, ULARGE_INTEGER* now) override;
  HRESULT STDMETHODCALLTYPE SetSize(ULARGE_INTEGER size) override;
  HRESULT STDMETHODCALLTYPE CopyTo(IStream* stream,
                                   ULARGE_INTEGER size,
                                   ULARGE_INTEGER* read,
                                   ULARGE_INTEGER* written) override;
  HRESULT STDMETHODCALLTYPE Commit(DWORD flags) override;
  HRESULT STDMETHODCALLTYPE Revert() override;
  HRESULT STDMETHODCALLTYPE LockRegion(ULARGE_INTEGER at, ULARGE_INTEGER size, DWORD kind) override;
  HRESULT STDMETHODCALLTYPE UnlockRegion(ULARGE_INTEGER at,
                                         ULARGE_INTEGER size,
                                         DWORD kind) override;
  HRESULT STDMETHODCALLTYPE Stat(STATSTG* statistics, DWORD flags) override;
  HRESULT STDMETHODCALLTYPE Clone(IStream** stream) override;

 private:
  HRESULT Refuse();
};

#endif  // RCVLINK_TESTS_SUPPORT_MEMORY_STREAM_H_
