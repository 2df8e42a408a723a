// The link over USB, through the USBIO kernel driver: one handle on the device for each direction,
// each bound to a bulk endpoint.
#ifndef RCVLINK_TRANSPORT_USB_CONNECTION_H_
#define RCVLINK_TRANSPORT_USB_CONNECTION_H_

#include <cstdint>
#include <span>

#include "transport/abstract_connection.h"
#include "transport/usb_descriptors.h"

class CUSBConnection : public CAbstractConnection {
 public:
  explicit CUSBConnection(DeviceCalls& calls = SystemCalls()) : CAbstractConnection(calls) {}
  ~CUSBConnection() override;

  HRESULT Disconnect() override;
  HRESULT Write(const void* buffer, DWORD size, DWORD timeout_ms) override;
  // Reads away what is waiting, byte by byte. Always S_OK.
  HRESULT Flush() override;
  HRESULT GetInstanceType(EInstanceType* type) override;
  // A USB link has no baud rate: 0 and S_FALSE.
  HRESULT GetSpeed(DWORD* speed) override;
  HRESULT SetSpeed(DWORD speed) override;
  HANDLE GetReadHandle() override;

  // There is nothing to sweep on USB: E_NOTIMPL.
  virtual HRESULT Connect(const wchar_t* device, HANDLE abort_event, Probe probe);

  // Opens the device by its path, which is taken as it is. A device that cannot be opened or
  // configured is written to the report and tried all the same, since another handle may have
  // configured it. S_OK; E_INVALIDARG for a null path; S_FALSE, a success, when the descriptors
  // have another layout than those of the receivers: the pipes are not bound then; the plain Win32
  // error, a success as well, when the device does not give its descriptor; else the failure.
  virtual HRESULT Open(const wchar_t* device);

 protected:
  // Nobody gives it another value than '0'; Disconnect unbinds at '2'.
  static constexpr char16_t kClosed = u'0';
  static constexpr char16_t kBound = u'2';
  char16_t link_state_ = kClosed;

 private:
  void OpenHandles(const wchar_t* device);
  void Configure(const wchar_t* device);
  // S_OK with the endpoints, or what ends the open.
  HRESULT ReadEndpoints(BulkEndpoints* endpoints);
  HRESULT BindPipes(const BulkEndpoints& endpoints);
  // One request to the driver: the Win32 error, 0 for none. `*returned` is how much came out.
  DWORD Request(HANDLE handle,
                uint32_t code,
                std::span<const uint8_t> input = {},
                std::span<uint8_t> output = {},
                DWORD* returned = nullptr);

  FileHandle read_handle_;  // the base's is for writing
};

#endif  // RCVLINK_TRANSPORT_USB_CONNECTION_H_
