// Discovery: from the name of a port to a registered receiver.
#include <array>
#include <memory>
#include <utility>

#include "api/registry.h"
#include "platform/api_types.h"
#include "platform/event.h"
#include "platform/hresult.h"
#include "quorin/quorin_protocol.h"
#include "receiver/abstract_receiver.h"
#include "report/report_file.h"
#include "transport/serial_connection.h"
#include "transport/usb_connection.h"
#include "velmar/velmar_protocol.h"

namespace {

struct RtsTry {
  DWORD control;
  const wchar_t* name;
};
constexpr std::array<RtsTry, 3> kRtsTries = {{{RTS_CONTROL_HANDSHAKE, L"handshake"},
                                              {RTS_CONTROL_ENABLE, L"enable"},
                                              {RTS_CONTROL_DISABLE, L"disable"}}};

constexpr DWORD kCurrentSpeed = 0;
constexpr std::array<DWORD, 6> kSpeedTries = {
    kCurrentSpeed, CBR_9600, CBR_115200, CBR_57600, CBR_38400, CBR_19200};

constexpr BYTE kByteSize = 8;
constexpr DWORD kRtsControlMask = 0x3;  // fRtsControl has two bits

DCB SettingsOfTry(DWORD speed, DWORD rts_control) {
  DCB settings{};
  settings.DCBlength = sizeof(DCB);
  settings.BaudRate = speed;
  settings.fBinary = TRUE;
  settings.fRtsControl = rts_control & kRtsControlMask;
  settings.fOutxCtsFlow = rts_control == RTS_CONTROL_HANDSHAKE;
  settings.ByteSize = kByteSize;
  settings.Parity = NOPARITY;
  settings.StopBits = ONESTOPBIT;
  return settings;
}

// The driver of the family that answers, S_FALSE for none.
HRESULT FindDriver(std::unique_ptr<CIConnection> connection,
                   const wchar_t* port,
                   EProtocol protocol,
                   HANDLE abort_event,
                   std::unique_ptr<CIProtocol>& driver) {
  if (protocol != eProtocolVelmar) {
    if (IsSignalled(abort_event)) return S_FALSE;
    Trace(L"CreateReceiverOnSerial - looking for Quorin receiver [%s]\r\n", port);
    if (CQuorinProtocol::Probe(connection.get(), abort_event)) {
      driver = std::make_unique<CQuorinProtocol>(std::move(connection));
      Trace(L"CreateReceiverOnSerial - Quorin receiver found [%s]\r\n", port);
      return S_OK;
    }
  }
  if (protocol == eProtocolQuorin || IsSignalled(abort_event)) return S_FALSE;
  Trace(L"CreateReceiverOnSerial - looking for Velmar receiver [%s]\r\n", port);
  if (!CVelmarProtocol::Probe(connection.get(), abort_event)) return S_FALSE;
  driver = std::make_unique<CVelmarProtocol>(std::move(connection));
  Trace(L"CreateReceiverOnSerial - Velmar receiver found [%s]\r\n", port);
  return S_OK;
}

// Makes the receiver around the driver that was found, and registers it.
HRESULT Register(const wchar_t* caller,
                 const wchar_t* port,
                 std::unique_ptr<CIProtocol> driver,
                 void** receiver) {
  auto object = std::make_shared<CAbstractReceiver>(std::move(driver));
  void* handle = nullptr;
  ThrowIfFailed(Receivers().Insert(port, std::move(object), &handle));
  Trace(L"%s - OK [%s]\r\n", caller, port);
  *receiver = handle;
  return S_OK;
}

}  // namespace

namespace devapi {

long CreateReceiverOnSerial(
    wchar_t* port, EProtocol protocol, _DCB* settings, void* abortEvent, void** receiver) {
  if (!port || !settings || !receiver) return E_INVALIDARG;
  return CatchResult([&] {
    auto connection = std::make_unique<CSerialConnection>();
    Trace(L"CreateReceiverOnSerial - opening serial port [%s]\r\n", port);
    ThrowIfFailed(connection->Open(port, settings));
    std::unique_ptr<CIProtocol> driver;
    const HRESULT find_result =
        FindDriver(std::move(connection), port, protocol, abortEvent, driver);
    if (find_result != S_OK) return find_result;
    return Register(L"CreateReceiverOnSerial", port, std::move(driver), receiver);
  });
}

// Only Quorin receivers are on USB, whatever family is asked for.
long CreateReceiverOnUSB(wchar_t* device, EProtocol, void* abortEvent, void** receiver) {
  if (!device || !receiver) return E_INVALIDARG;
  return CatchResult([&] {
    auto connection = std::make_unique<CUSBConnection>();
    Trace(L"CreateReceiverOnUSB - opening USB [%s]\r\n", device);
    ThrowIfFailed(connection->Open(device));
    if (IsSignalled(abortEvent)) return S_FALSE;
    Trace(L"CreateReceiverOnUSB - looking for Quorin receiver [%s]\r\n", device);
    if (!CQuorinProtocol::Probe(connection.get(), abortEvent)) return S_FALSE;
    auto driver = std::make_unique<CQuorinProtocol>(std::move(connection));
    Trace(L"CreateReceiverOnUSB - Quorin receiver found [%s]\r\n", device);
    return Register(L"CreateReceiverOnUSB", device, std::move(driver), receiver);
  });
}

long SearchReceiver(
    wchar_t* port, EInstanceType type, EProtocol protocol, void* abortEvent, void** receiver) {
  const HRESULT open_result = OpenReceiver(port, receiver);
  if (FAILED(open_result)) return open_result;
  if (open_result == S_OK) {
    Trace(L"SearchReceiver - receiver already exists [%s]\r\n", port);
    return S_OK;
  }
  switch (type) {
    case eInstanceSerial:
      return SearchReceiverOnSerial(port, protocol, abortEvent, receiver);
    case eInstanceUSB:
      return CreateReceiverOnUSB(port, protocol, abortEvent, receiver);
    case eInstanceAny:
      break;
    default:
      return E_UNEXPECTED;
  }

  const HRESULT serial_result = SearchReceiverOnSerial(port, protocol, abortEvent, receiver);
  if (*receiver) return serial_result;
  if (FAILED(serial_result)) {
    Trace(L"SearchReceiver - SearchReceiverOnSerial failed[%s] [0x%08X]\r\n", port, serial_result);
  }
  const HRESULT usb_result = CreateReceiverOnUSB(port, protocol, abortEvent, receiver);
  if (*receiver) return usb_result;
  if (FAILED(usb_result)) {
    Trace(L"SearchReceiver - CreateReceiverOnUSB failed[%s] [0x%08X]\r\n", port, usb_result);
  }
  return usb_result;
}

}  // namespace devapi

long SearchReceiverOnSerial(wchar_t* port, EProtocol protocol, void* abortEvent, void** receiver) {
  for (const RtsTry& rts : kRtsTries) {
    for (const DWORD speed : kSpeedTries) {
      if (speed == kCurrentSpeed) {
        Trace(L"SearchReceiverOnSerial - try current port speed [%s]\r\n", port);
      } else {
        Trace(L"SearchReceiverOnSerial - try speed [%u] [%s]\r\n", speed, port);
      }
      Trace(L"SearchReceiverOnSerial - try RTS control is %s [%s]\r\n", rts.name, port);
      DCB settings = SettingsOfTry(speed, rts.control);
      const HRESULT result =
          devapi::CreateReceiverOnSerial(port, protocol, &settings, abortEvent, receiver);
      if (FAILED(result)) return result;
      if (*receiver) return S_OK;
      if (IsSignalled(abortEvent)) return S_FALSE;
    }
  }
  return S_FALSE;
}
