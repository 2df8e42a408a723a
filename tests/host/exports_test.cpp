// The names under which the DLL exports its functions, for GNU's and Microsoft's compilers.
#include <gtest/gtest.h>
#include <windows.h>

#include <cctype>
#include <fstream>
#include <map>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/report.h"

namespace {

constexpr const char* kExports = "tests/data/exports.txt";  // from the folder that tests start in

HMODULE Module() { return GetModuleHandleW(L"rcvlink.dll"); }

FARPROC Find(const std::string& name) { return GetProcAddress(Module(), name.c_str()); }

template <typename Function>
Function* FindAs(const std::string& name) {
  return reinterpret_cast<Function*>(reinterpret_cast<void*>(Find(name)));
}

std::vector<std::string> ExportedNames() {
  std::vector<std::string> names;
  std::ifstream file(kExports);
  for (std::string line; std::getline(file, line);) {
    if (!line.empty()) names.push_back(line);
  }
  return names;
}

bool IsMicrosoft(const std::string& name) { return name.starts_with('?'); }

// "devapi::Abort" of "?Abort@devapi@@YAJPEAX@Z"
std::string MicrosoftFunction(const std::string& name) {
  const size_t end = name.find('@');
  const size_t scope_end = name.find("@@");
  const std::string function = name.substr(1, end - 1);
  return scope_end == end ? function : name.substr(end + 1, scope_end - end - 1) + "::" + function;
}

// "devapi::Abort" of "_ZN6devapi5AbortEPv"
std::string GnuFunction(const std::string& name) {
  std::string function;
  size_t at = name.starts_with("_ZN") ? 3 : 2;
  while (at < name.size() && std::isdigit(static_cast<unsigned char>(name[at])) != 0) {
    size_t digits = 0;
    const size_t length = std::stoul(name.substr(at), &digits);
    function += (function.empty() ? "" : "::") + name.substr(at + digits, length);
    at += digits + length;
    if (name.starts_with("_Z") && !name.starts_with("_ZN")) break;
  }
  return function;
}

// Distinguishes functions of one name by their text argument.
std::string Key(const std::string& name) {
  if (IsMicrosoft(name)) {
    const bool narrow = name.find("@@YAXPEBD") != std::string::npos;
    return MicrosoftFunction(name) + (narrow ? " narrow" : "");
  }
  const bool narrow = name.find("EPKc") != std::string::npos;
  return GnuFunction(name) + (narrow ? " narrow" : "");
}

TEST(ApiExports, EveryNameIsThere) {
  const std::vector<std::string> names = ExportedNames();
  ASSERT_FALSE(names.empty()) << kExports;
  for (const std::string& name : names) EXPECT_NE(Find(name), nullptr) << name;
}

TEST(ApiExports, BothNamesOfAFunctionHaveTheSameAddress) {
  std::map<std::string, FARPROC> microsoft;
  std::map<std::string, FARPROC> gnu;
  for (const std::string& name : ExportedNames()) {
    auto& names = IsMicrosoft(name) ? microsoft : gnu;
    EXPECT_TRUE(names.emplace(Key(name), Find(name)).second) << name << " twice";
  }
  EXPECT_EQ(microsoft.size(), 30U);
  EXPECT_EQ(microsoft, gnu);

  std::map<FARPROC, std::string> functions;
  for (const auto& [name, address] : gnu) {
    const auto [other, is_new] = functions.emplace(address, name);
    EXPECT_TRUE(is_new) << name << " is " << other->second;
  }
}

TEST(ApiExports, TheHeaderDeclaresTheSameFunctions) {
  EXPECT_EQ(reinterpret_cast<void*>(&devapi::DeleteFileW),
            reinterpret_cast<void*>(Find("?DeleteFileW@devapi@@YAJPEAXPEA_W@Z")));
  EXPECT_EQ(
      reinterpret_cast<void*>(&SearchReceiverOnSerial),
      reinterpret_cast<void*>(Find("?SearchReceiverOnSerial@@YAJPEA_WW4EProtocol@@PEAXPEAPEAX@Z")));
}

TEST(ApiExports, AnswerUnderTheMicrosoftName) {
  const auto open = FindAs<long(wchar_t*, void**)>("?OpenReceiver@devapi@@YAJPEA_WPEAPEAX@Z");
  const auto destroy = FindAs<long(wchar_t*)>("?DestroyReceiver@devapi@@YAJPEA_W@Z");
  const auto abort = FindAs<long(void*)>("?Abort@devapi@@YAJPEAX@Z");
  const auto set_speed = FindAs<long(void*, unsigned long)>("?DCSetRcvBaudrate@devapi@@YAJPEAXK@Z");
  const auto get_info =
      FindAs<long(void*, long, CFileInfo*)>("?GetFileInfo@devapi@@YAJPEAXJPEAUCFileInfo@@@Z");
  ASSERT_TRUE(open && destroy && abort && set_speed && get_info);

  std::wstring name = L"no such port";
  void* handle = &name;
  EXPECT_EQ(open(name.data(), nullptr), E_INVALIDARG);
  EXPECT_EQ(open(name.data(), &handle), S_FALSE);
  EXPECT_EQ(handle, &name);
  EXPECT_EQ(destroy(nullptr), E_INVALIDARG);
  EXPECT_EQ(destroy(name.data()), S_FALSE);
  EXPECT_EQ(abort(nullptr), E_INVALIDARG);
  EXPECT_EQ(set_speed(&name, 9600), E_INVALIDARG);
  CFileInfo info{};
  EXPECT_EQ(get_info(&name, 0, &info), E_INVALIDARG);
}

TEST(ApiExports, WriteAReportUnderTheMicrosoftNames) {
  const auto create = FindAs<void(const char*)>("?CreateReportFile@dump_hlp@@YAXPEBD@Z");
  const auto create_wide = FindAs<void(const wchar_t*)>("?CreateReportFile@dump_hlp@@YAXPEB_W@Z");
  const auto dump =
      FindAs<void(const wchar_t*, char*)>("?DumpReportString@dump_hlp@@YAXPEB_WPEAD@Z");
  const auto close = FindAs<void()>("?CloseReportFile@dump_hlp@@YAXXZ");
  ASSERT_TRUE(create && create_wide && dump && close);

  const std::wstring name = host::NewReportName();
  const std::wstring path = host::ReportPath(name);
  create_wide(name.c_str());
  dump(L"through the wide one\r\n", nullptr);
  EXPECT_EQ(host::ReportLines(path), std::vector<std::string>{"through the wide one"});
  create(std::string(name.begin(), name.end()).c_str());
  dump(L"through the narrow one\r\n", nullptr);
  close();
  EXPECT_EQ(host::ReportLines(path), std::vector<std::string>{"through the narrow one"});
  DeleteFileW(path.c_str());
}

TEST(ApiExports, GetConnectionDoesNothing) {
  std::wstring name = L"COM1";
  auto* const before = reinterpret_cast<CIConnection*>(&name);
  CIConnection* connection = before;
  for (const EInstanceType type : {eInstanceAny, eInstanceSerial, eInstanceUSB}) {
    EXPECT_EQ(GetConnection(name.data(), type, &connection), E_NOTIMPL);
  }
  EXPECT_EQ(connection, before);
  EXPECT_EQ(GetConnection(nullptr, eInstanceAny, nullptr), E_NOTIMPL);
}

}  // namespace
