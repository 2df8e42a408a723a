#include "tests/torture/system_objects.h"

#include <windows.h>

#include <atomic>

#include "tests/support/system_call.h"

namespace {

// The thread whose calls are counted; 0 for none. Only that thread uses the rest.
std::atomic<DWORD> counted_thread = 0;
size_t count = 0;
size_t failing = torture::SystemObjects::kNone;
const char* failed = "";

bool Fails(const char* name) {
  if (counted_thread != GetCurrentThreadId() || count++ != failing) return false;
  failed = name;
  SetLastError(ERROR_NOT_ENOUGH_MEMORY);
  return true;
}

[[maybe_unused]] HANDLE WINAPI MakeEvent(SECURITY_ATTRIBUTES* security,
                                         BOOL manual,
                                         BOOL set,
                                         const wchar_t* name) {
  if (Fails("CreateEventW")) return nullptr;
  static const auto make = SystemCall<decltype(MakeEvent)>(L"kernel32", "CreateEventW");
  return make(security, manual, set, name);
}

[[maybe_unused]] HANDLE WINAPI MakeMutex(SECURITY_ATTRIBUTES* security,
                                         BOOL owned,
                                         const wchar_t* name) {
  if (Fails("CreateMutexW")) return nullptr;
  static const auto make = SystemCall<decltype(MakeMutex)>(L"kernel32", "CreateMutexW");
  return make(security, owned, name);
}

[[maybe_unused]] BSTR WINAPI MakeText(const OLECHAR* text) {
  if (text && Fails("SysAllocString")) return nullptr;
  static const auto make = SystemCall<decltype(MakeText)>(L"oleaut32", "SysAllocString");
  return make(text);
}

}  // namespace

#ifdef __MINGW32__
// What the code of a program calls through; the linker takes these before those of the import libraries.
extern "C" {
extern decltype(MakeEvent)* const __imp_CreateEventW;
extern decltype(MakeMutex)* const __imp_CreateMutexW;
extern decltype(MakeText)* const __imp_SysAllocString;
decltype(MakeEvent)* const __imp_CreateEventW = MakeEvent;
decltype(MakeMutex)* const __imp_CreateMutexW = MakeMutex;
decltype(MakeText)* const __imp_SysAllocString = MakeText;
}
#endif

torture::SystemObjects::SystemObjects(size_t number) {
  count = 0;
  failing = number;
  failed = "";
  counted_thread = GetCurrentThreadId();
}

torture::SystemObjects::~SystemObjects() {
  counted_thread = 0;
  failing = kNone;
}

bool torture::SystemObjects::HasFailed() { return count > failing; }

const char* torture::SystemObjects::Failed() { return failed; }
