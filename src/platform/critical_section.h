// A Win32 critical section, to be held with std::scoped_lock. It is recursive.
#ifndef RCVLINK_PLATFORM_CRITICAL_SECTION_H_
#define RCVLINK_PLATFORM_CRITICAL_SECTION_H_

#include "platform/hresult.h"
#include "platform/win32.h"

namespace rcvlink {

class CriticalSection {
 public:
  // Raises the HRESULT of the Win32 error when the section cannot be created.
  CriticalSection() {
    // No spinning: who holds such a lock may write to a file or call the host, which takes longer.
    constexpr DWORD kSpinCount = 0;
    if (!InitializeCriticalSectionAndSpinCount(&section_, kSpinCount)) {
      throw HResultError(HResultFromError(GetLastError()));
    }
  }
  CriticalSection(const CriticalSection&) = delete;
  CriticalSection& operator=(const CriticalSection&) = delete;
  ~CriticalSection() { DeleteCriticalSection(&section_); }

  // The names that std::scoped_lock calls.
  void lock() { EnterCriticalSection(&section_); }
  void unlock() { LeaveCriticalSection(&section_); }

 private:
  CRITICAL_SECTION section_;
};

}  // namespace rcvlink

#endif  // RCVLINK_PLATFORM_CRITICAL_SECTION_H_
