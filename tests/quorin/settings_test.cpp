#include "quorin/settings.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "tests/support/report_capture.h"

using testing::ElementsAre;

namespace {

// The current user's settings are those of a key of our own for the length of a test.
class QuorinSettings : public testing::Test {
 protected:
  void SetUp() override {
    const std::wstring path = L"Software\\rcvlink-test-" + std::to_wstring(GetCurrentProcessId());
    path_ = path;
    HKEY user = nullptr;
    ASSERT_EQ(Create(HKEY_CURRENT_USER, path, &user), ERROR_SUCCESS);
    ASSERT_EQ(RegOverridePredefKey(HKEY_CURRENT_USER, user), ERROR_SUCCESS);
    RegCloseKey(user);
  }
  void TearDown() override {
    RegOverridePredefKey(HKEY_CURRENT_USER, nullptr);
    RegDeleteTreeW(HKEY_CURRENT_USER, path_.c_str());
  }

  static LSTATUS Create(HKEY parent, const std::wstring& path, HKEY* key) {
    return RegCreateKeyExW(
        parent, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, key, nullptr);
  }
  static void SetValue(const wchar_t* name, DWORD type, const void* data, DWORD size) {
    HKEY key = nullptr;
    ASSERT_EQ(Create(HKEY_CURRENT_USER, L"Software\\Quorin\\QuorinDeviceMgr\\QuorinProtocol", &key),
              ERROR_SUCCESS);
    RegSetValueExW(key, name, 0, type, static_cast<const BYTE*>(data), size);
    RegCloseKey(key);
  }

  const ReportCapture report;

 private:
  std::wstring path_;
};

TEST_F(QuorinSettings, AreThirtySecondsWithoutTheKey) {
  EXPECT_EQ(ReadDownloadReadTimeout(), 30000U);
  EXPECT_THAT(report.Lines(), ElementsAre());
}

TEST_F(QuorinSettings, AreThirtySecondsWithoutTheValue) {
  const DWORD value = 1234;
  SetValue(L"Another", REG_DWORD, &value, sizeof(value));
  EXPECT_EQ(ReadDownloadReadTimeout(), 30000U);
  EXPECT_THAT(report.Lines(), ElementsAre());
}

TEST_F(QuorinSettings, AreTheValueAndAreTraced) {
  const DWORD value = 4000000000;
  SetValue(L"DownloadReadTimeout", REG_DWORD, &value, sizeof(value));
  EXPECT_EQ(ReadDownloadReadTimeout(), 4000000000U);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CQuorinProtocol::CQuorinProtocol - file download read timeout "
                          "/DownloadReadTimeout/ - 4000000000"));
}

TEST_F(QuorinSettings, OfAnotherTypeAreTakenWithoutATrace) {
  const DWORD value = 1234;
  SetValue(L"DownloadReadTimeout", REG_BINARY, &value, sizeof(value));
  EXPECT_EQ(ReadDownloadReadTimeout(), 1234U);
  EXPECT_THAT(report.Lines(), ElementsAre());
}

TEST_F(QuorinSettings, ThatDoNotFitAreNotTraced) {
  const wchar_t text[] = L"12345678";
  SetValue(L"DownloadReadTimeout", REG_SZ, text, sizeof(text));
  EXPECT_EQ(ReadDownloadReadTimeout(), 30000U);
  EXPECT_THAT(report.Lines(), ElementsAre());
}

}  // namespace
