// A connection over USB on a fake device that has one bulk endpoint for each direction.
#ifndef RCVLINK_TESTS_TRANSPORT_USB_CONNECTION_FIXTURE_H_
#define RCVLINK_TESTS_TRANSPORT_USB_CONNECTION_FIXTURE_H_

#include <gtest/gtest.h>

#include <array>
#include <cstddef>
#include <initializer_list>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "tests/support/fake_device.h"
#include "tests/support/report_capture.h"
#include "tests/transport/descriptor_bytes.h"
#include "transport/usb_connection.h"

inline constexpr wchar_t kPath[] = L"\\\\?\\usb#vid_1234#{abcd}";
inline constexpr char kName[] = "\\\\?\\usb#vid_1234#{abcd}";

inline constexpr DWORD kGetDescriptor = 0x80942006;
inline constexpr DWORD kSetConfiguration = 0x80942024;
inline constexpr DWORD kBindPipe = 0x80942078;
inline constexpr DWORD kUnbindPipe = 0x8094207C;
inline constexpr DWORD kResetPipe = 0x80942080;

// An error of the driver's own.
inline constexpr DWORD kDriverNotBound = 0xE0001009;

class TestUsbConnection : public CUSBConnection {
 public:
  using CUSBConnection::CUSBConnection;
  char16_t LinkState() const { return link_state_; }
  void SetLinkState(char16_t state) { link_state_ = state; }
};

inline bool IsOpen(HANDLE handle) {
  DWORD flags = 0;
  return GetHandleInformation(handle, &flags) != FALSE;
}

class UsbConnectionTest : public testing::Test {
 protected:
  UsbConnectionTest() { GiveDescriptors(UsualDevice()); }

  static std::string UsualDevice() {
    return DeviceBytes({EndpointBytes(0x02, kBulk), EndpointBytes(0x83, kBulk)});
  }
  // What the device answers to the two requests for its descriptors.
  void GiveDescriptors(const std::string& bytes) {
    device.request_answers[kGetDescriptor] = {{.output = bytes}, {.output = bytes}};
  }
  void Fail(DWORD code, std::initializer_list<DWORD> errors) {
    auto& answers = device.request_answers[code];
    answers.clear();
    for (const DWORD error : errors) answers.push_back({.error = error});
  }

  HRESULT Open() { return connection->Open(kPath); }
  // Ready for transfers, with earlier calls cleared.
  void OpenForTransfers() {
    ASSERT_EQ(Open(), S_OK);
    device.calls.clear();
    lines_before = report.Lines().size();
  }
  HRESULT Read(DWORD timeout_ms = 700) {
    return connection->Read(buffer.data(), sizeof(buffer), &count, timeout_ms);
  }
  HRESULT Write(DWORD timeout_ms = 700) {
    return connection->Write(buffer.data(), sizeof(buffer), timeout_ms);
  }

  HANDLE WriteHandle() const { return device.openings.at(0).handle; }
  HANDLE ReadHandle() const { return device.openings.at(1).handle; }
  // The requests with their handles, in order.
  std::vector<std::string> Requests() const {
    const std::vector<std::pair<DWORD, std::string>> names = {{kGetDescriptor, "get descriptor"},
                                                              {kSetConfiguration, "configure"},
                                                              {kBindPipe, "bind"},
                                                              {kUnbindPipe, "unbind"},
                                                              {kResetPipe, "reset"}};
    std::vector<std::string> requests;
    for (const FakeDevice::Request& request : device.requests) {
      std::string text = "unknown";
      for (const auto& [code, name] : names) {
        if (code == request.code) text = name;
      }
      if (request.code == kBindPipe) {
        text += " " + std::to_string(static_cast<uint8_t>(request.input.at(0)));
      }
      text += request.device == WriteHandle()  ? " writer"
              : request.device == ReadHandle() ? " reader"
                                               : " other";
      requests.push_back(text);
    }
    return requests;
  }
  std::vector<std::string> NewLines() const {
    std::vector<std::string> lines = report.Lines();
    lines.erase(lines.begin(), lines.begin() + static_cast<std::ptrdiff_t>(lines_before));
    return lines;
  }
  // With its device's path where the line has "~".
  static std::string Line(std::string text) {
    text.replace(text.find('~'), 1, kName);
    return text;
  }

  ReportCapture report;
  FakeDevice device;
  std::unique_ptr<TestUsbConnection> connection = std::make_unique<TestUsbConnection>(device);
  std::array<char, 16> buffer{};
  DWORD count = 99;
  size_t lines_before = 0;
};

#endif  // RCVLINK_TESTS_TRANSPORT_USB_CONNECTION_FIXTURE_H_
