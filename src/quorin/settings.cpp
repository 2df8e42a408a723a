#include "quorin/settings.h"

#include "platform/handle.h"
#include "report/report_file.h"

namespace rcvlink {
namespace {

constexpr DWORD kDefaultTimeoutMs = 30000;
constexpr wchar_t kKeyPath[] = L"Software\\Quorin\\QuorinDeviceMgr\\QuorinProtocol";
constexpr wchar_t kValueName[] = L"DownloadReadTimeout";

struct RegistryKeyTraits {
  using Handle = HKEY;
  static Handle Empty() { return nullptr; }
  static void Close(Handle key) { RegCloseKey(key); }
};
using RegistryKey = UniqueHandle<RegistryKeyTraits>;

RegistryKey OpenKey() {
  HKEY key = nullptr;
  RegOpenKeyExW(HKEY_CURRENT_USER, kKeyPath, 0, KEY_READ, &key);
  return RegistryKey(key);
}

}  // namespace

DWORD ReadDownloadReadTimeout() {
  DWORD timeout_ms = kDefaultTimeoutMs;
  const RegistryKey key = OpenKey();
  if (!key) return timeout_ms;
  // Up to four bytes of any type count: a user who made the value with another type gets the
  // time-out all the same. Only a REG_DWORD is written to the report.
  DWORD value = kDefaultTimeoutMs;
  DWORD type = REG_NONE;
  DWORD size = sizeof(value);
  const LSTATUS status = RegQueryValueExW(
      key.get(), kValueName, nullptr, &type, reinterpret_cast<BYTE*>(&value), &size);
  if (status == ERROR_SUCCESS) timeout_ms = value;
  if (status == ERROR_SUCCESS && type == REG_DWORD) {
    Trace(
        L"CQuorinProtocol::CQuorinProtocol - file download read timeout /DownloadReadTimeout/ - "
        L"%u\r\n",
        timeout_ms);
  }
  return timeout_ms;
}

}  // namespace rcvlink
