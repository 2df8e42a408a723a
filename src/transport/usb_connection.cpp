#include "transport/usb_connection.h"

#include <algorithm>
#include <array>
#include <vector>

#include "platform/clock.h"
#include "platform/hresult.h"
#include "report/report_file.h"
#include "transport/usbio.h"
#include "transport/wait_scope.h"

using rcvlink::BulkEndpoints;
using rcvlink::Clock;
using rcvlink::CopyBstr;
using rcvlink::CurrentClock;
using rcvlink::FileHandle;
using rcvlink::FindBulkEndpoints;
using rcvlink::HResultFromError;
using rcvlink::kConfigurationDescriptorLength;
using rcvlink::TotalLength;
using rcvlink::Trace;
using rcvlink::Transfer;
using rcvlink::WaitScope;

namespace {

// A device takes a request within milliseconds. The driver waits for some seconds when a device does
// not answer its own requests.
constexpr DWORD kRequestLimitMs = 10000;

// Of a flush: a receiver that was sending a file still has some blocks under way, which take
// milliseconds.
constexpr DWORD kDiscardLimitMs = 3000;

template <typename Record>
std::span<const uint8_t> BytesOf(const Record& record) {
  return {reinterpret_cast<const uint8_t*>(&record), sizeof(record)};
}

struct DriverError {
  uint32_t code;
  const wchar_t* name;
};
constexpr std::array<DriverError, 4> kDriverErrors = {
    {{usbio::kCrcError, L"USBIO_ERR_CRC"},
     {usbio::kBitStuffError, L"USBIO_ERR_BTSTUFF"},
     {usbio::kDataToggleError, L"USBIO_ERR_DATA_TOGGLE_MISMATCH"},
     {usbio::kNotBoundError, L"USBIO_ERR_NOT_BOUND"}}};

// Writes the name of a driver's own error to the report: Windows has no text for its number.
void DumpDriveErrorDesc(HRESULT result) {
  for (const DriverError& error : kDriverErrors) {
    if (error.code != static_cast<uint32_t>(result)) continue;
    // "%0x08X" prints the number in lower case and "08X" after it. It is not corrected: whoever
    // searches reports for this line searches for that text.
    Trace(L"CUSBConnection::DumpDriveErrorDesc - %s [%0x08X]\r\n", error.name, result);
  }
}

}  // namespace

CUSBConnection::~CUSBConnection() { CUSBConnection::Disconnect(); }

HRESULT CUSBConnection::Connect(const wchar_t*, HANDLE, Probe) { return E_NOTIMPL; }

HRESULT CUSBConnection::Open(const wchar_t* device) {
  Trace(L"CUSBConnection::Create\r\n");
  if (!device) return E_INVALIDARG;
  Disconnect();
  if (const HRESULT result = CreateEvents(); FAILED(result)) return result;
  OpenHandles(device);
  Configure(device);
  BulkEndpoints endpoints;
  if (const HRESULT result = ReadEndpoints(&endpoints); result != S_OK) return result;
  if (const HRESULT result = BindPipes(endpoints); FAILED(result)) return result;
  name_ = CopyBstr(device);
  Trace(L"CUSBConnection::Create - OK [%s]\r\n", name_.get());
  return S_OK;
}

void CUSBConnection::OpenHandles(const wchar_t* device) {
  const auto open = [&](DWORD access) {
    FileHandle handle(calls_.CreateFile(device, access, 0, FILE_FLAG_OVERLAPPED));
    if (!handle) Trace(L"%u\r\n", GetLastError());
    return handle;
  };
  device_ = open(GENERIC_WRITE);
  read_handle_ = open(GENERIC_READ);
}

void CUSBConnection::Configure(const wchar_t* device) {
  const usbio::ConfigurationRequest configuration;
  const DWORD error = Request(device_.get(), usbio::kSetConfiguration, BytesOf(configuration));
  if (error == ERROR_SUCCESS) return;
  Trace(
      L"CUSBConnection::Create - DeviceIoControl(IOCTL_USBIO_SET_CONFIGURATION) is failed [%u] "
      L"[%s]. "
      L"Try to continue...\r\n",
      error,
      device);
}

HRESULT CUSBConnection::ReadEndpoints(BulkEndpoints* endpoints) {
  const usbio::DescriptorRequest request;
  std::array<uint8_t, kConfigurationDescriptorLength> head{};
  DWORD returned = 0;
  const DWORD head_error =
      Request(device_.get(), usbio::kGetDescriptor, BytesOf(request), head, &returned);
  // The plain error number is no failing HRESULT: discovery goes on, finds that no receiver
  // answers, and gives S_FALSE. So a host cannot tell a missing device from one without a receiver.
  if (head_error != ERROR_SUCCESS) return static_cast<HRESULT>(head_error);
  if (returned != head.size()) return S_FALSE;

  std::vector<uint8_t> descriptors(TotalLength(head));
  const DWORD error =
      Request(device_.get(), usbio::kGetDescriptor, BytesOf(request), descriptors, &returned);
  if (error != ERROR_SUCCESS) return HResultFromError(error);
  const auto found = FindBulkEndpoints(descriptors);
  if (!found) return S_FALSE;
  *endpoints = *found;
  return S_OK;
}

HRESULT CUSBConnection::BindPipes(const BulkEndpoints& endpoints) {
  DWORD error = Request(read_handle_.get(), usbio::kBindPipe, BytesOf(endpoints.in));
  if (error == ERROR_SUCCESS) {
    error = Request(device_.get(), usbio::kBindPipe, BytesOf(endpoints.out));
  }
  if (error == ERROR_SUCCESS) error = Request(device_.get(), usbio::kResetPipe);
  if (error == ERROR_SUCCESS) error = Request(read_handle_.get(), usbio::kResetPipe);
  return HResultFromError(error);
}

DWORD CUSBConnection::Request(HANDLE handle,
                              uint32_t code,
                              std::span<const uint8_t> input,
                              std::span<uint8_t> output,
                              DWORD* returned) {
  std::unique_ptr<Transfer> request;
  const HRESULT result = Transfer::Create(/*manual_reset=*/TRUE, request);
  if (FAILED(result) || FAILED(request->Prepare(input.size() + output.size()))) {
    return ERROR_OUTOFMEMORY;
  }
  uint8_t* const answer = std::ranges::copy(input, request->bytes()).out;
  DWORD count = 0;
  DWORD error = ERROR_SUCCESS;
  if (!calls_.DeviceIoControl(handle,
                              code,
                              request->bytes(),
                              static_cast<DWORD>(input.size()),
                              answer,
                              static_cast<DWORD>(output.size()),
                              &count,
                              request->record())) {
    error = GetLastError();
  }
  if (error == ERROR_IO_PENDING) error = Await(handle, code, request, &count);
  if (error == ERROR_SUCCESS) {
    std::copy_n(answer, std::min<size_t>(count, output.size()), output.data());
  }
  if (returned) *returned = count;
  return error;
}

// Waits for the driver's answer.
DWORD CUSBConnection::Await(HANDLE handle,
                            uint32_t code,
                            std::unique_ptr<Transfer>& request,
                            DWORD* count) {
  if (calls_.WaitForSingleObject(request->event(), kRequestLimitMs) != WAIT_OBJECT_0) {
    Trace(L"CUSBConnection::Request - no answer to 0x%08X\r\n", code);
    CancelTransfer(handle, request);
    return ERROR_TIMEOUT;
  }
  return calls_.GetOverlappedResult(handle, request->record(), count) ? ERROR_SUCCESS
                                                                      : GetLastError();
}

HRESULT CUSBConnection::Disconnect() {
  Trace(L"CUSBConnection::Disconnect\r\n");
  if (device_ && link_state_ == kBound) Request(device_.get(), usbio::kUnbindPipe);
  read_handle_.Reset();
  return CAbstractConnection::Disconnect();
}

HRESULT CUSBConnection::Write(const void* buffer, DWORD size, DWORD timeout_ms) {
  const HRESULT result = CAbstractConnection::Write(buffer, size, timeout_ms);
  if (FAILED(result)) DumpDriveErrorDesc(result);
  return result;
}

HRESULT CUSBConnection::Flush() {
  Trace(L"CUSBConnection::Flush\r\n");
  // These reads do not wait, so a cancel is not meant for them: it ends the flush, and stays for
  // the wait of the command that follows.
  const WaitScope shield = WaitScope::Shielded(this);
  Clock& clock = CurrentClock();
  const DWORD start = clock.Ticks();
  while (!IsCancelPending()) {
    uint8_t waiting = 0;
    DWORD count = 0;
    if (Read(&waiting, sizeof(waiting), &count, 0) != S_OK || count != sizeof(waiting)) break;
    if (clock.Ticks() - start > kDiscardLimitMs) {
      Trace(L"CUSBConnection::Flush - the device does not stop sending [%s]\r\n", name_.get());
      break;
    }
  }
  return S_OK;
}

HRESULT CUSBConnection::GetInstanceType(EInstanceType* type) {
  *type = eInstanceUSB;
  return S_OK;
}

HRESULT CUSBConnection::GetSpeed(DWORD* speed) {
  *speed = 0;
  return S_FALSE;
}

HRESULT CUSBConnection::SetSpeed(DWORD) { return S_FALSE; }

HANDLE CUSBConnection::GetReadHandle() { return read_handle_.get(); }
