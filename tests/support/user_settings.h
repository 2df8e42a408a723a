// Temporary settings of the current user during a test; the real ones are hidden.
#ifndef RCVLINK_TESTS_SUPPORT_USER_SETTINGS_H_
#define RCVLINK_TESTS_SUPPORT_USER_SETTINGS_H_

#include <gtest/gtest.h>

#include <string>

#include <windows.h>

class UserSettings {
 public:
  UserSettings() : path_(L"Software\\rcvlink-test-" + std::to_wstring(GetCurrentProcessId())) {
    HKEY user = Create(path_);
    EXPECT_EQ(RegOverridePredefKey(HKEY_CURRENT_USER, user), ERROR_SUCCESS);
    RegCloseKey(user);
  }
  UserSettings(const UserSettings&) = delete;
  UserSettings& operator=(const UserSettings&) = delete;
  ~UserSettings() {
    RegOverridePredefKey(HKEY_CURRENT_USER, nullptr);
    RegDeleteTreeW(HKEY_CURRENT_USER, path_.c_str());
  }

  void SetValue(const wchar_t* name, DWORD type, const void* data, DWORD size) {
    HKEY key = Create(L"Software\\Quorin\\QuorinDeviceMgr\\QuorinProtocol");
    RegSetValueExW(key, name, 0, type, static_cast<const BYTE*>(data), size);
    RegCloseKey(key);
  }

 private:
  static HKEY Create(const std::wstring& path) {
    HKEY key = nullptr;
    EXPECT_EQ(
        RegCreateKeyExW(
            HKEY_CURRENT_USER, path.c_str(), 0, nullptr, 0, KEY_ALL_ACCESS, nullptr, &key, nullptr),
        ERROR_SUCCESS);
    return key;
  }

  std::wstring path_;
};

#endif  // RCVLINK_TESTS_SUPPORT_USER_SETTINGS_H_
