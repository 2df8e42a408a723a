// The link to a receiver, as drivers and commands see it.
#ifndef RCVLINK_TRANSPORT_CONNECTION_H_
#define RCVLINK_TRANSPORT_CONNECTION_H_

#include "platform/api_types.h"
#include "platform/win32.h"

#include <wtypes.h>

namespace rcvlink {

// What ends a wait of Read or Write early.
struct WaitRule {
  bool shielded = false;     // neither Cancel nor the abort event does; they end a later wait
  HANDLE watched = nullptr;  // this event of the caller ends a Read as well
};

}  // namespace rcvlink

// One thread uses a connection at a time, the one that holds the driver's connection lock. Only
// Cancel and ClearCancel may be called from any thread. The order of the operations is fixed, since
// the public header names CIConnection: code that has a connection's address finds them by their
// order. New ones are added at the end.
class CIConnection {
 public:
  virtual ~CIConnection() = default;

  // Closes the link and clears a Cancel that has not ended a wait: it must not end the first wait
  // after the link is opened again. S_OK always.
  virtual HRESULT Disconnect() = 0;

  // Reads up to `size` bytes. S_OK: *bytes_read bytes have come, which may be 0 on a COM port,
  // whose own time-outs end a read as a success; S_FALSE: ended by Cancel or an event; 0x800705B4:
  // the read did not end within `timeout_ms`; 0x8007048F: never opened; else the device's error.
  virtual HRESULT Read(void* buffer, DWORD size, DWORD* bytes_read, DWORD timeout_ms) = 0;

  // Writes `size` bytes; results as for Read. With a time-out of 0 it does not wait: a write that
  // has not ended at once is then a failure.
  virtual HRESULT Write(const void* buffer, DWORD size, DWORD timeout_ms) = 0;

  // Waits until what is queued has been sent, and discards what has been received: it would stand
  // before the next answer.
  virtual HRESULT Flush() = 0;

  // Ends the wait of Read or Write that is running, or else the next one.
  virtual void Cancel() = 0;

  virtual HRESULT GetInstanceType(EInstanceType* type) = 0;

  // A copy of the name that the link was opened with, which the caller frees; null when it has
  // none. E_POINTER for a null pointer, E_OUTOFMEMORY.
  virtual HRESULT GetName(BSTR* name) = 0;

  // The link's speed in bits per second; S_FALSE and 0 for a link that has none.
  virtual HRESULT GetSpeed(DWORD* speed) = 0;

  // An event of the caller that ends Read and Write in place of Cancel; null removes it.
  virtual void SetAbortEvent(HANDLE event) = 0;

  // S_FALSE when there was nothing to change.
  virtual HRESULT SetSpeed(DWORD speed) = 0;

  // Clears a Cancel that has not ended a wait yet.
  virtual void ClearCancel() = 0;

  // Sets the rule for the waits that follow, and gives the one that held before.
  virtual rcvlink::WaitRule ExchangeWaitRule(const rcvlink::WaitRule& rule) = 0;
};

#endif  // RCVLINK_TRANSPORT_CONNECTION_H_
