// A file list opened through the exports, closed at the end.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_FILE_LIST_H_
#define RCVLINK_TESTS_HOST_SUPPORT_FILE_LIST_H_

#include <windows.h>

#include <stdexcept>
#include <string>
#include <utility>

#include "rcvlink.h"

namespace host {

class FileList {
 public:
  struct Entry {
    std::wstring name;
    CFileInfo info;  // its name is freed already
  };

  // Reads a receiver's directory.
  explicit FileList(void* receiver) : result_(devapi::OpenFileList(receiver, &handle_)) {}
  FileList(const FileList&) = delete;
  FileList& operator=(const FileList&) = delete;
  FileList(FileList&& other) noexcept
      : handle_(std::exchange(other.handle_, nullptr)), result_(other.result_) {}
  ~FileList() {
    if (handle_ != nullptr) devapi::CloseFileList(handle_);
  }
  // A list that was opened before.
  static FileList Take(void* handle) { return FileList(handle, S_OK); }

  HRESULT result() const { return result_; }
  long Count() const {
    long count = -1;
    Check(devapi::GetFilesCount(handle_, &count));
    return count;
  }
  Entry At(long index) const {
    Entry entry{};
    Check(devapi::GetFileInfo(handle_, index, &entry.info));
    entry.name.assign(entry.info.bstrName, SysStringLen(entry.info.bstrName));
    SysFreeString(std::exchange(entry.info.bstrName, nullptr));
    return entry;
  }

 private:
  FileList(void* handle, HRESULT result) : handle_(handle), result_(result) {}
  static void Check(long result) {
    if (result != S_OK) throw std::runtime_error("file list: " + std::to_string(result));
  }

  void* handle_ = nullptr;
  HRESULT result_;
};

}  // namespace host

#endif  // RCVLINK_TESTS_HOST_SUPPORT_FILE_LIST_H_
