// A receiver without hardware for tests of the exported functions, with answers that the test sets.
#ifndef RCVLINK_TESTS_SUPPORT_STUB_RECEIVER_H_
#define RCVLINK_TESTS_SUPPORT_STUB_RECEIVER_H_

#include <functional>
#include <string>
#include <vector>

#include "receiver/receiver.h"

class StubReceiver : public CIReceiver {
 public:
  HRESULT result = S_OK;
  std::vector<std::string> calls;
  std::function<void()> during;  // runs inside each operation; may be empty
  std::function<void(CFileList&)> fill;
  bool* destroyed = nullptr;
  bool* stopped = nullptr;

  ~StubReceiver() override {
    if (destroyed) *destroyed = true;
  }
  HRESULT Reserved1() override { return Called("Reserved1"); }
  HRESULT Reserved2() override { return Called("Reserved2"); }
  HRESULT CheckConnection(HANDLE, short*) override { return Called("CheckConnection"); }
  HRESULT GetReceiverInfo(HANDLE, CReceiverInfo*) override { return Called("GetReceiverInfo"); }
  HRESULT GetFiles(CFileList* files) override {
    if (fill) fill(*files);
    return Called("GetFiles");
  }
  HRESULT DownloadFile(const wchar_t*, IStream*, CProgressCallback*) override {
    return Called("DownloadFile");
  }
  HRESULT UploadFile(const CFileInfo*, IStream*, CProgressCallback*) override {
    return Called("UploadFile");
  }
  HRESULT DeleteFile(const wchar_t*) override { return Called("DeleteFile"); }
  HRESULT RenameFile(const wchar_t*, const wchar_t*) override { return Called("RenameFile"); }
  HRESULT Abort() override { return Called("Abort"); }
  HRESULT LockConnection(HANDLE) override { return Called("LockConnection"); }
  HRESULT UnlockConnection() override { return Called("UnlockConnection"); }
  HRESULT DCSetRcvBaudrate(DWORD) override { return Called("DCSetRcvBaudrate"); }
  HRESULT DCSetRcvRTSControl(BYTE) override { return Called("DCSetRcvRTSControl"); }
  HRESULT DCSetRcvParity(BYTE) override { return Called("DCSetRcvParity"); }
  HRESULT DCSetRcvStopbits(BYTE) override { return Called("DCSetRcvStopbits"); }
  HRESULT SetProgressCallback(ProgressFunction, void*) override {
    return Called("SetProgressCallback");
  }
  void Stop() override {
    calls.push_back("Stop");
    if (stopped) *stopped = true;
  }

 private:
  HRESULT Called(const char* name) {
    calls.push_back(name);
    if (during) during();
    return result;
  }
};

#endif  // RCVLINK_TESTS_SUPPORT_STUB_RECEIVER_H_
