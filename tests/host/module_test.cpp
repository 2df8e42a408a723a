// The library loaded and unloaded while the test looks on: a copy of it under another name.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <filesystem>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/handle_count.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;

namespace {

// A second copy of the library, with a state of its own.
class Copy {
 public:
  Copy() {
    std::wstring original(MAX_PATH, L'\0');
    original.resize(
        GetModuleFileNameW(GetModuleHandleW(L"rcvlink.dll"), original.data(), MAX_PATH));
    const std::filesystem::path copy = folder_ / "another.dll";
    std::filesystem::copy_file(original, copy);
    module_ = LoadLibraryW(copy.c_str());
  }
  Copy(const Copy&) = delete;
  Copy& operator=(const Copy&) = delete;
  ~Copy() { Unload(); }

  bool IsLoaded() const { return module_ != nullptr; }
  void Unload() {
    if (module_ != nullptr) FreeLibrary(module_);
    module_ = nullptr;
  }

  template <typename Function>
  Function* Find(const char* name) const {
    return reinterpret_cast<Function*>(reinterpret_cast<void*>(GetProcAddress(module_, name)));
  }

  void CreateReport(const std::wstring& name) const {
    Find<void(const wchar_t*)>("_ZN8dump_hlp16CreateReportFileEPKw")(name.c_str());
  }
  long CreateReceiver(const std::wstring& port, void** handle) const {
    std::wstring name = port;
    DCB settings = host::Settings(CBR_9600);
    return Find<long(wchar_t*, EProtocol, DCB*, void*, void**)>(
        "_ZN6devapi22CreateReceiverOnSerialEPw9EProtocolP4_DCBPvPS4_")(
        name.data(), eProtocolQuorin, &settings, nullptr, handle);
  }

 private:
  bed::TempFolder folder_;
  HMODULE module_ = nullptr;
};

TEST(ApiModule, LoadLineNeverShows) {
  const host::Report report;
  Copy copy;
  ASSERT_TRUE(copy.IsLoaded());
  const std::wstring name = host::NewReportName();
  copy.CreateReport(name);
  copy.Unload();

  const std::string text = host::ReadReport(host::ReportPath(name));
  EXPECT_THAT(text, testing::EndsWith("Bye!\r\n"));
  EXPECT_THAT(text, Not(HasSubstr("Module is loaded")));
  EXPECT_TRUE(report.Lines().empty()) << "the copy wrote into the report of the original";
  DeleteFileW(host::ReportPath(name).c_str());
}

TEST(ApiModule, SaysGoodbyeInItsReportOnly) {
  const std::wstring name = host::NewReportName();
  {
    Copy copy;
    ASSERT_TRUE(copy.IsLoaded());
    copy.CreateReport(name);
  }
  EXPECT_THAT(host::ReportLines(host::ReportPath(name)), ElementsAre("Bye!"));
  DeleteFileW(host::ReportPath(name).c_str());
}

class ApiModuleWithReceiver : public testing::Test {
 protected:
  // Loads a copy, opens a receiver through it if wanted, and unloads it. Gives the number of
  // handles that this leaves behind.
  long LoadAndUnload(bool with_receiver) {
    DeleteFileW(path_.c_str());
    const size_t before = host::HandleCount();
    {
      Copy copy;
      EXPECT_TRUE(copy.IsLoaded());
      copy.CreateReport(name_);
      void* handle = nullptr;
      if (with_receiver) {
        EXPECT_EQ(copy.CreateReceiver(port_.name(), &handle), S_OK);
      }
    }
    return static_cast<long>(host::HandleCount()) - static_cast<long>(before);
  }

  const bed::SimulatedPort port_{{"quorin"}};
  const std::wstring name_ = host::NewReportName();
  const std::wstring path_ = host::ReportPath(name_);
};

TEST_F(ApiModuleWithReceiver, LetsGoOfItWhenUnloaded) {
  LoadAndUnload(/*with_receiver=*/false);  // the system keeps something of the first time
  const long left_by_the_system = LoadAndUnload(/*with_receiver=*/false);
  EXPECT_EQ(LoadAndUnload(/*with_receiver=*/true), left_by_the_system);

  std::vector<std::string> lines = host::ReportLines(path_);
  lines.erase(lines.begin(), std::ranges::find(lines, "Bye!"));
  const std::string port = host::Narrow(port_.name());
  EXPECT_THAT(lines,
              ElementsAre("Bye!",
                          "CAbstractConnection::Cancel [" + port + "]",
                          "CAbstractConnection::Disconnect - disconnected [" + port + "]"));
  EXPECT_TRUE(DeleteFileW(path_.c_str())) << "the report is still open";

  const host::Receiver again(port_);
  EXPECT_NE(again.get(), nullptr);
}

}  // namespace
