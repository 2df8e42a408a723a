// What serial and USB links share: the device, its name, three events, and overlapped reads and
// writes with a time-out and an abort.
#ifndef RCVLINK_TRANSPORT_ABSTRACT_CONNECTION_H_
#define RCVLINK_TRANSPORT_ABSTRACT_CONNECTION_H_

#include <memory>

#include "platform/handle.h"
#include "platform/text.h"
#include "transport/connection.h"
#include "transport/device_calls.h"
#include "transport/transfer.h"

class CAbstractConnection : public CIConnection {
 public:
  // Asks on an open connection whether a receiver answers; the abort event ends the question.
  using Probe = bool (*)(CIConnection* connection, HANDLE abort_event);

  HRESULT Disconnect() override;
  HRESULT Read(void* buffer, DWORD size, DWORD* bytes_read, DWORD timeout_ms) override;
  HRESULT Write(const void* buffer, DWORD size, DWORD timeout_ms) override;
  HRESULT Flush() override;
  void Cancel() override;
  HRESULT GetName(BSTR* name) override;
  void SetAbortEvent(HANDLE event) override;
  void ClearCancel() override;
  rcvlink::WaitRule ExchangeWaitRule(const rcvlink::WaitRule& rule) override;

  // The handle of Write and that of Read: a USB link has one for each direction.
  virtual HANDLE GetWriteHandle();
  virtual HANDLE GetReadHandle();
  // What ends a wait early: the caller's abort event if there is one, else the connection's own
  // cancel event.
  virtual HANDLE GetAbortEvent();

 protected:
  explicit CAbstractConnection(rcvlink::DeviceCalls& calls) : calls_(calls) {}

  // Creates the events that do not exist yet. They stay when the link is opened again, so that
  // Cancel from another thread never meets a closed handle. S_OK or the Win32 error.
  HRESULT CreateEvents();

  // Whether a Cancel has not ended a wait yet; it still will.
  bool IsCancelPending() const;

  // Ends a transfer on the device. A driver that does not end it within 5 s keeps it for ever, and
  // `transfer` is null then.
  void CancelTransfer(HANDLE handle, std::unique_ptr<rcvlink::Transfer>& transfer);

  rcvlink::DeviceCalls& calls_;
  rcvlink::FileHandle device_;
  rcvlink::UniqueBstr name_;

 private:
  // Waits for a pending transfer; `watched` (may be null) ends the wait as well. Whatever ends the
  // wait, the transfer has ended when this returns, or it is null. S_OK only when the transfer's own
  // event ended the wait.
  HRESULT WaitForTransfer(HANDLE handle,
                          std::unique_ptr<rcvlink::Transfer>& transfer,
                          DWORD timeout_ms,
                          HANDLE watched);

  // Null before the first opening, and when the driver has kept one: nothing is read or written
  // then until the link is opened again.
  std::unique_ptr<rcvlink::Transfer> writing_;  // its event is auto-reset
  std::unique_ptr<rcvlink::Transfer> reading_;  // its event is manual-reset
  rcvlink::KernelHandle cancel_event_;          // auto-reset: one Cancel ends one wait
  HANDLE abort_event_ = nullptr;                // the caller's
  rcvlink::WaitRule wait_rule_;
};

#endif  // RCVLINK_TRANSPORT_ABSTRACT_CONNECTION_H_
