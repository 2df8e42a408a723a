// Result codes: the conversion from Win32 errors, and the exception that carries one.
#ifndef RCVLINK_PLATFORM_HRESULT_H_
#define RCVLINK_PLATFORM_HRESULT_H_

#include <exception>
#include <new>

#include "platform/win32.h"

// The HRESULT of a Win32 error: a positive error gets the Win32 facility; zero and negative values
// (a driver's own error numbers) pass unchanged.
constexpr HRESULT HResultFromError(DWORD error) {
  constexpr DWORD kErrorMask = 0xFFFF;
  constexpr DWORD kWin32Failure = 0x80070000;  // SEVERITY_ERROR, FACILITY_WIN32
  const auto code = static_cast<HRESULT>(error);
  return code <= 0 ? code : static_cast<HRESULT>((error & kErrorMask) | kWin32Failure);
}

constexpr HRESULT kNotConnected = HResultFromError(ERROR_DEVICE_NOT_CONNECTED);  // 0x8007048F
constexpr HRESULT kTimedOut = HResultFromError(ERROR_TIMEOUT);                   // 0x800705B4

// A failure on its way up. Its code is an HRESULT; operations that stop early without a failure
// raise S_FALSE.
class HResultError : public std::exception {
 public:
  explicit HResultError(HRESULT code) : code_(code) {}
  HRESULT code() const { return code_; }
  const char* what() const noexcept override { return "rcvlink: operation ended by a result code"; }

 private:
  HRESULT code_;
};

// Raises a failing code; S_OK, S_FALSE and other successes go on.
inline void ThrowIfFailed(HRESULT result) {
  if (FAILED(result)) throw HResultError(result);
}

// Runs one operation and gives the code that it returns or raises; what it holds is released by
// then.
template <typename Operation>
HRESULT CatchResult(Operation operation) {
  try {
    return operation();
  } catch (const HResultError& error) {
    return error.code();
  } catch (const std::bad_alloc&) {
    return E_OUTOFMEMORY;
  } catch (const std::exception&) {
    return E_UNEXPECTED;  // none may leave the library: its hosts have exceptions of their own
  }
}

#endif  // RCVLINK_PLATFORM_HRESULT_H_
