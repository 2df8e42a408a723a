// Move-only owners of Win32 handles.
#ifndef RCVLINK_PLATFORM_HANDLE_H_
#define RCVLINK_PLATFORM_HANDLE_H_

#include <utility>

#include "platform/win32.h"

namespace rcvlink {

// Owns one handle of the kind that Traits describes (its type, its empty value, how it is closed).
// Closing keeps the thread's last error: callers read it after a failed call, when owners may have
// closed their handles already.
template <typename Traits>
class UniqueHandle {
 public:
  using Handle = typename Traits::Handle;

  UniqueHandle() = default;
  explicit UniqueHandle(Handle handle) : handle_(handle) {}
  UniqueHandle(UniqueHandle&& other) noexcept
      : handle_(std::exchange(other.handle_, Traits::Empty())) {}
  UniqueHandle& operator=(UniqueHandle&& other) noexcept {
    if (this != &other) {
      Reset();
      handle_ = std::exchange(other.handle_, Traits::Empty());
    }
    return *this;
  }
  ~UniqueHandle() { Reset(); }

  void Reset() {
    if (!*this) return;
    const DWORD last_error = GetLastError();
    Traits::Close(std::exchange(handle_, Traits::Empty()));
    SetLastError(last_error);
  }

  Handle get() const { return handle_; }
  explicit operator bool() const { return handle_ != Traits::Empty(); }

 private:
  Handle handle_ = Traits::Empty();
};

// CreateFile gives INVALID_HANDLE_VALUE when it fails; the functions that create events and mutexes
// give null.
struct FileHandleTraits {
  using Handle = HANDLE;
  static Handle Empty() { return INVALID_HANDLE_VALUE; }
  static void Close(Handle handle) { CloseHandle(handle); }
};

struct KernelHandleTraits {
  using Handle = HANDLE;
  static Handle Empty() { return nullptr; }
  static void Close(Handle handle) { CloseHandle(handle); }
};

using FileHandle = UniqueHandle<FileHandleTraits>;      // files and devices
using KernelHandle = UniqueHandle<KernelHandleTraits>;  // events and mutexes

}  // namespace rcvlink

#endif  // RCVLINK_PLATFORM_HANDLE_H_
