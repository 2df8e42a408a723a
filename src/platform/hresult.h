// Result codes: the conversion from Win32 errors, and the exception that carries one.
#ifndef RCVLINK_PLATFORM_HRESULT_H_
#define RCVLINK_PLATFORM_HRESULT_H_

#include <exception>
#include <new>

#include "platform/win32.h"

namespace rcvlink {

// The HRESULT of a Win32 error. A positive error gets the Win32 facility. Negative ones are a
// device driver's own error numbers (usbio.h): they are failing HRESULTs already, and a host would
// lose their upper bits. Zero is S_OK.
constexpr HRESULT HResultFromError(DWORD error) {
  constexpr DWORD kErrorMask = 0xFFFF;
  constexpr DWORD kWin32Failure = 0x80070000;  // SEVERITY_ERROR, FACILITY_WIN32
  const auto code = static_cast<HRESULT>(error);
  return code <= 0 ? code : static_cast<HRESULT>((error & kErrorMask) | kWin32Failure);
}

constexpr HRESULT kNotConnected = HResultFromError(ERROR_DEVICE_NOT_CONNECTED);  // 0x8007048F
constexpr HRESULT kTimedOut = HResultFromError(ERROR_TIMEOUT);                   // 0x800705B4

// Ends an operation with a result code, from any depth of it. The code is an HRESULT; an operation
// that stops early without a failure raises S_FALSE.
class HResultError : public std::exception {
 public:
  explicit HResultError(HRESULT code) : code_(code) {}
  HRESULT code() const { return code_; }
  const char* what() const noexcept override { return "rcvlink: operation ended by a result code"; }

 private:
  HRESULT code_;
};

// Raises a failing code. With S_OK, S_FALSE and other successes the caller goes on.
inline void ThrowIfFailed(HRESULT result) {
  if (FAILED(result)) throw HResultError(result);
}

// Runs one operation and gives the code that it returns or raises. The locks and objects that the
// operation holds are released before.
template <typename Operation>
HRESULT CatchResult(Operation operation) {
  try {
    return operation();
  } catch (const HResultError& error) {
    return error.code();
  } catch (const std::bad_alloc&) {
    return E_OUTOFMEMORY;
  } catch (const std::exception&) {
    return E_UNEXPECTED;  // a host of another compiler could not catch an exception of this one
  }
}

}  // namespace rcvlink

#endif  // RCVLINK_PLATFORM_HRESULT_H_
