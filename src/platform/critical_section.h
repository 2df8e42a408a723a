// A Win32 critical section, to be held with std::scoped_lock. It is recursive.
#ifndef RCVLINK_PLATFORM_CRITICAL_SECTION_H_
#define RCVLINK_PLATFORM_CRITICAL_SECTION_H_

#include "platform/hresult.h"
#include "platform/win32.h"

class CriticalSection {
 public:
  // Raises the HRESULT of the Win32 error when the section cannot be made.
  CriticalSection() {
    constexpr DWORD kSpinCount = 0;
    if (!InitializeCriticalSectionAndSpinCount(&section_, kSpinCount)) {
      throw HResultError(HResultFromError(GetLastError()));
    }
  }
  CriticalSection(const CriticalSection&) = delete;
  CriticalSection& operator=(const CriticalSection&) = delete;
  ~CriticalSection() { DeleteCriticalSection(&section_); }

  // Named as std::scoped_lock wants them.
  void lock() { EnterCriticalSection(&section_); }
  void unlock() { LeaveCriticalSection(&section_); }

 private:
  CRITICAL_SECTION section_;
};

#endif  // RCVLINK_PLATFORM_CRITICAL_SECTION_H_
