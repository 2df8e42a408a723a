// A download's way from the library to its destination.
#ifndef RCVLINK_CLI_FILE_STREAM_H_
#define RCVLINK_CLI_FILE_STREAM_H_

#include <windows.h>

#include <objidl.h>

#include <atomic>
#include <cstdint>
#include <memory>

#include "destination.h"
#include "sha256.h"

namespace cli {

struct ComReleaser {
  void operator()(IUnknown* object) const { object->Release(); }
};

// COM's interfaces have no virtual destructor: objects end in Release, never through a base.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wnon-virtual-dtor"

// A COM stream for writing only. It counts and hashes the bytes, and keeps its first write error,
// which the library does not always report. The counts may be read from any thread.
class FileStream final : public IStream {
 public:
  // `destination`: outlives the stream, or is removed with `Detach`.
  static std::unique_ptr<FileStream, ComReleaser> Make(Destination& destination);

  uint64_t received() const { return received_; }

  // Win32 error of the first write that failed; ERROR_SUCCESS for none.
  DWORD first_error() const { return first_error_; }

  // From now on the stream refuses writes, even if the library still holds it.
  void Detach() { destination_ = nullptr; }

  // SHA-256 of what was received, once the transfer is over; to be called once.
  std::string TakeHash() { return hash_.Finish(); }

  STDMETHODIMP QueryInterface(REFIID id, void** object) override;
  STDMETHODIMP_(ULONG) AddRef() override;
  STDMETHODIMP_(ULONG) Release() override;
  STDMETHODIMP Read(void* data, ULONG size, ULONG* read) override;
  STDMETHODIMP Write(const void* data, ULONG size, ULONG* written) override;
  STDMETHODIMP Seek(LARGE_INTEGER move, DWORD origin, ULARGE_INTEGER* position) override;
  STDMETHODIMP SetSize(ULARGE_INTEGER size) override;
  STDMETHODIMP CopyTo(IStream* stream,
                      ULARGE_INTEGER size,
                      ULARGE_INTEGER* read,
                      ULARGE_INTEGER* written) override;
  STDMETHODIMP Commit(DWORD flags) override;
  STDMETHODIMP Revert() override;
  STDMETHODIMP LockRegion(ULARGE_INTEGER offset, ULARGE_INTEGER size, DWORD type) override;
  STDMETHODIMP UnlockRegion(ULARGE_INTEGER offset, ULARGE_INTEGER size, DWORD type) override;
  STDMETHODIMP Stat(STATSTG* stat, DWORD flags) override;
  STDMETHODIMP Clone(IStream** stream) override;

 private:
  explicit FileStream(Destination& destination) : destination_(&destination) {}
  virtual ~FileStream() = default;

  std::atomic<ULONG> references_{1};
  std::atomic<Destination*> destination_;
  Sha256 hash_;
  std::atomic<uint64_t> received_{0};
  std::atomic<DWORD> first_error_{ERROR_SUCCESS};
};

#pragma GCC diagnostic pop

}  // namespace cli

#endif  // RCVLINK_CLI_FILE_STREAM_H_
