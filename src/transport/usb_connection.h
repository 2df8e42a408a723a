// The link over USB, through the USBIO kernel driver. Each handle on the device is bound to one
// bulk endpoint, so there are two of them: one for each direction.
#ifndef RCVLINK_TRANSPORT_USB_CONNECTION_H_
#define RCVLINK_TRANSPORT_USB_CONNECTION_H_

#include <cstdint>
#include <memory>
#include <span>

#include "transport/abstract_connection.h"
#include "transport/usb_descriptors.h"

class CUSBConnection : public CAbstractConnection {
 public:
  explicit CUSBConnection(rcvlink::DeviceCalls& calls = rcvlink::SystemCalls())
      : CAbstractConnection(calls) {}
  ~CUSBConnection() override;

  HRESULT Disconnect() override;
  HRESULT Write(const void* buffer, DWORD size, DWORD timeout_ms) override;
  // Reads what is waiting, byte by byte, and discards it; for 3 s at most, if a device does not stop
  // sending. Always S_OK.
  HRESULT Flush() override;
  HRESULT GetInstanceType(EInstanceType* type) override;
  // A USB link has no baud rate: 0 and S_FALSE.
  HRESULT GetSpeed(DWORD* speed) override;
  HRESULT SetSpeed(DWORD speed) override;
  HANDLE GetReadHandle() override;

  // A USB link has no speeds and RTS modes to try: E_NOTIMPL.
  virtual HRESULT Connect(const wchar_t* device, HANDLE abort_event, Probe probe);

  // Opens the device by its path, without a prefix. A device that cannot be opened or configured is
  // written to the report and the open goes on, since another handle may have configured it.
  //
  // S_OK; E_INVALIDARG for a null path; S_FALSE when the descriptors have another layout than those
  // of the receivers; the Win32 error as a plain number, which is no failing HRESULT, when the
  // device does not give its descriptor; else the failure. In the second and third case no pipe is
  // bound: discovery asks on such a link as on any other, and finds no receiver.
  virtual HRESULT Open(const wchar_t* device);

 protected:
  // Disconnect sends the unbind request only at kBound. Nothing in the library sets it, so the
  // driver never gets that request; a derived class may set it.
  static constexpr char16_t kClosed = u'0';
  static constexpr char16_t kBound = u'2';
  char16_t link_state_ = kClosed;

 private:
  void OpenHandles(const wchar_t* device);
  void Configure(const wchar_t* device);
  // S_OK and the endpoints, or the result with which the open ends.
  HRESULT ReadEndpoints(rcvlink::BulkEndpoints* endpoints);
  HRESULT BindPipes(const rcvlink::BulkEndpoints& endpoints);
  // Sends one request to the driver and gives the Win32 error, 0 for none; ERROR_TIMEOUT when the
  // driver has not answered after 10 s. `*returned` is the number of bytes in `output`.
  DWORD Request(HANDLE handle,
                uint32_t code,
                std::span<const uint8_t> input = {},
                std::span<uint8_t> output = {},
                DWORD* returned = nullptr);
  DWORD Await(HANDLE handle,
              uint32_t code,
              std::unique_ptr<rcvlink::Transfer>& request,
              DWORD* count);

  rcvlink::FileHandle read_handle_;  // the base's device_ is for writing
};

#endif  // RCVLINK_TRANSPORT_USB_CONNECTION_H_
