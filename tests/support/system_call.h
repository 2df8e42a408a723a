// A call of Windows, for a function that replaces its import and passes most calls on.
#ifndef RCVLINK_TESTS_SUPPORT_SYSTEM_CALL_H_
#define RCVLINK_TESTS_SUPPORT_SYSTEM_CALL_H_

#include <windows.h>

template <typename Function>
Function* SystemCall(const wchar_t* library, const char* name) {
  return reinterpret_cast<Function*>(
      reinterpret_cast<void*>(GetProcAddress(GetModuleHandleW(library), name)));
}

#endif  // RCVLINK_TESTS_SUPPORT_SYSTEM_CALL_H_
