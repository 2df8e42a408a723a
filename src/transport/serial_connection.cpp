#include "transport/serial_connection.h"

#include <array>
#include <string>

#include "platform/clock.h"
#include "platform/event.h"
#include "platform/hresult.h"
#include "report/report_file.h"

using rcvlink::Clock;
using rcvlink::CopyBstr;
using rcvlink::CurrentClock;
using rcvlink::DeviceCalls;
using rcvlink::FileHandle;
using rcvlink::HResultFromError;
using rcvlink::IsSignalled;
using rcvlink::Trace;

namespace {

constexpr DWORD kEventMask = EV_RXCHAR | EV_ERR;
constexpr DWORD kInputQueueBytes = 16384;
constexpr DWORD kOutputQueueBytes = 1024;
// Milliseconds, of the port's driver. A read ends when the line is silent for 1 s after a byte, or
// after 200 ms for each byte asked for and 100 ms more; it then is a success, also of 0 bytes. The
// time-outs of Read and Write apply as well.
constexpr COMMTIMEOUTS kTimeouts = {
    .ReadIntervalTimeout = 1000,
    .ReadTotalTimeoutMultiplier = 200,
    .ReadTotalTimeoutConstant = 100,
    .WriteTotalTimeoutMultiplier = 200,
    .WriteTotalTimeoutConstant = 100,
};
constexpr DWORD kPurgeAll = PURGE_TXABORT | PURGE_RXABORT | PURGE_TXCLEAR | PURGE_RXCLEAR;
constexpr BYTE kByteSize = 8;
constexpr DWORD kRtsControlMask = 0x3;  // fRtsControl has two bits

// How long the output queue may stand still before the flush stops waiting for it. A byte
// takes 33 ms at 300 bit/s, so a queue that stands still for so long is not just slow.
constexpr DWORD kDrainLimitMs = 3000;

constexpr std::array<DWORD, 5> kSweepSpeeds = {
    CBR_115200, CBR_57600, CBR_38400, CBR_19200, CBR_9600};

struct RtsMode {
  DWORD control;
  const wchar_t* name;
};
constexpr std::array<RtsMode, 3> kRtsModes = {{{RTS_CONTROL_DISABLE, L"disable"},
                                               {RTS_CONTROL_ENABLE, L"enable"},
                                               {RTS_CONTROL_HANDSHAKE, L"handshake"}}};

struct LineError {
  DWORD bit;
  const wchar_t* text;
};
constexpr LineError kModeError = {
    CE_MODE, L"The requested mode is not supported, or the hFile parameter is invalid."};
constexpr std::array<LineError, 7> kLineErrors = {{
    {CE_BREAK, L"The hardware detected a break condition."},
    {CE_FRAME, L"The hardware detected a framing error."},
    {CE_IOE, L"An I/O error occurred during communications with the device."},
    {CE_OVERRUN, L"A character-buffer overrun has occurred. The next character is lost."},
    {CE_RXOVER,
     L"An input buffer overflow has occurred. There is either no room in the input buffer, or a "
     L"character was received after the end-of-file (EOF) character."},
    {CE_RXPARITY, L"The hardware detected a parity error."},
    {CE_TXFULL, L"The application tried to transmit a character, but the output buffer was full."},
}};

}  // namespace

CSerialConnection::CSerialConnection(DeviceCalls& calls) : CAbstractConnection(calls) {
  settings_.DCBlength = sizeof(DCB);
}

CSerialConnection::~CSerialConnection() { CAbstractConnection::Disconnect(); }

HRESULT CSerialConnection::Open(const wchar_t* port, const DCB* settings) {
  if (!port) return E_INVALIDARG;
  if (const HRESULT result = CreateEvents(); FAILED(result)) return result;
  if (const DWORD error = OpenDevice(port); error != ERROR_SUCCESS) {
    // The report's lines of failures say Create, that of success says Open: programs and people
    // search reports for these texts.
    Trace(L"CSerialConnection::Create - CreateFile failed [%u] [%s]\r\n", error, name_.get());
    return HResultFromError(error);
  }
  Report(L"SetCommMask", calls_.SetCommMask(device_.get(), kEventMask));
  Report(L"SetupComm", calls_.SetupComm(device_.get(), kInputQueueBytes, kOutputQueueBytes));
  Flush();
  settings_ = DCB{};
  settings_.DCBlength = sizeof(DCB);
  Report(L"GetCommState", calls_.GetCommState(device_.get(), &settings_));
  MergeSettings(*settings);
  Report(L"SetCommState", calls_.SetCommState(device_.get(), &settings_));
  COMMTIMEOUTS timeouts = kTimeouts;
  Report(L"SetCommTimeouts", calls_.SetCommTimeouts(device_.get(), &timeouts));
  Trace(L"CSerialConnection::Open - OK [%s]\r\n", name_.get());
  return S_OK;
}

DWORD CSerialConnection::OpenDevice(const wchar_t* port) {
  const std::wstring path = std::wstring(L"\\\\.\\") + port;
  Disconnect();
  name_ = CopyBstr(port);
  device_ = FileHandle(
      calls_.CreateFile(path.c_str(), GENERIC_READ | GENERIC_WRITE, 0, FILE_FLAG_OVERLAPPED));
  return device_ ? ERROR_SUCCESS : GetLastError();
}

void CSerialConnection::Report(const wchar_t* call, BOOL succeeded) const {
  if (succeeded) return;
  const DWORD error = GetLastError();
  Trace(L"CSerialConnection::Create - %s failed [%u] [%s]\r\n", call, error, name_.get());
}

// Flow control by XON/XOFF and the special characters stay as the port has them: they are not among
// the settings that a host gives (rcvlink.h).
void CSerialConnection::MergeSettings(const DCB& settings) {
  if (settings.BaudRate != 0) settings_.BaudRate = settings.BaudRate;
  settings_.fBinary = settings.fBinary;
  settings_.fParity = settings.fParity;
  settings_.fOutxCtsFlow = settings.fOutxCtsFlow;
  settings_.fOutxDsrFlow = settings.fOutxDsrFlow;
  settings_.fDtrControl = settings.fDtrControl;
  settings_.fDsrSensitivity = settings.fDsrSensitivity;
  settings_.fRtsControl = settings.fRtsControl;
  settings_.fAbortOnError = settings.fAbortOnError;
  settings_.ByteSize = settings.ByteSize;
  settings_.Parity = settings.Parity;
  settings_.StopBits = settings.StopBits;
}

HRESULT CSerialConnection::Connect(const wchar_t* port, HANDLE abort_event, Probe probe) {
  Trace(L"CSerialConnection::Connect\r\n");
  if (!port) return E_INVALIDARG;
  if (const HRESULT result = CreateEvents(); FAILED(result)) return result;
  for (const DWORD speed : kSweepSpeeds) {
    if (const DWORD error = OpenDevice(port); error != ERROR_SUCCESS) {
      return HResultFromError(error);
    }
    Trace(L"CSerialConnection::Connect - try speed [%u] [%s]\r\n", speed, name_.get());
    calls_.SetCommMask(device_.get(), kEventMask);
    calls_.SetupComm(device_.get(), kInputQueueBytes, kOutputQueueBytes);
    COMMTIMEOUTS timeouts = kTimeouts;
    calls_.SetCommTimeouts(device_.get(), &timeouts);
    Flush();
    for (const RtsMode& mode : kRtsModes) {
      DCB settings = SettingsOfTry(speed, mode.control);
      Trace(L"CSerialConnection::Connect - try RTS control is %s [%s]\r\n", mode.name, name_.get());
      calls_.SetCommState(device_.get(), &settings);
      if (IsSignalled(abort_event)) return S_FALSE;
      if (!probe || probe(this, abort_event)) {
        settings_ = settings;
        Trace(L"CSerialConnection::Connect - OK [%s]\r\n", name_.get());
        return S_OK;
      }
    }
  }
  return S_FALSE;
}

DCB CSerialConnection::SettingsOfTry(DWORD speed, DWORD rts_control) const {
  DCB settings{};
  settings.DCBlength = sizeof(DCB);
  calls_.GetCommState(device_.get(), &settings);
  settings.BaudRate = speed;
  settings.fBinary = TRUE;
  settings.fParity = FALSE;
  settings.fOutxCtsFlow = rts_control == RTS_CONTROL_HANDSHAKE;
  settings.fOutxDsrFlow = FALSE;
  settings.fDtrControl = DTR_CONTROL_DISABLE;
  settings.fDsrSensitivity = FALSE;
  settings.fRtsControl = rts_control & kRtsControlMask;
  settings.ByteSize = kByteSize;
  settings.Parity = NOPARITY;
  settings.StopBits = ONESTOPBIT;
  return settings;
}

HRESULT CSerialConnection::Flush() {
  Trace(L"CSerialConnection::Flush\r\n");
  WaitUntilSent();
  if (calls_.PurgeComm(device_.get(), kPurgeAll)) return S_OK;
  const DWORD error = GetLastError();
  Trace(L"CSerialConnection::Flush - PurgeComm failed [%u] [%s]\r\n", error, name_.get());
  return HResultFromError(error);
}

// Waits until everything queued has been sent: a command or a control byte that the purge discarded
// would never reach the receiver. It does not sleep: commands are short, and the sleep would make
// each of them slower. A queue that stands still, since the receiver holds the line by flow
// control, is left to the purge.
void CSerialConnection::WaitUntilSent() {
  Clock& clock = CurrentClock();
  DWORD last_progress = clock.Ticks();
  DWORD last_queued = 0;
  for (;;) {
    DWORD errors = 0;
    COMSTAT status{};
    if (!calls_.ClearCommError(device_.get(), &errors, &status)) {
      const DWORD error = GetLastError();
      Trace(L"CSerialConnection::Flush - ClearCommError failed [%u] [%s]\r\n", error, name_.get());
      return;
    }
    ReportLineErrors(errors);
    if (status.cbOutQue == 0) return;
    const DWORD now = clock.Ticks();
    if (status.cbOutQue != last_queued) {
      last_queued = status.cbOutQue;
      last_progress = now;
    } else if (now - last_progress > kDrainLimitMs) {
      Trace(L"CSerialConnection::Flush - output queue does not move [%s]\r\n", name_.get());
      return;
    }
  }
}

void CSerialConnection::ReportLineErrors(DWORD errors) const {
  const auto report = [&](const LineError& error) {
    if ((errors & error.bit) == 0) return;
    Trace(L"CSerialConnection::Flush - error detected [%s] [%s]\r\n", error.text, name_.get());
  };
  if (errors & kModeError.bit) {
    report(kModeError);
    return;
  }
  for (const LineError& error : kLineErrors) report(error);
}

HRESULT CSerialConnection::GetInstanceType(EInstanceType* type) {
  *type = eInstanceSerial;
  return S_OK;
}

HRESULT CSerialConnection::GetSpeed(DWORD* speed) {
  *speed = settings_.BaudRate;
  return S_OK;
}

HRESULT CSerialConnection::SetSpeed(DWORD speed) {
  if (settings_.BaudRate == speed) return S_FALSE;
  Trace(L"CSerialConnection::SetSpeed - changing of baudrate [%u -> %u]\r\n",
        settings_.BaudRate,
        speed);
  settings_.BaudRate = speed;
  if (calls_.SetCommState(device_.get(), &settings_)) return S_OK;
  const DWORD error = GetLastError();
  Trace(L"CSerialConnection::SetSpeed - SetCommState is failed [%u] [%s]\r\n", error, name_.get());
  return HResultFromError(error);
}
