// The code of docs/guide.md. The test run compiles it and runs it with simulated receivers.
#ifndef RCVLINK_EXAMPLES_GUIDE_H_
#define RCVLINK_EXAMPLES_GUIDE_H_

#include <windows.h>

#include <objidl.h>

#include <atomic>
#include <cstdarg>
#include <string>

#include "rcvlink.h"

// Takes over a BSTR of a record: copies it and frees it.
inline std::wstring TakeText(wchar_t* bstr) {
  const std::wstring text(bstr ? bstr : L"", SysStringLen(bstr));
  SysFreeString(bstr);
  return text;
}

// The receiver's model; empty when it does not say it. Do not call it while this thread holds the
// receiver's lock: after a failure a Quorin receiver is locked once more, and a Velmar one is not.
inline std::wstring ModelOf(void* receiver) {
  CReceiverInfo info = {};
  const long result = devapi::GetReceiverInfo(receiver, nullptr, &info);
  if (result != S_OK) devapi::UnlockConnection(receiver);
  TakeText(info.bstrReceiverId);
  return TakeText(info.bstrModel);
}

// Whether the receiver lists a file of this name, of any size or of this one.
inline bool IsListed(void* receiver, const std::wstring& name, long long size = -1) {
  void* files = nullptr;
  if (devapi::OpenFileList(receiver, &files) != S_OK) {
    devapi::CloseFileList(files);  // after S_FALSE there is a list
    return false;
  }
  bool found = false;
  CFileInfo file = {};
  for (long i = 0; devapi::GetFileInfo(files, i, &file) == S_OK; ++i) {
    if (TakeText(file.bstrName) == name && (size < 0 || size == file.dwSize)) found = true;
  }
  devapi::CloseFileList(files);
  return found;
}

// Keeps other threads away from a receiver for a scope.
class ReceiverLock {
 public:
  explicit ReceiverLock(void* receiver) : receiver_(receiver) {
    devapi::LockConnection(receiver, nullptr);
  }
  ReceiverLock(const ReceiverLock&) = delete;
  ReceiverLock& operator=(const ReceiverLock&) = delete;
  ~ReceiverLock() { devapi::UnlockConnection(receiver_); }

 private:
  void* receiver_;
};

// Deletes a file if it still has the size that was downloaded. No other thread comes in between.
inline bool DeleteUnchanged(void* receiver, std::wstring name, long long size) {
  const ReceiverLock lock(receiver);
  if (!IsListed(receiver, name, size)) return false;
  // S_OK is no proof: a Velmar receiver's refusal gives it, too.
  return devapi::DeleteFileW(receiver, &name[0]) == S_OK && !IsListed(receiver, name);
}

// Runs on a thread of its own beside a download. Aborts the download when `cancel` is signalled, or
// when no byte has come for the given time; the host's stream counts `bytes` in its Write. Returns
// when `done` is signalled, and says whether it has aborted.
inline bool WatchDownload(
    void* receiver, HANDLE done, HANDLE cancel, const std::atomic<size_t>& bytes, DWORD quiet_ms) {
  const HANDLE events[] = {done, cancel};
  for (;;) {
    const size_t seen = bytes;
    const DWORD ended = WaitForMultipleObjects(2, events, FALSE, quiet_ms);
    if (ended == WAIT_OBJECT_0) return false;
    if (ended == WAIT_TIMEOUT && bytes != seen) continue;
    devapi::Abort(receiver);
    WaitForSingleObject(done, INFINITE);
    return true;
  }
}

// An abort that came too late ends the next operation. Call this after one: reading the identity
// changes nothing on the receiver, and takes what is left of the abort.
inline void TakeLeftAbort(void* receiver) { ModelOf(receiver); }

// Writes a line of the host into the report.
inline void Report(const wchar_t* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  dump_hlp::DumpReportString(format, arguments);
  va_end(arguments);
}

#endif  // RCVLINK_EXAMPLES_GUIDE_H_
