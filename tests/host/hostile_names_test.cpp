// File names that no receiver has: a clear answer for each, and a library that goes on working.
#include <gtest/gtest.h>
#include <windows.h>

#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"

namespace {

// For the two commands of a download that contain a name.
std::vector<std::wstring> NastyNames() {
  return {L"", std::wstring(10000, L'x'), L"\":{500,512}", L"A\r\nB", L"\x4E2D.log"};
}

std::vector<std::wstring> HostileNames() {
  std::vector<std::wstring> names = NastyNames();
  names.insert(names.end(),
               {L"\"", L"%1%A.log", L"%s%n%i%%", L"\r\n", L"\xD800\xFFFF", L"..\\..\\A.log"});
  return names;
}

class ApiHostileNames : public testing::Test {
 protected:
  // At full speed, so that a download does not change the speed first.
  const bed::SimulatedPort port_{{"quorin", "--speed", "115200"}, {{"A.log", "content"}}};
  const host::Receiver receiver_{port_, CBR_115200};
};

TEST_F(ApiHostileNames, AreNotDeleted) {
  for (std::wstring name : HostileNames()) {
    EXPECT_EQ(devapi::DeleteFileW(receiver_.get(), name.data()), host::kNotConnected)
        << testing::PrintToString(name.substr(0, 50));
  }
  wchar_t name[] = L"A.log";
  EXPECT_EQ(devapi::DeleteFileW(receiver_.get(), name), S_OK);
}

TEST_F(ApiHostileNames, AreNotDownloaded) {
  for (const std::wstring& name : NastyNames()) {
    MemoryStream stream;
    EXPECT_EQ(receiver_.Download(name, stream), host::kNotConnected)
        << testing::PrintToString(name.substr(0, 50));
    EXPECT_EQ(stream.writes, 0U);
  }
  MemoryStream stream;
  EXPECT_EQ(receiver_.Download(L"A.log", stream), S_OK);
  EXPECT_EQ(stream.bytes, "content");
}

}  // namespace
