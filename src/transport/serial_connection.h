// The link over a COM port.
#ifndef RCVLINK_TRANSPORT_SERIAL_CONNECTION_H_
#define RCVLINK_TRANSPORT_SERIAL_CONNECTION_H_

#include "transport/abstract_connection.h"

class CSerialConnection : public CAbstractConnection {
 public:
  explicit CSerialConnection(DeviceCalls& calls = SystemCalls());
  ~CSerialConnection() override;

  HRESULT Flush() override;
  HRESULT GetInstanceType(EInstanceType* type) override;
  HRESULT GetSpeed(DWORD* speed) override;
  HRESULT SetSpeed(DWORD speed) override;

  // Opens the port at the first speed and RTS mode at which `probe` answers (a null probe always
  // does). S_OK; S_FALSE when none did or the abort event was signalled; else why the port could
  // not be opened.
  virtual HRESULT Connect(const wchar_t* port, HANDLE abort_event, Probe probe);

  // Opens the port ("COM7") with the settings given, which must not be null; a baud rate of 0 keeps
  // the port's. E_INVALIDARG for a null name, else why the port could not be opened.
  virtual HRESULT Open(const wchar_t* port, const DCB* settings);

 private:
  // The Win32 error, 0 when it was opened.
  DWORD OpenDevice(const wchar_t* port);
  // A call that fails is written to the report with its name, and the port is used as it is.
  void Report(const wchar_t* call, BOOL succeeded) const;
  void MergeSettings(const DCB& settings);
  // The port's state, changed to the speed and RTS mode of one try.
  DCB SettingsOfTry(DWORD speed, DWORD rts_control) const;
  void ReportLineErrors(DWORD errors) const;
  void WaitUntilSent();

  DCB settings_{};  // the port's, as last set
};

#endif  // RCVLINK_TRANSPORT_SERIAL_CONNECTION_H_
