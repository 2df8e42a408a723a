// The link to a receiver, as drivers and commands see it.
#ifndef RCVLINK_TRANSPORT_CONNECTION_H_
#define RCVLINK_TRANSPORT_CONNECTION_H_

#include "platform/api_types.h"
#include "platform/win32.h"

#include <wtypes.h>

// What ends a wait of Read or Write early.
struct WaitRule {
  bool shielded = false;     // not Cancel nor the abort event, which are kept for a later wait
  HANDLE watched = nullptr;  // this event of the caller's ends a Read too
};

// All operations but Cancel and ClearCancel belong to the one thread that drives the receiver; these
// two may come from any. The order of the operations is fixed; the last two are the library's own.
class CIConnection {
 public:
  virtual ~CIConnection() = default;

  // Closes the link and clears a Cancel that has not ended a wait. S_OK always.
  virtual HRESULT Disconnect() = 0;

  // Reads up to `size` bytes. S_OK: *bytes_read of them arrived (0 is possible); S_FALSE: ended by
  // Cancel or an event; 0x800705B4: nothing came in `timeout_ms`; 0x8007048F: never opened;
  // else the device's error.
  virtual HRESULT Read(void* buffer, DWORD size, DWORD* bytes_read, DWORD timeout_ms) = 0;

  // Writes `size` bytes; results as for Read. With a time-out of 0 it does not wait at all: a write
  // that is still on its way is then a failure.
  virtual HRESULT Write(const void* buffer, DWORD size, DWORD timeout_ms) = 0;

  // Lets everything queued for sending leave and drops everything received.
  virtual HRESULT Flush() = 0;

  // Ends the running or else the next wait of Read or Write.
  virtual void Cancel() = 0;

  virtual HRESULT GetInstanceType(EInstanceType* type) = 0;

  // A new copy of the name that the link was opened with, to be freed by the caller; null when it
  // has none. E_POINTER for a null pointer, E_OUTOFMEMORY.
  virtual HRESULT GetName(BSTR* name) = 0;

  // The link's speed in bits per second; S_FALSE and 0 for a link that has none.
  virtual HRESULT GetSpeed(DWORD* speed) = 0;

  // An event of the caller's that ends Read and Write instead of Cancel; null removes it.
  virtual void SetAbortEvent(HANDLE event) = 0;

  // S_FALSE when there was nothing to change.
  virtual HRESULT SetSpeed(DWORD speed) = 0;

  // Clears a Cancel that has not ended a wait yet.
  virtual void ClearCancel() = 0;

  // Puts a rule in force for the waits that follow, and gives the one before it.
  virtual WaitRule ExchangeWaitRule(const WaitRule& rule) = 0;
};

#endif  // RCVLINK_TRANSPORT_CONNECTION_H_
