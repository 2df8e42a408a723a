// Owns the Win32 handles that the program opens.
#ifndef RCVLINK_CLI_HANDLE_H_
#define RCVLINK_CLI_HANDLE_H_

#include <windows.h>

#include <memory>

namespace cli {

// Closes a kernel object. A failed open gives INVALID_HANDLE_VALUE for a file, null for others.
struct HandleCloser {
  using pointer = HANDLE;
  void operator()(HANDLE handle) const {
    if (handle != INVALID_HANDLE_VALUE) CloseHandle(handle);
  }
};
using UniqueHandle = std::unique_ptr<HANDLE, HandleCloser>;

}  // namespace cli

#endif  // RCVLINK_CLI_HANDLE_H_
