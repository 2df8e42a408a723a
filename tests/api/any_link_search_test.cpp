// SearchReceiver on any link: first the sweep of the serial port, then USB.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "platform/api_types.h"
#include "platform/handle.h"
#include "platform/hresult.h"
#include "simulator/velmar/receiver.h"
#include "tests/support/manual_clock.h"
#include "tests/support/report_capture.h"
#include "tests/support/simulated_com_port.h"
#include "transport/device_calls.h"

using rcvlink::KernelHandle;
using rcvlink::SystemCallsOverride;

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;

constexpr size_t kTriesOfSweep = 18;
// The time-outs of a Velmar receiver and on USB.
constexpr DWORD kAnswerMs = 8000;
constexpr DWORD kPingMs = 8000;
const std::string kOpeningUsb = "CreateReceiverOnUSB - opening USB [COM7]";
const std::string kAskingUsb = "CreateReceiverOnUSB - looking for Quorin receiver [COM7]";

// A serial port named COM7. No USB device has that name.
class Port : public SimulatedComPort {
 public:
  using SimulatedComPort::SimulatedComPort;

  std::function<void(DWORD timeout_ms)> on_wait;  // runs first
  // What the USB driver answers to every request. Its own errors are negative, which makes them
  // failures of the open.
  DWORD usb_error = ERROR_INVALID_HANDLE;
  int usb_requests = 0;

  DWORD WaitForMultipleObjects(DWORD count, const HANDLE* handles, DWORD timeout_ms) override {
    if (on_wait) on_wait(timeout_ms);
    return SimulatedComPort::WaitForMultipleObjects(count, handles, timeout_ms);
  }
  BOOL DeviceIoControl(HANDLE, DWORD, void*, DWORD, void*, DWORD, DWORD*, OVERLAPPED*) override {
    ++usb_requests;
    SetLastError(usb_error);
    return FALSE;
  }
};

class AnyLinkSearch : public testing::Test {
 protected:
  AnyLinkSearch() {
    port_.state.BaudRate = 9600;
    port_.carries = [this](const DCB&) { return !silent_; };
  }
  ~AnyLinkSearch() override {
    if (handle_ && handle_ != Stale()) devapi::CloseReceiver(handle_);
  }

  long Search(EInstanceType type = eInstanceAny) {
    return devapi::SearchReceiver(
        name_.data(), type, eProtocolVelmar, abort_event_.get(), &handle_);
  }
  // A value that no search has set.
  void* Stale() { return &name_; }

  std::vector<std::string> LinesWith(const std::string& start) const {
    std::vector<std::string> lines = report_.Lines();
    std::erase_if(lines, [&](const std::string& line) { return !line.starts_with(start); });
    return lines;
  }
  // The lines of SearchReceiver itself, without its serial part.
  std::vector<std::string> OwnLines() const { return LinesWith("SearchReceiver - "); }

  std::wstring name_ = L"COM7";
  bool silent_ = true;
  sim::VelmarReceiver receiver_{{}, {}, nullptr};
  ManualClock clock_;
  ReportCapture report_;
  Port port_{receiver_, clock_};
  SystemCallsOverride calls_{port_};
  const KernelHandle abort_event_{CreateEventW(nullptr, TRUE, FALSE, nullptr)};
  void* handle_ = nullptr;
};

TEST_F(AnyLinkSearch, ASweepThatFindsNoReceiverIsNoFailure) {
  EXPECT_EQ(Search(), S_FALSE);
  EXPECT_EQ(handle_, nullptr);
  EXPECT_EQ(port_.openings, kTriesOfSweep);
  EXPECT_THAT(OwnLines(), IsEmpty());
  EXPECT_THAT(LinesWith("CreateReceiverOnUSB"), ElementsAre(kOpeningUsb, kAskingUsb));
}

TEST_F(AnyLinkSearch, AFailureOfUsbAloneIsReported) {
  port_.usb_error = 0xE0001009;
  EXPECT_EQ(Search(), static_cast<HRESULT>(0xE0001009));
  EXPECT_EQ(handle_, nullptr);
  EXPECT_EQ(port_.openings, kTriesOfSweep);
  EXPECT_THAT(OwnLines(),
              ElementsAre("SearchReceiver - CreateReceiverOnUSB failed[COM7] [0xE0001009]"));
}

TEST_F(AnyLinkSearch, AFailureOfTheSerialPortAloneIsReported) {
  port_.path = L"none";
  EXPECT_EQ(Search(), S_FALSE);
  EXPECT_THAT(OwnLines(),
              ElementsAre("SearchReceiver - SearchReceiverOnSerial failed[COM7] [0x80070002]"));
  EXPECT_THAT(LinesWith("CreateReceiverOnUSB"), ElementsAre(kOpeningUsb, kAskingUsb));
}

TEST_F(AnyLinkSearch, AReceiverOnTheSerialPortEndsIt) {
  silent_ = false;
  EXPECT_EQ(Search(), S_OK);
  EXPECT_NE(handle_, nullptr);
  EXPECT_EQ(port_.openings, 1u);
  EXPECT_EQ(port_.usb_requests, 0);
  EXPECT_THAT(OwnLines(), IsEmpty());
  EXPECT_THAT(LinesWith("CreateReceiverOnUSB"), IsEmpty());
}

// --- Aborts. USB is opened after an aborted sweep too, and not asked.

TEST_F(AnyLinkSearch, AnEventSignalledBeforeEndsBothAfterTheirOpening) {
  SetEvent(abort_event_.get());
  EXPECT_EQ(Search(), S_FALSE);
  EXPECT_EQ(handle_, nullptr);
  EXPECT_EQ(port_.openings, 1u);
  EXPECT_THAT(LinesWith("CreateReceiverOnSerial"),
              ElementsAre("CreateReceiverOnSerial - opening serial port [COM7]"));
  EXPECT_THAT(LinesWith("CreateReceiverOnUSB"), ElementsAre(kOpeningUsb));
  EXPECT_THAT(OwnLines(), IsEmpty());
}

TEST_F(AnyLinkSearch, AnEventInTheSilenceOfATryEndsTheSweepThere) {
  port_.on_wait = [&](DWORD) {
    if (port_.openings == 4) SetEvent(abort_event_.get());
  };
  EXPECT_EQ(Search(), S_FALSE);
  EXPECT_EQ(port_.openings, 4u);
  EXPECT_EQ(handle_, nullptr);
  EXPECT_THAT(LinesWith("SearchReceiverOnSerial - try RTS"), SizeIs(4));
  EXPECT_THAT(LinesWith("CreateReceiverOnUSB"), ElementsAre(kOpeningUsb));
  EXPECT_THAT(OwnLines(), IsEmpty());
  // The search waited for three time-outs, but not for the fourth.
  EXPECT_GE(clock_.now, 3 * kAnswerMs);
  EXPECT_LT(clock_.now, 4 * kAnswerMs);
}

TEST_F(AnyLinkSearch, AnEventInTheWaitForUsbEndsThatToo) {
  port_.path = L"none";
  // On USB the device has no time-out for a read.
  COMMTIMEOUTS patient{};
  patient.ReadTotalTimeoutConstant = 10 * kPingMs;
  port_.SetCommTimeouts(nullptr, &patient);
  port_.on_wait = [&](DWORD timeout_ms) {
    if (timeout_ms == kPingMs) SetEvent(abort_event_.get());
  };
  EXPECT_EQ(Search(), S_FALSE);
  EXPECT_EQ(handle_, nullptr);
  EXPECT_EQ(WaitForSingleObject(abort_event_.get(), 0), WAIT_OBJECT_0) << "no answer was awaited";
  EXPECT_LT(clock_.now, kPingMs) << "the silence was waited out";
  EXPECT_THAT(LinesWith("CreateReceiverOnUSB"), ElementsAre(kOpeningUsb, kAskingUsb));
}

// --- A handle that was not set to null before. The search takes it for a found receiver.

TEST_F(AnyLinkSearch, AStaleHandleEndsItAfterTheFirstTry) {
  handle_ = Stale();
  EXPECT_EQ(Search(), S_OK);
  EXPECT_EQ(handle_, Stale());
  EXPECT_EQ(port_.openings, 1u);
  EXPECT_THAT(LinesWith("SearchReceiverOnSerial"),
              ElementsAre("SearchReceiverOnSerial - try current port speed [COM7]",
                          "SearchReceiverOnSerial - try RTS control is handshake [COM7]"));
  EXPECT_THAT(OwnLines(), IsEmpty());
  EXPECT_THAT(LinesWith("CreateReceiverOnUSB"), IsEmpty());
  EXPECT_EQ(port_.usb_requests, 0);
}

TEST_F(AnyLinkSearch, AStaleHandleHidesAFailureOfTheSerialPort) {
  handle_ = Stale();
  port_.path = L"none";
  EXPECT_EQ(Search(), static_cast<HRESULT>(0x80070002));
  EXPECT_EQ(handle_, Stale());
  EXPECT_THAT(OwnLines(), IsEmpty());
  EXPECT_THAT(LinesWith("CreateReceiverOnUSB"), IsEmpty());
}

TEST_F(AnyLinkSearch, AStaleHandleGivesWayToAReceiver) {
  handle_ = Stale();
  silent_ = false;
  EXPECT_EQ(Search(), S_OK);
  EXPECT_NE(handle_, Stale());
  EXPECT_EQ(devapi::CloseReceiver(handle_), S_OK);
  handle_ = nullptr;
}

// A search of USB only does not read it.
TEST_F(AnyLinkSearch, AStaleHandleDoesNotAffectASearchOfUsb) {
  handle_ = Stale();
  EXPECT_EQ(Search(eInstanceUSB), S_FALSE);
  EXPECT_EQ(handle_, Stale());
  EXPECT_THAT(LinesWith("CreateReceiverOnUSB"), ElementsAre(kOpeningUsb, kAskingUsb));
}

// Both families are asked on one open port. An event during the first probe prevents the second.
TEST_F(AnyLinkSearch, AnEventInTheFirstProbeKeepsTheSecondFromAsking) {
  port_.on_wait = [this](DWORD timeout_ms) {
    if (timeout_ms == kPingMs) SetEvent(abort_event_.get());
  };
  DCB settings{};
  settings.BaudRate = CBR_9600;
  EXPECT_EQ(devapi::CreateReceiverOnSerial(
                name_.data(), eProtocolAny, &settings, abort_event_.get(), &handle_),
            S_FALSE);
  EXPECT_THAT(LinesWith("CreateReceiverOnSerial - looking for"),
              ElementsAre("CreateReceiverOnSerial - looking for Quorin receiver [COM7]"));
  EXPECT_EQ(port_.openings, 1u);
  EXPECT_LT(clock_.now, kPingMs) << "the silence was waited out";
}

}  // namespace
