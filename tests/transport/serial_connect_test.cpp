// The sweep of CSerialConnection::Connect, call by call.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "tests/support/fake_device.h"
#include "tests/support/report_capture.h"
#include "transport/serial_connection.h"

using rcvlink::KernelHandle;

namespace {

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;
using testing::SizeIs;

constexpr std::array<DWORD, 5> kSpeeds = {115200, 57600, 38400, 19200, 9600};

struct Mode {
  DWORD control;
  std::string name;
};
const std::array<Mode, 3> kModes = {{{0, "disable"}, {1, "enable"}, {2, "handshake"}}};
constexpr int kTries = 15;

// A state in which every field that a try sets has another value, and the other fields have values
// that can be recognised.
DCB StrangeState() {
  DCB state{};
  state.DCBlength = sizeof(DCB);
  state.BaudRate = 4800;
  state.fParity = 1;
  state.fOutxCtsFlow = 1;
  state.fOutxDsrFlow = 1;
  state.fDtrControl = DTR_CONTROL_HANDSHAKE;
  state.fDsrSensitivity = 1;
  state.fTXContinueOnXoff = 1;
  state.fOutX = 1;
  state.fInX = 1;
  state.fErrorChar = 1;
  state.fNull = 1;
  state.fRtsControl = RTS_CONTROL_TOGGLE;
  state.fAbortOnError = 1;
  state.XonLim = 11;
  state.XoffLim = 12;
  state.ByteSize = 7;
  state.Parity = EVENPARITY;
  state.StopBits = TWOSTOPBITS;
  state.XonChar = 1;
  state.XoffChar = 2;
  state.ErrorChar = 3;
  state.EofChar = 4;
  state.EvtChar = 5;
  return state;
}

// The block of one try, where the port has `state`.
DCB BlockOfTry(DCB state, int number) {
  state.BaudRate = kSpeeds.at(static_cast<size_t>(number) / kModes.size());
  const DWORD rts = static_cast<DWORD>(number) % kModes.size();
  state.fBinary = 1;
  state.fParity = 0;
  state.fOutxCtsFlow = rts == RTS_CONTROL_HANDSHAKE;
  state.fOutxDsrFlow = 0;
  state.fDtrControl = 0;
  state.fDsrSensitivity = 0;
  state.fRtsControl = rts & 3;
  state.ByteSize = 8;
  state.Parity = 0;
  state.StopBits = 0;
  return state;
}

bool SameBlock(const DCB& left, const DCB& right) {
  return std::memcmp(&left, &right, sizeof(DCB)) == 0;
}

class SerialConnect : public testing::Test {
 protected:
  SerialConnect() { current_ = this; }
  ~SerialConnect() override { current_ = nullptr; }

  // A sweep with a probe that answers as answer_at_ says.
  HRESULT Connect() { return connection.Connect(L"COM12", abort_event.get(), Probe); }
  DWORD Speed() {
    DWORD speed = 1;
    EXPECT_EQ(connection.GetSpeed(&speed), S_OK);
    return speed;
  }
  bool IsOpen() { return connection.GetReadHandle() != INVALID_HANDLE_VALUE; }

  static std::vector<std::string> CallsOfOpening() {
    return {
        "CreateFile", "SetCommMask", "SetupComm", "SetCommTimeouts", "ClearCommError", "PurgeComm"};
  }
  // The calls of a number of tries; the last one without its probes if it is not asked.
  static std::vector<std::string> CallsOf(int tries) {
    std::vector<std::string> calls;
    for (int i = 0; i < tries; ++i) {
      if (static_cast<size_t>(i) % kModes.size() == 0) {
        for (const std::string& call : CallsOfOpening()) calls.push_back(call);
      }
      calls.insert(calls.end(), {"GetCommState", "SetCommState", "probe"});
    }
    return calls;
  }
  // The lines of a number of tries without failures, from the first one on a closed port.
  static std::vector<std::string> LinesOf(int tries) {
    std::vector<std::string> lines = {"CSerialConnection::Connect"};
    for (int i = 0; i < tries; ++i) {
      const size_t mode = static_cast<size_t>(i) % kModes.size();
      if (mode == 0) {
        lines.push_back(i == 0 ? "CAbstractConnection::Cancel []"
                               : "CAbstractConnection::Cancel [COM12]");
        if (i != 0) lines.emplace_back("CAbstractConnection::Disconnect - disconnected [COM12]");
        lines.push_back("CSerialConnection::Connect - try speed [" +
                        std::to_string(kSpeeds.at(static_cast<size_t>(i) / kModes.size())) +
                        "] [COM12]");
        lines.emplace_back("CSerialConnection::Flush");
      }
      lines.push_back("CSerialConnection::Connect - try RTS control is " + kModes.at(mode).name +
                      " [COM12]");
    }
    return lines;
  }

  ReportCapture report;
  FakeDevice device;
  CSerialConnection connection{device};
  const KernelHandle abort_event{CreateEventW(nullptr, TRUE, FALSE, nullptr)};
  int answer_at = -1;  // the probe, from 0, that finds a receiver
  std::function<void(int number)> on_probe;
  int probes = 0;
  CIConnection* asked_on = nullptr;
  HANDLE asked_with = nullptr;

 private:
  static bool Probe(CIConnection* asked, HANDLE event) {
    SerialConnect& self = *current_;
    self.device.calls.emplace_back("probe");
    self.asked_on = asked;
    self.asked_with = event;
    const int number = self.probes++;
    if (self.on_probe) self.on_probe(number);
    return number == self.answer_at;
  }

  static inline SerialConnect* current_ = nullptr;
};

TEST_F(SerialConnect, MakesItsCallsInOrder) {
  EXPECT_EQ(Connect(), S_FALSE);
  EXPECT_EQ(probes, kTries);
  EXPECT_THAT(device.calls, ElementsAreArray(CallsOf(kTries)));
}

TEST_F(SerialConnect, TracesEachStepInOrder) {
  EXPECT_EQ(Connect(), S_FALSE);
  EXPECT_THAT(report.Lines(), ElementsAreArray(LinesOf(kTries)));
}

TEST_F(SerialConnect, OpensThePortAnewForEachSpeed) {
  EXPECT_EQ(Connect(), S_FALSE);
  ASSERT_THAT(device.openings, SizeIs(kSpeeds.size()));
  for (const FakeDevice::Opening& opening : device.openings) {
    EXPECT_EQ(opening.path, L"\\\\.\\COM12");
    EXPECT_EQ(opening.access, 0xC0000000u);
    EXPECT_EQ(opening.share, 0u);
    EXPECT_EQ(opening.flags, 0x40000000u);
  }
}

TEST_F(SerialConnect, SetsQueuesMaskAndTimeOutsOfEachOpening) {
  device.on_open = [&] {
    device.event_mask = 0;
    device.input_queue = 0;
    device.output_queue = 0;
    device.timeouts = {};
    device.purge_flags = 0;
  };
  on_probe = [&](int) {
    EXPECT_EQ(device.event_mask, 129u);
    EXPECT_EQ(device.input_queue, 16384u);
    EXPECT_EQ(device.output_queue, 1024u);
    EXPECT_EQ(device.timeouts.ReadIntervalTimeout, 1000u);
    EXPECT_EQ(device.timeouts.ReadTotalTimeoutMultiplier, 200u);
    EXPECT_EQ(device.timeouts.ReadTotalTimeoutConstant, 100u);
    EXPECT_EQ(device.timeouts.WriteTotalTimeoutMultiplier, 200u);
    EXPECT_EQ(device.timeouts.WriteTotalTimeoutConstant, 100u);
    EXPECT_EQ(device.purge_flags, 15u);
  };
  EXPECT_EQ(Connect(), S_FALSE);
  EXPECT_EQ(probes, kTries);
}

TEST_F(SerialConnect, EachTryChangesItsOwnFieldsOfThePortsState) {
  device.state = StrangeState();
  EXPECT_EQ(Connect(), S_FALSE);
  ASSERT_THAT(device.set_states, SizeIs(kTries));
  for (int i = 0; i < kTries; ++i) {
    const DCB& set = device.set_states[static_cast<size_t>(i)];
    EXPECT_TRUE(SameBlock(set, BlockOfTry(StrangeState(), i)))
        << i << ": " << set.BaudRate << ", RTS " << set.fRtsControl;
  }
}

TEST_F(SerialConnect, AsksTheProbeOnItselfWithTheEvent) {
  answer_at = 0;
  EXPECT_EQ(Connect(), S_OK);
  EXPECT_EQ(asked_on, &connection);
  EXPECT_EQ(asked_with, abort_event.get());
}

TEST_F(SerialConnect, ANullProbeIsTheFirstTry) {
  EXPECT_EQ(connection.Connect(L"COM12", abort_event.get(), nullptr), S_OK);
  std::vector<std::string> calls = CallsOf(1);
  calls.pop_back();
  EXPECT_THAT(device.calls, ElementsAreArray(calls));
  std::vector<std::string> lines = LinesOf(1);
  lines.emplace_back("CSerialConnection::Connect - OK [COM12]");
  EXPECT_THAT(report.Lines(), ElementsAreArray(lines));
  EXPECT_TRUE(IsOpen());
}

// A null event never ends it.
TEST_F(SerialConnect, NeedsNoEvent) {
  EXPECT_EQ(connection.Connect(L"COM12", nullptr, nullptr), S_OK);
  EXPECT_TRUE(IsOpen());
}

TEST_F(SerialConnect, TracesTheCallBeforeItRefusesANullName) {
  EXPECT_EQ(connection.Connect(nullptr, nullptr, nullptr), E_INVALIDARG);
  EXPECT_THAT(report.Lines(), ElementsAre("CSerialConnection::Connect"));
  EXPECT_THAT(device.calls, IsEmpty());
}

// --- A receiver at each of the tries

class SerialConnectAtTry : public SerialConnect, public testing::WithParamInterface<int> {};

TEST_P(SerialConnectAtTry, EndsThere) {
  answer_at = GetParam();
  EXPECT_EQ(Connect(), S_OK);
  EXPECT_EQ(probes, GetParam() + 1);
  EXPECT_THAT(device.calls, ElementsAreArray(CallsOf(GetParam() + 1)));
  std::vector<std::string> lines = LinesOf(GetParam() + 1);
  lines.emplace_back("CSerialConnection::Connect - OK [COM12]");
  EXPECT_THAT(report.Lines(), ElementsAreArray(lines));
  EXPECT_TRUE(IsOpen());
}

TEST_P(SerialConnectAtTry, KeepsTheBlockForLaterChangesOfSpeed) {
  device.state = StrangeState();
  answer_at = GetParam();
  ASSERT_EQ(Connect(), S_OK);
  DCB expected = BlockOfTry(StrangeState(), GetParam());
  EXPECT_EQ(Speed(), expected.BaudRate);
  EXPECT_EQ(connection.SetSpeed(expected.BaudRate), S_FALSE);
  EXPECT_THAT(device.set_states, SizeIs(static_cast<size_t>(GetParam()) + 1));

  // The port's own state is no longer used.
  device.state = {};
  EXPECT_EQ(connection.SetSpeed(4800), S_OK);
  expected.BaudRate = 4800;
  EXPECT_TRUE(SameBlock(device.set_states.back(), expected));
  EXPECT_EQ(Speed(), 4800u);
}

INSTANTIATE_TEST_SUITE_P(All, SerialConnectAtTry, testing::Range(0, kTries));

TEST_F(SerialConnect, WithoutAReceiverThePortStaysOpenAndTheSpeedAsItWas) {
  const DCB settings = BlockOfTry({}, 3);
  ASSERT_EQ(connection.Open(L"COM12", &settings), S_OK);
  ASSERT_EQ(Speed(), 57600u);
  EXPECT_EQ(Connect(), S_FALSE);
  EXPECT_TRUE(IsOpen());
  EXPECT_EQ(device.state.BaudRate, 9600u);
  EXPECT_EQ(device.state.fRtsControl, 2u);
  EXPECT_EQ(Speed(), 57600u);
  EXPECT_FALSE(report.Has("CSerialConnection::Connect - OK [COM12]"));
}

TEST_F(SerialConnect, ClosesFirstWhatWasOpen) {
  const DCB settings = BlockOfTry({}, 0);
  ASSERT_EQ(connection.Open(L"COM7", &settings), S_OK);
  const HANDLE event = connection.GetAbortEvent();
  const size_t before = report.Lines().size();
  answer_at = 0;
  EXPECT_EQ(Connect(), S_OK);
  std::vector<std::string> lines = report.Lines();
  lines.erase(lines.begin(), lines.begin() + static_cast<std::ptrdiff_t>(before));
  ASSERT_GE(lines.size(), 3u);
  lines.resize(3);
  EXPECT_THAT(lines,
              ElementsAre("CSerialConnection::Connect",
                          "CAbstractConnection::Cancel [COM7]",
                          "CAbstractConnection::Disconnect - disconnected [COM7]"));
  EXPECT_EQ(connection.GetAbortEvent(), event) << "the events outlive it";
}

TEST_F(SerialConnect, MakesTheEventsForTransfers) {
  EXPECT_EQ(connection.GetAbortEvent(), nullptr);
  answer_at = 0;
  ASSERT_EQ(Connect(), S_OK);
  EXPECT_NE(connection.GetAbortEvent(), nullptr);
  DWORD count = 0;
  char byte = 0;
  EXPECT_EQ(connection.Read(&byte, 1, &count, 0), S_OK);
  EXPECT_EQ(connection.Write(&byte, 1, 0), S_OK);
}

// --- Aborts

TEST_F(SerialConnect, AnEventSignalledBeforeEndsItAtTheFirstTry) {
  SetEvent(abort_event.get());
  EXPECT_EQ(Connect(), S_FALSE);
  std::vector<std::string> calls = CallsOf(1);
  calls.pop_back();
  EXPECT_THAT(device.calls, ElementsAreArray(calls));
  EXPECT_THAT(report.Lines(), ElementsAreArray(LinesOf(1)));
}

// The event is checked after a try has set the port, so the next try sets the port but does not
// ask.
class SerialConnectAbortedAtTry : public SerialConnect, public testing::WithParamInterface<int> {};

TEST_P(SerialConnectAbortedAtTry, EndsAtTheNext) {
  on_probe = [&](int number) {
    if (number == GetParam()) SetEvent(abort_event.get());
  };
  EXPECT_EQ(Connect(), S_FALSE);
  EXPECT_EQ(probes, GetParam() + 1);
  std::vector<std::string> calls = CallsOf(GetParam() + 2);
  calls.pop_back();
  EXPECT_THAT(device.calls, ElementsAreArray(calls));
  EXPECT_THAT(report.Lines(), ElementsAreArray(LinesOf(GetParam() + 2)));
  EXPECT_EQ(Speed(), 0u) << "no try was kept";
}

INSTANTIATE_TEST_SUITE_P(All, SerialConnectAbortedAtTry, testing::Range(0, kTries - 1));

TEST_F(SerialConnect, AReceiverThatAnsweredHasPriorityOverTheEvent) {
  answer_at = 4;
  on_probe = [&](int number) {
    if (number == 4) SetEvent(abort_event.get());
  };
  EXPECT_EQ(Connect(), S_OK);
  EXPECT_EQ(Speed(), 57600u);
}

// --- Failures

TEST_F(SerialConnect, APortThatCannotBeOpenedEndsItWithoutALine) {
  device.open_error = ERROR_FILE_NOT_FOUND;
  EXPECT_EQ(Connect(), static_cast<HRESULT>(0x80070002));
  EXPECT_THAT(device.calls, ElementsAre("CreateFile"));
  EXPECT_THAT(report.Lines(),
              ElementsAre("CSerialConnection::Connect", "CAbstractConnection::Cancel []"));
  EXPECT_FALSE(IsOpen());
}

class SerialConnectReopening : public SerialConnect, public testing::WithParamInterface<int> {};

TEST_P(SerialConnectReopening, ThatFailsEndsItWithThePortClosed) {
  for (int i = 0; i < GetParam(); ++i) device.open_errors.push_back(ERROR_SUCCESS);
  device.open_errors.push_back(ERROR_ACCESS_DENIED);
  EXPECT_EQ(Connect(), static_cast<HRESULT>(0x80070005));
  const int tries = GetParam() * static_cast<int>(kModes.size());
  EXPECT_EQ(probes, tries);
  std::vector<std::string> calls = CallsOf(tries);
  calls.emplace_back("CreateFile");
  EXPECT_THAT(device.calls, ElementsAreArray(calls));
  std::vector<std::string> lines = LinesOf(tries);
  lines.insert(lines.end(),
               {"CAbstractConnection::Cancel [COM12]",
                "CAbstractConnection::Disconnect - disconnected [COM12]"});
  EXPECT_THAT(report.Lines(), ElementsAreArray(lines));
  EXPECT_FALSE(IsOpen());
  EXPECT_EQ(Speed(), 0u);
}

INSTANTIATE_TEST_SUITE_P(All, SerialConnectReopening, testing::Range(1, 5));

// Unlike Open, it does not trace a setting that fails.
class SerialConnectWhereOneFails : public SerialConnect,
                                   public testing::WithParamInterface<const char*> {};

TEST_P(SerialConnectWhereOneFails, GoesOnWithoutALine) {
  device.failing_call = GetParam();
  EXPECT_EQ(Connect(), S_FALSE);
  EXPECT_THAT(device.calls, ElementsAreArray(CallsOf(kTries)));
  EXPECT_THAT(report.Lines(), ElementsAreArray(LinesOf(kTries)));
}

TEST_P(SerialConnectWhereOneFails, StillFindsTheReceiver) {
  device.failing_call = GetParam();
  answer_at = 7;
  EXPECT_EQ(Connect(), S_OK);
  EXPECT_EQ(Speed(), 38400u);
}

INSTANTIATE_TEST_SUITE_P(
    Settings,
    SerialConnectWhereOneFails,
    testing::Values("SetCommMask", "SetupComm", "SetCommTimeouts", "GetCommState", "SetCommState"),
    [](const auto& call) { return std::string(call.param); });

// The fields that a try does not set are then zero.
TEST_F(SerialConnect, AStateThatCannotBeReadIsTakenAsEmpty) {
  device.state = StrangeState();
  device.failing_call = "GetCommState";
  EXPECT_EQ(Connect(), S_FALSE);
  DCB empty{};
  empty.DCBlength = sizeof(DCB);
  ASSERT_THAT(device.set_states, SizeIs(kTries));
  for (int i = 0; i < kTries; ++i) {
    EXPECT_TRUE(SameBlock(device.set_states[static_cast<size_t>(i)], BlockOfTry(empty, i))) << i;
  }
}

class SerialConnectWhereTheFlushFails : public SerialConnect,
                                        public testing::WithParamInterface<const char*> {};

TEST_P(SerialConnectWhereTheFlushFails, TracesItOncePerOpeningAndGoesOn) {
  device.failing_call = GetParam();
  device.failure = ERROR_GEN_FAILURE;
  EXPECT_EQ(Connect(), S_FALSE);
  EXPECT_THAT(device.calls, ElementsAreArray(CallsOf(kTries)));
  std::vector<std::string> expected;
  for (const std::string& line : LinesOf(kTries)) {
    expected.push_back(line);
    if (line != "CSerialConnection::Flush") continue;
    expected.push_back("CSerialConnection::Flush - " + std::string(GetParam()) +
                       " failed [31] [COM12]");
  }
  EXPECT_THAT(report.Lines(), ElementsAreArray(expected));
}

INSTANTIATE_TEST_SUITE_P(Calls,
                         SerialConnectWhereTheFlushFails,
                         testing::Values("ClearCommError", "PurgeComm"),
                         [](const auto& call) { return std::string(call.param); });

}  // namespace
