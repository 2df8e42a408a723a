// The owner of a Win32 handle.
#ifndef SIMULATOR_PORTS_HANDLE_H_
#define SIMULATOR_PORTS_HANDLE_H_

#include <windows.h>

#include <memory>

namespace sim {

// Closes a kernel object. A failed open gives INVALID_HANDLE_VALUE for a file, null for others.
struct HandleCloser {
  using pointer = HANDLE;
  void operator()(HANDLE handle) const {
    if (handle != INVALID_HANDLE_VALUE) {
      CloseHandle(handle);
    }
  }
};
using UniqueHandle = std::unique_ptr<HANDLE, HandleCloser>;

}  // namespace sim

#endif  // SIMULATOR_PORTS_HANDLE_H_
