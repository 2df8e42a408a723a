// A second copy of the library under another name, with its own state, which a test loads and
// unloads.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_LIBRARY_COPY_H_
#define RCVLINK_TESTS_HOST_SUPPORT_LIBRARY_COPY_H_

#include <windows.h>

#include <filesystem>
#include <string>

#include "tests/host/support/temp_folder.h"

namespace host {

class LibraryCopy {
 public:
  // Makes the file.
  LibraryCopy();
  LibraryCopy(const LibraryCopy&) = delete;
  LibraryCopy& operator=(const LibraryCopy&) = delete;
  ~LibraryCopy() { Unload(); }

  // False when it cannot be loaded.
  bool Load();
  void Unload();

  // The exported functions of these names. It has to be loaded.
  void CreateReport(const std::wstring& name) const;
  long CreateReceiver(const std::wstring& port, void** handle) const;

  // Raises an exception that the library catches: opens a port that does not exist. False when the
  // result is not the expected one.
  bool FailToOpen(const std::wstring& missing_port) const;

 private:
  template <typename Function>
  Function* Find(const char* name) const {
    return reinterpret_cast<Function*>(reinterpret_cast<void*>(GetProcAddress(module_, name)));
  }

  bed::TempFolder folder_;
  std::filesystem::path path_;
  HMODULE module_ = nullptr;
};

}  // namespace host

#endif  // RCVLINK_TESTS_HOST_SUPPORT_LIBRARY_COPY_H_
