// The link over a COM port.
#ifndef RCVLINK_TRANSPORT_SERIAL_CONNECTION_H_
#define RCVLINK_TRANSPORT_SERIAL_CONNECTION_H_

#include "transport/abstract_connection.h"

class CSerialConnection : public CAbstractConnection {
 public:
  explicit CSerialConnection(rcvlink::DeviceCalls& calls = rcvlink::SystemCalls());
  ~CSerialConnection() override;

  HRESULT Flush() override;
  HRESULT GetInstanceType(EInstanceType* type) override;
  HRESULT GetSpeed(DWORD* speed) override;
  HRESULT SetSpeed(DWORD speed) override;

  // Opens the port at the first speed and RTS mode at which `probe` is true (without a probe, the
  // first of all). S_OK; S_FALSE when there was none or the abort event was signalled; else why the
  // port could not be opened. Discovery does not call it: its tries begin with the port's
  // current speed.
  virtual HRESULT Connect(const wchar_t* port, HANDLE abort_event, Probe probe);

  // Opens the port ("COM7") with these settings, which must not be null; a baud rate of 0 keeps the
  // port's. E_INVALIDARG for a null name, else why the port could not be opened.
  virtual HRESULT Open(const wchar_t* port, const DCB* settings);

 private:
  // Gives the Win32 error, 0 when the port is open.
  DWORD OpenDevice(const wchar_t* port);
  // Writes a call that failed to the report. The open goes on: a port that refuses one setting may
  // still reach the receiver, and the probe finds out.
  void Report(const wchar_t* call, BOOL succeeded) const;
  void MergeSettings(const DCB& settings);
  // The port's settings with the speed and RTS mode of one try.
  DCB SettingsOfTry(DWORD speed, DWORD rts_control) const;
  void ReportLineErrors(DWORD errors) const;
  void WaitUntilSent();

  DCB settings_{};  // as last set on the port
};

#endif  // RCVLINK_TRANSPORT_SERIAL_CONNECTION_H_
