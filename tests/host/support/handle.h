// Win32 handles that close themselves.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_HANDLE_H_
#define RCVLINK_TESTS_HOST_SUPPORT_HANDLE_H_

#include <windows.h>

#include <memory>

namespace bed {

struct HandleCloser {
  using pointer = HANDLE;
  void operator()(HANDLE handle) const {
    if (handle != INVALID_HANDLE_VALUE) CloseHandle(handle);
  }
};

// Owns whatever CloseHandle closes.
using UniqueHandle = std::unique_ptr<HANDLE, HandleCloser>;

}  // namespace bed

#endif  // RCVLINK_TESTS_HOST_SUPPORT_HANDLE_H_
