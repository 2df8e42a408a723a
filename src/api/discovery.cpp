// Discovery: from the name of a port to a registered receiver.
#include "api/discovery.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <memory>
#include <utility>
#include <vector>

#include "api/registry.h"
#include "platform/event.h"
#include "platform/hresult.h"
#include "receiver/abstract_receiver.h"
#include "report/report_file.h"
#include "transport/serial_connection.h"
#include "transport/usb_connection.h"

using rcvlink::CatchResult;
using rcvlink::Family;
using rcvlink::FindReceiver;
using rcvlink::Inquiry;
using rcvlink::IsSignalled;
using rcvlink::Receivers;
using rcvlink::ThrowIfFailed;
using rcvlink::Trace;

namespace {

struct RtsTry {
  DWORD control;
  const wchar_t* name;
};
// Receivers and cables differ in how they use RTS, and with the wrong mode nothing may come
// through.
constexpr std::array<RtsTry, 3> kRtsTries = {{{RTS_CONTROL_HANDSHAKE, L"handshake"},
                                              {RTS_CONTROL_ENABLE, L"enable"},
                                              {RTS_CONTROL_DISABLE, L"disable"}}};

constexpr DWORD kCurrentSpeed = 0;  // a DCB with this speed keeps that of the port
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

// The family that is asked for. Any number that is not a family's means all of them.
std::span<const Family> FamiliesOnSerial(EProtocol protocol) {
  const std::span<const Family> all = rcvlink::kFamilies;
  const auto asked = std::ranges::find(all, protocol, &Family::protocol);
  return asked == all.end() ? all : std::span(asked, 1);
}

// All families with a USB link, whatever family is asked for: a host that asks for another one
// would find nothing, although a receiver is there.
std::vector<Family> FamiliesOnUsb() {
  std::vector<Family> families;
  std::ranges::copy_if(rcvlink::kFamilies, std::back_inserter(families), &Family::is_on_usb);
  return families;
}

// Creates a receiver with the driver that was found, and registers it.
HRESULT Register(const Inquiry& inquiry, std::unique_ptr<CIProtocol> driver, void** receiver) {
  auto object = std::make_shared<CAbstractReceiver>(std::move(driver));
  void* handle = nullptr;
  ThrowIfFailed(Receivers().Insert(inquiry.name, std::move(object), &handle));
  Trace(L"%s - OK [%s]\r\n", inquiry.caller, inquiry.name);
  *receiver = handle;
  return S_OK;
}

}  // namespace

HRESULT rcvlink::FindReceiver(std::span<const Family> families,
                              const Inquiry& inquiry,
                              std::unique_ptr<CIConnection> connection,
                              void** receiver) {
  for (const Family& family : families) {
    if (IsSignalled(inquiry.abort_event)) return S_FALSE;
    Trace(L"%s - looking for %s receiver [%s]\r\n", inquiry.caller, family.name, inquiry.name);
    if (!family.probe(connection.get(), inquiry.abort_event)) continue;
    std::unique_ptr<CIProtocol> driver = family.make(std::move(connection));
    Trace(L"%s - %s receiver found [%s]\r\n", inquiry.caller, family.name, inquiry.name);
    return Register(inquiry, std::move(driver), receiver);
  }
  return S_FALSE;
}

namespace devapi {

long CreateReceiverOnSerial(
    wchar_t* port, EProtocol protocol, _DCB* settings, void* abortEvent, void** receiver) {
  if (!port || !settings || !receiver) return E_INVALIDARG;
  return CatchResult([&] {
    auto connection = std::make_unique<CSerialConnection>();
    Trace(L"CreateReceiverOnSerial - opening serial port [%s]\r\n", port);
    ThrowIfFailed(connection->Open(port, settings));
    return FindReceiver(FamiliesOnSerial(protocol),
                        {L"CreateReceiverOnSerial", port, abortEvent},
                        std::move(connection),
                        receiver);
  });
}

long CreateReceiverOnUSB(wchar_t* device, EProtocol, void* abortEvent, void** receiver) {
  if (!device || !receiver) return E_INVALIDARG;
  return CatchResult([&] {
    auto connection = std::make_unique<CUSBConnection>();
    Trace(L"CreateReceiverOnUSB - opening USB [%s]\r\n", device);
    ThrowIfFailed(connection->Open(device));
    return FindReceiver(FamiliesOnUsb(),
                        {L"CreateReceiverOnUSB", device, abortEvent},
                        std::move(connection),
                        receiver);
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

  // A name is either that of a port or that of a device, so one of the two links cannot be opened.
  // That failure is only written to the report, and the result is that of USB.
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
      // A port that cannot be opened cannot be opened with other settings either.
      if (FAILED(result)) return result;
      if (*receiver) return S_OK;
      if (IsSignalled(abortEvent)) return S_FALSE;
    }
  }
  return S_FALSE;
}
