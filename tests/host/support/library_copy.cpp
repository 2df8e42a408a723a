#include "tests/host/support/library_copy.h"

#include "rcvlink.h"
#include "tests/host/support/receiver.h"

namespace host {

LibraryCopy::LibraryCopy() : path_(folder_ / "another.dll") {
  std::wstring original(MAX_PATH, L'\0');
  original.resize(GetModuleFileNameW(GetModuleHandleW(L"rcvlink.dll"), original.data(), MAX_PATH));
  std::filesystem::copy_file(original, path_);
}

bool LibraryCopy::Load() {
  module_ = LoadLibraryW(path_.c_str());
  return module_ != nullptr;
}

void LibraryCopy::Unload() {
  if (module_ != nullptr) FreeLibrary(module_);
  module_ = nullptr;
}

void LibraryCopy::CreateReport(const std::wstring& name) const {
  Find<void(const wchar_t*)>("_ZN8dump_hlp16CreateReportFileEPKw")(name.c_str());
}

long LibraryCopy::CreateReceiver(const std::wstring& port, void** handle) const {
  std::wstring name = port;
  DCB settings = Settings(CBR_9600);
  return Find<long(wchar_t*, EProtocol, DCB*, void*, void**)>(
      "_ZN6devapi22CreateReceiverOnSerialEPw9EProtocolP4_DCBPvPS4_")(
      name.data(), eProtocolQuorin, &settings, nullptr, handle);
}

bool LibraryCopy::FailToOpen(const std::wstring& missing_port) const {
  void* handle = nullptr;
  return CreateReceiver(missing_port, &handle) == kFileNotFound;
}

}  // namespace host
