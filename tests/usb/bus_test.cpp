// The bus driver, as the simulator of a device uses it, and with wrong requests.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

#include "simulator/ports/driver_service.h"
#include "simulator/ports/usb.h"
#include "simulator/usb/driver/bus.h"
#include "tests/usb/usb_host.h"

namespace {

using usb_bus::Action;
using usb_bus::ActionKind;
using usb_bus::Reads;
using usb_bus::Request;
using usb_bus::RequestKind;
using usb_host::Bytes;
using usb_host::File;
using usb_host::Pending;
using usb_host::Result;

constexpr DWORD kDone = ERROR_SUCCESS;
constexpr DWORD kInvalid = ERROR_INVALID_PARAMETER;
constexpr DWORD kWrongState = ERROR_BAD_COMMAND;
constexpr DWORD kGone = ERROR_DEVICE_NOT_CONNECTED;
constexpr DWORD kUnknownCode = 0x00223000;
// A code of the host's that returns bytes through an MDL, and one through a buffer.
constexpr DWORD kDirectCode = 0x80942006;
constexpr DWORD kBufferedCode = 0x80942024;
// The driver must not write its output.
constexpr DWORD kInDirectCode = 0x80942005;
constexpr uint32_t kRefused = 0xC0000001;

std::wstring DeviceName() {
  static int count = 0;
  return L"rcvlink-bus-test-" + std::to_wstring(GetCurrentProcessId()) + L"-" +
         std::to_wstring(++count);
}

Bytes BytesOf(const std::wstring& text) {
  Bytes bytes(text.size() * sizeof(wchar_t));
  std::memcpy(bytes.data(), text.data(), bytes.size());
  return bytes;
}

Bytes BytesOf(const std::string& text) { return Bytes(text.begin(), text.end()); }

Bytes Actions(std::vector<std::pair<Action, std::string>> actions) {
  Bytes all;
  for (auto& [action, text] : actions) {
    action.length = static_cast<uint32_t>(text.size());
    Bytes header(sizeof(action));
    std::memcpy(header.data(), &action, sizeof(action));
    all.insert(all.end(), header.begin(), header.end());
    all.insert(all.end(), text.begin(), text.end());
    all.resize(usb_bus::Aligned(all.size()));
  }
  return all;
}

Action Answer(uint64_t id, uint32_t status, size_t count = 0, Reads reads = Reads::kUnchanged) {
  return {id, ActionKind::kAnswer, status, static_cast<uint32_t>(count), reads, 0, 0};
}

Action Send() { return {0, ActionKind::kSend, 0, 0, Reads::kUnchanged, 0, 0}; }

struct Seen {
  Request request;
  Bytes bytes;
};

std::vector<Seen> Requests(const Result& result) {
  EXPECT_EQ(result.error, kDone);
  std::vector<Seen> all;
  for (size_t at = 0; at + sizeof(Request) <= result.bytes.size();) {
    Seen seen;
    std::memcpy(&seen.request, result.bytes.data() + at, sizeof(Request));
    at += sizeof(Request);
    const auto begin = result.bytes.begin() + static_cast<std::ptrdiff_t>(at);
    seen.bytes.assign(begin, begin + static_cast<std::ptrdiff_t>(seen.request.length));
    at = usb_bus::Aligned(at + seen.request.length);
    all.push_back(seen);
  }
  return all;
}

class UsbBus : public testing::Test {
 protected:
  static void SetUpTestSuite() { sim::OpenUsbBus(); }

  static File OpenBus() { return File(usb_bus::kBusPath, GENERIC_READ | GENERIC_WRITE); }

  void PlugIn() { ASSERT_EQ(bus.Control(usb_bus::kPlugIn, BytesOf(name)).error, kDone); }
  File OpenDevice() const { return File(path, GENERIC_READ | GENERIC_WRITE); }
  DWORD Act(const Bytes& actions) const { return bus.Control(usb_bus::kAct, actions).error; }
  Pending StartWait(const Bytes& actions = {}) const {
    return bus.StartControl(usb_bus::kActAndWait, actions, usb_bus::kRequestBufferSize);
  }
  // The one request that has arrived, or does so soon.
  Seen Next() const {
    const std::vector<Seen> all = Requests(StartWait().Finish());
    EXPECT_EQ(all.size(), 1U);
    return all.empty() ? Seen{} : all.front();
  }

  const std::wstring name = DeviceName();
  const std::wstring path = L"\\\\.\\" + name;
  File bus = OpenBus();
};

TEST_F(UsbBus, ReportsRequests) {
  PlugIn();
  const File host = OpenDevice();
  Pending control = host.StartControl(kBufferedCode, {1, 2, 3}, 20);
  Pending read = host.StartRead(7);
  Pending write = host.StartWrite("four");

  const std::vector<Seen> seen = Requests(StartWait().Finish());

  ASSERT_EQ(seen.size(), 3U);
  EXPECT_EQ(seen[0].request.kind, RequestKind::kControl);
  EXPECT_EQ(seen[0].request.control_code, kBufferedCode);
  EXPECT_EQ(seen[0].request.room, 20U);
  EXPECT_EQ(seen[0].bytes, (Bytes{1, 2, 3}));
  EXPECT_EQ(seen[1].request.kind, RequestKind::kRead);
  EXPECT_EQ(seen[1].request.room, 7U);
  EXPECT_TRUE(seen[1].bytes.empty());
  EXPECT_EQ(seen[2].request.kind, RequestKind::kWrite);
  EXPECT_EQ(seen[2].request.room, 0U);
  EXPECT_EQ(seen[2].bytes, BytesOf("four"));
  EXPECT_EQ(seen[0].request.handle, seen[2].request.handle);
}

TEST_F(UsbBus, CarriesAnswers) {
  PlugIn();
  const File host = OpenDevice();
  Pending buffered = host.StartControl(kBufferedCode, {1}, 4);
  const uint64_t buffered_id = Next().request.id;
  Pending direct = host.StartControl(kDirectCode, {1}, 4);
  const uint64_t direct_id = Next().request.id;
  Pending read = host.StartRead(4);
  const uint64_t read_id = Next().request.id;
  Pending write = host.StartWrite("four");
  const uint64_t write_id = Next().request.id;

  EXPECT_EQ(Act(Actions({{Answer(buffered_id, 0, 3), "abc"},
                         {Answer(direct_id, 0, 4), "defg"},
                         {Answer(read_id, kRefused), ""},
                         {Answer(write_id, 0, 2), ""}})),
            kDone);

  EXPECT_EQ(buffered.Finish().text(), "abc");
  EXPECT_EQ(direct.Finish().text(), "defg");
  EXPECT_EQ(read.Finish().error, DWORD{ERROR_GEN_FAILURE});
  EXPECT_EQ(write.Finish().text(), "fo");
}

TEST_F(UsbBus, RefusesAnswersThatDoNotFit) {
  PlugIn();
  const File host = OpenDevice();
  Pending control = host.StartControl(kDirectCode, {1}, 4);
  const uint64_t control_id = Next().request.id;
  Pending input = host.StartControl(kInDirectCode, {1}, 4);
  const Request input_request = Next().request;
  Pending write = host.StartWrite("four");
  const uint64_t write_id = Next().request.id;
  constexpr uint32_t kPending = 0x103;

  EXPECT_EQ(input_request.room, 0U);
  for (const auto& [action, text] :
       std::vector<std::pair<Action, std::string>>{{Answer(control_id, 0, 5), "abcde"},
                                                   {Answer(control_id, 0, 4), "abc"},
                                                   {Answer(control_id, 0, 2), "abc"},
                                                   {Answer(control_id, kRefused), "abc"},
                                                   {Answer(control_id, kPending), ""},
                                                   {Answer(input_request.id, 0, 1), "a"},
                                                   {Answer(write_id, 0, 5), ""},
                                                   {Answer(write_id, 0, 1), "a"},
                                                   {Send(), ""},
                                                   {{0, ActionKind{7}, 0, 0, {}, 0, 0}, "a"}}) {
    EXPECT_EQ(Act(Actions({{action, text}})), kInvalid) << action.id << " " << text;
  }
  EXPECT_FALSE(control.Ended() || input.Ended() || write.Ended());
}

TEST_F(UsbBus, RefusesActionsThatAreCutOff) {
  PlugIn();
  const Bytes whole = Actions({{Send(), "12345678"}});
  for (const size_t length : {size_t{1}, sizeof(Action) - 1, sizeof(Action), whole.size() - 1}) {
    const auto end = whole.begin() + static_cast<std::ptrdiff_t>(length);
    EXPECT_EQ(Act(Bytes(whole.begin(), end)), kInvalid) << length;
  }
  Bytes endless = whole;
  std::memset(endless.data() + offsetof(Action, length), 0xFF, sizeof(Action::length));
  EXPECT_EQ(Act(endless), kInvalid);
  EXPECT_EQ(Act(whole), kDone);
}

TEST_F(UsbBus, IgnoresAnswersToCancelledRequests) {
  PlugIn();
  const File host = OpenDevice();
  Pending read = host.StartRead(4);
  const uint64_t id = Next().request.id;
  ASSERT_TRUE(CancelIo(host.get()));
  EXPECT_EQ(read.Finish().error, DWORD{ERROR_OPERATION_ABORTED});
  EXPECT_EQ(Act(Actions({{Answer(id, 0, 4), "abcd"}, {Answer(12345, 0), ""}})), kDone);
}

TEST_F(UsbBus, DoesNotReportRequestsThatWereCancelledBefore) {
  PlugIn();
  const File host = OpenDevice();
  Pending read = host.StartRead(4);
  ASSERT_TRUE(CancelIo(host.get()));
  EXPECT_EQ(read.Finish().error, DWORD{ERROR_OPERATION_ABORTED});
  Pending write = host.StartWrite("x");
  EXPECT_EQ(Next().request.kind, RequestKind::kWrite);
}

TEST_F(UsbBus, ReportsAHandleThatIsClosed) {
  PlugIn();
  File host = OpenDevice();
  Pending write = host.StartWrite("x");
  const Request request = Next().request;
  EXPECT_EQ(Act(Actions({{Answer(request.id, 0, 1), ""}})), kDone);
  write.Finish();

  host.Close();

  const Request closed = Next().request;
  EXPECT_EQ(closed.kind, RequestKind::kClosed);
  EXPECT_EQ(closed.handle, request.handle);
}

TEST_F(UsbBus, EndsRequestsOfAHandleThatIsClosed) {
  PlugIn();
  File host = OpenDevice();
  Pending untold = host.StartRead(4);
  host.Close();
  EXPECT_EQ(Next().request.kind, RequestKind::kClosed);
  EXPECT_TRUE(untold.Ended());
}

// Reads get transfers only while the program allows it.
TEST_F(UsbBus, SendsToReads) {
  PlugIn();
  const File host = OpenDevice();
  Pending bind = host.StartControl(kBufferedCode);
  const uint64_t bind_id = Next().request.id;
  EXPECT_EQ(Act(Actions({{Send(), "early"},
                         {Answer(bind_id, 0, 0, Reads::kGetTransfers), ""},
                         {Send(), "late"}})),
            kDone);
  EXPECT_EQ(host.Read(10).text(), "early");
  EXPECT_EQ(host.Read(10).text(), "late");

  Pending waits = host.StartRead(10);
  Pending unbind = host.StartControl(kBufferedCode);
  const uint64_t unbind_id = Next().request.id;
  EXPECT_EQ(Act(Actions({{Answer(unbind_id, 0, 0, Reads::kAreRequests), ""}})), kDone);
  EXPECT_EQ(waits.Finish().error, DWORD{ERROR_OPERATION_ABORTED});
  Pending request = host.StartRead(10);
  EXPECT_EQ(Next().request.kind, RequestKind::kRead);
}

TEST_F(UsbBus, AllowsOneWaitingCall) {
  PlugIn();
  Pending first = StartWait();
  EXPECT_EQ(StartWait().Finish().error, kWrongState);
  EXPECT_FALSE(first.Ended());
  ASSERT_TRUE(CancelIo(bus.get()));
  EXPECT_EQ(first.Finish().error, DWORD{ERROR_OPERATION_ABORTED});
  Pending again = StartWait();
  EXPECT_FALSE(again.Ended());
}

TEST_F(UsbBus, NeedsRoomForTheLargestRequest) {
  PlugIn();
  EXPECT_EQ(bus.Control(usb_bus::kActAndWait, {}, usb_bus::kRequestBufferSize - 1).error,
            DWORD{ERROR_INSUFFICIENT_BUFFER});
}

TEST_F(UsbBus, AcceptsOnlyNames) {
  const Bytes good = BytesOf(name);
  const Bytes odd(good.begin(), good.end() - 1);
  EXPECT_EQ(bus.Control(usb_bus::kPlugIn, odd).error, kInvalid);
  for (const std::wstring& wrong : {std::wstring(),
                                    name + L'\\',
                                    name + L' ',
                                    name + L'\0',
                                    L'\u00E4' + name,
                                    std::wstring(usb_bus::kMaxNameLength + 1, L'x')}) {
    EXPECT_EQ(bus.Control(usb_bus::kPlugIn, BytesOf(wrong)).error, kInvalid);
  }
  PlugIn();
}

TEST_F(UsbBus, AcceptsTheLongestName) {
  const std::wstring longest = name + std::wstring(usb_bus::kMaxNameLength - name.size(), L'x');
  EXPECT_EQ(bus.Control(usb_bus::kPlugIn, BytesOf(longest)).error, kDone);
  EXPECT_TRUE(File(L"\\\\.\\" + longest, GENERIC_READ).open());
}

TEST_F(UsbBus, HasEveryNameOnce) {
  PlugIn();
  const File other = OpenBus();
  EXPECT_NE(other.Control(usb_bus::kPlugIn, BytesOf(name)).error, kDone);
  EXPECT_EQ(other.Control(usb_bus::kPlugIn, BytesOf(DeviceName())).error, kDone);
  EXPECT_THROW(sim::UsbPort{name}, std::system_error);
}

TEST_F(UsbBus, PlugsInOneDevicePerHandle) {
  PlugIn();
  EXPECT_EQ(bus.Control(usb_bus::kPlugIn, BytesOf(DeviceName())).error, kWrongState);
}

TEST_F(UsbBus, FailsWithoutADevice) {
  EXPECT_EQ(Act({}), kWrongState);
  EXPECT_EQ(StartWait().Finish().error, kWrongState);
  EXPECT_EQ(bus.Control(usb_bus::kUnplug).error, kWrongState);
  EXPECT_EQ(bus.Control(kUnknownCode).error, DWORD{ERROR_INVALID_FUNCTION});
  EXPECT_EQ(bus.Read(1).error, DWORD{ERROR_INVALID_FUNCTION});
  EXPECT_EQ(bus.Write("x").error, DWORD{ERROR_INVALID_FUNCTION});
}

TEST_F(UsbBus, EndsEverythingWhenTheDeviceIsUnplugged) {
  PlugIn();
  const File host = OpenDevice();
  Pending told = host.StartRead(4);
  Next();
  Pending untold = host.StartRead(4);

  EXPECT_EQ(bus.Control(usb_bus::kUnplug).error, kDone);

  EXPECT_EQ(told.Finish().error, kGone);
  EXPECT_EQ(untold.Finish().error, kGone);
  EXPECT_EQ(host.Write("x").error, kGone);
  EXPECT_EQ(bus.Control(usb_bus::kUnplug).error, kWrongState);
  EXPECT_FALSE(OpenDevice().open());
}

TEST_F(UsbBus, EndsTheWaitWhenTheDeviceIsUnplugged) {
  PlugIn();
  Pending waiting = StartWait();
  EXPECT_EQ(bus.Control(usb_bus::kUnplug).error, kDone);
  EXPECT_EQ(waiting.Finish().error, kGone);
}

// The driver reuses its device objects, but not while a handle of an unplugged device is open.
TEST_F(UsbBus, KeepsOldHandlesFromNewDevices) {
  constexpr int kNewDevices = 50;
  PlugIn();
  const File old = OpenDevice();
  EXPECT_EQ(bus.Control(usb_bus::kUnplug).error, kDone);
  std::vector<File> buses;
  for (int i = 0; i < kNewDevices; ++i) {
    buses.push_back(OpenBus());
    ASSERT_EQ(buses.back().Control(usb_bus::kPlugIn, BytesOf(DeviceName())).error, kDone);
  }
  EXPECT_EQ(old.Write("x").error, kGone);
}

TEST_F(UsbBus, UnplugsWhenItsHandleIsClosed) {
  PlugIn();
  const File host = OpenDevice();
  Pending read = host.StartRead(4);
  bus.Close();
  EXPECT_EQ(read.Finish().error, kGone);
  EXPECT_FALSE(OpenDevice().open());
}

}  // namespace
