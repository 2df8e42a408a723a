#include "transport/serial_connection.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "platform/hresult.h"
#include "tests/support/fake_device.h"
#include "tests/support/manual_clock.h"
#include "tests/support/report_capture.h"

using rcvlink::HResultFromError;
using rcvlink::KernelHandle;

namespace {

using testing::ElementsAre;

DCB HostSettings(DWORD speed) {
  DCB settings{};
  settings.DCBlength = sizeof(DCB);
  settings.BaudRate = speed;
  settings.fBinary = 1;
  settings.fRtsControl = RTS_CONTROL_HANDSHAKE;
  settings.ByteSize = 8;
  return settings;
}

class SerialConnection : public testing::Test {
 protected:
  HRESULT Open(DWORD speed) {
    const DCB settings = HostSettings(speed);
    return connection.Open(L"COM12", &settings);
  }
  int Count(const std::string& call) const {
    return static_cast<int>(std::ranges::count(device.calls, call));
  }

  ReportCapture report;
  FakeDevice device;
  CSerialConnection connection{device};
};

TEST_F(SerialConnection, OpensTheDeviceExclusivelyForOverlappedTransfers) {
  EXPECT_EQ(Open(9600), S_OK);
  EXPECT_EQ(device.opened_path, L"\\\\.\\COM12");
  EXPECT_EQ(device.opened_access, 0xC0000000u);
  EXPECT_EQ(device.opened_share, 0u);
  EXPECT_EQ(device.opened_flags, 0x40000000u);
  EXPECT_TRUE(report.Has("CSerialConnection::Open - OK [COM12]"));
}

TEST_F(SerialConnection, OpensInOrder) {
  Open(9600);
  EXPECT_THAT(device.calls,
              ElementsAre("CreateFile",
                          "SetCommMask",
                          "SetupComm",
                          "ClearCommError",
                          "PurgeComm",
                          "GetCommState",
                          "SetCommState",
                          "SetCommTimeouts"));
}

TEST_F(SerialConnection, SetsQueuesMaskAndTimeOuts) {
  Open(9600);
  EXPECT_EQ(device.event_mask, 129u);
  EXPECT_EQ(device.input_queue, 16384u);
  EXPECT_EQ(device.output_queue, 1024u);
  EXPECT_EQ(device.timeouts.ReadIntervalTimeout, 1000u);
  EXPECT_EQ(device.timeouts.ReadTotalTimeoutMultiplier, 200u);
  EXPECT_EQ(device.timeouts.ReadTotalTimeoutConstant, 100u);
  EXPECT_EQ(device.timeouts.WriteTotalTimeoutMultiplier, 200u);
  EXPECT_EQ(device.timeouts.WriteTotalTimeoutConstant, 100u);
  EXPECT_EQ(device.purge_flags, 15u);
}

TEST_F(SerialConnection, MissingPortIsReported) {
  device.open_error = ERROR_FILE_NOT_FOUND;
  EXPECT_EQ(Open(9600), static_cast<HRESULT>(0x80070002));
  EXPECT_TRUE(report.Has("CSerialConnection::Create - CreateFile failed [2] [COM12]"));
  EXPECT_FALSE(report.Has("CSerialConnection::Open - OK [COM12]"));
}

TEST_F(SerialConnection, NullNameIsRefused) {
  const DCB settings = HostSettings(9600);
  EXPECT_EQ(connection.Open(nullptr, &settings), E_INVALIDARG);
  EXPECT_EQ(connection.Connect(nullptr, nullptr, nullptr), E_INVALIDARG);
  EXPECT_TRUE(device.calls.empty());
}

TEST_F(SerialConnection, FailingSettingsAreReportedAndIgnored) {
  for (const char* call :
       {"SetCommMask", "SetupComm", "GetCommState", "SetCommState", "SetCommTimeouts"}) {
    device.failing_call = call;
    EXPECT_EQ(Open(9600), S_OK) << call;
    EXPECT_TRUE(
        report.Has(std::string("CSerialConnection::Create - ") + call + " failed [1] [COM12]"))
        << call;
  }
}

TEST_F(SerialConnection, AStateThatCannotBeReadHasItsLength) {
  device.failing_call = "GetCommState";
  Open(9600);
  EXPECT_EQ(device.set_states.back().DCBlength, sizeof(DCB));
}

TEST_F(SerialConnection, SpeedZeroKeepsThePorts) {
  device.state.BaudRate = 57600;
  Open(0);
  EXPECT_EQ(device.set_states.back().BaudRate, 57600u);
  DWORD speed = 0;
  EXPECT_EQ(connection.GetSpeed(&speed), S_OK);
  EXPECT_EQ(speed, 57600u);
}

TEST_F(SerialConnection, TakesTheHostsSettingsOverThePorts) {
  DCB settings{};
  settings.BaudRate = 19200;
  settings.fBinary = 1;
  settings.fParity = 1;
  settings.fOutxCtsFlow = 1;
  settings.fOutxDsrFlow = 1;
  settings.fDtrControl = DTR_CONTROL_HANDSHAKE;
  settings.fDsrSensitivity = 1;
  settings.fRtsControl = RTS_CONTROL_TOGGLE;
  settings.fAbortOnError = 1;
  settings.ByteSize = 7;
  settings.Parity = EVENPARITY;
  settings.StopBits = TWOSTOPBITS;
  connection.Open(L"COM12", &settings);
  const DCB& set = device.set_states.back();
  EXPECT_EQ(set.DCBlength, 28u);
  EXPECT_EQ(set.BaudRate, 19200u);
  EXPECT_EQ(set.fBinary, 1u);
  EXPECT_EQ(set.fParity, 1u);
  EXPECT_EQ(set.fOutxCtsFlow, 1u);
  EXPECT_EQ(set.fOutxDsrFlow, 1u);
  EXPECT_EQ(set.fDtrControl, 2u);
  EXPECT_EQ(set.fDsrSensitivity, 1u);
  EXPECT_EQ(set.fRtsControl, 3u);
  EXPECT_EQ(set.fAbortOnError, 1u);
  EXPECT_EQ(set.ByteSize, 7);
  EXPECT_EQ(set.Parity, EVENPARITY);
  EXPECT_EQ(set.StopBits, TWOSTOPBITS);
}

TEST_F(SerialConnection, ClearsWhatTheHostClears) {
  device.state.fParity = 1;
  device.state.fOutxCtsFlow = 1;
  device.state.fDtrControl = DTR_CONTROL_ENABLE;
  device.state.fAbortOnError = 1;
  const DCB settings{};
  connection.Open(L"COM12", &settings);
  const DCB& set = device.set_states.back();
  EXPECT_EQ(set.fParity, 0u);
  EXPECT_EQ(set.fOutxCtsFlow, 0u);
  EXPECT_EQ(set.fDtrControl, 0u);
  EXPECT_EQ(set.fAbortOnError, 0u);
}

TEST_F(SerialConnection, KeepsThePortsSoftwareFlowControl) {
  device.state.fOutX = 1;
  device.state.fInX = 1;
  device.state.fTXContinueOnXoff = 1;
  device.state.fErrorChar = 1;
  device.state.fNull = 1;
  device.state.XonLim = 11;
  device.state.XoffLim = 12;
  device.state.XonChar = 1;
  device.state.XoffChar = 2;
  device.state.ErrorChar = 3;
  device.state.EofChar = 4;
  device.state.EvtChar = 5;
  DCB settings{};
  settings.XonLim = 99;
  settings.XonChar = 'x';
  connection.Open(L"COM12", &settings);
  const DCB& set = device.set_states.back();
  EXPECT_EQ(set.fOutX, 1u);
  EXPECT_EQ(set.fInX, 1u);
  EXPECT_EQ(set.fTXContinueOnXoff, 1u);
  EXPECT_EQ(set.fErrorChar, 1u);
  EXPECT_EQ(set.fNull, 1u);
  EXPECT_EQ(set.XonLim, 11);
  EXPECT_EQ(set.XoffLim, 12);
  EXPECT_EQ(set.XonChar, 1);
  EXPECT_EQ(set.XoffChar, 2);
  EXPECT_EQ(set.ErrorChar, 3);
  EXPECT_EQ(set.EofChar, 4);
  EXPECT_EQ(set.EvtChar, 5);
}

TEST_F(SerialConnection, OpeningAgainClosesFirst) {
  Open(9600);
  Open(9600);
  EXPECT_TRUE(report.Has("CAbstractConnection::Disconnect - disconnected [COM12]"));
}

TEST_F(SerialConnection, SetSpeedToTheSameDoesNothing) {
  Open(9600);
  const size_t calls = device.calls.size();
  const size_t lines = report.Lines().size();
  EXPECT_EQ(connection.SetSpeed(9600), S_FALSE);
  EXPECT_EQ(device.calls.size(), calls);
  EXPECT_EQ(report.Lines().size(), lines);
}

TEST_F(SerialConnection, SetSpeedChangesTheSpeedOnly) {
  Open(9600);
  const DCB before = device.set_states.back();
  EXPECT_EQ(connection.SetSpeed(115200), S_OK);
  EXPECT_EQ(device.set_states.back().BaudRate, 115200u);
  EXPECT_EQ(device.set_states.back().fRtsControl, before.fRtsControl);
  EXPECT_TRUE(report.Has("CSerialConnection::SetSpeed - changing of baudrate [9600 -> 115200]"));
}

TEST_F(SerialConnection, SetSpeedThatFailsRemembersTheNewSpeed) {
  Open(9600);
  device.failing_call = "SetCommState";
  EXPECT_EQ(connection.SetSpeed(115200), HResultFromError(ERROR_INVALID_FUNCTION));
  EXPECT_TRUE(report.Has("CSerialConnection::SetSpeed - SetCommState is failed [1] [COM12]"));
  DWORD speed = 0;
  connection.GetSpeed(&speed);
  EXPECT_EQ(speed, 115200u);
}

TEST_F(SerialConnection, IsSerial) {
  EInstanceType type = eInstanceAny;
  EXPECT_EQ(connection.GetInstanceType(&type), S_OK);
  EXPECT_EQ(type, eInstanceSerial);
}

// --- Flush

TEST_F(SerialConnection, FlushWaitsUntilTheQueueIsEmpty) {
  Open(9600);
  device.calls.clear();
  device.line = {{0, 30}, {0, 10}, {0, 0}};
  EXPECT_EQ(connection.Flush(), S_OK);
  EXPECT_EQ(Count("ClearCommError"), 3);
  EXPECT_EQ(device.calls.back(), "PurgeComm");
  EXPECT_TRUE(report.Has("CSerialConnection::Flush"));
}

TEST_F(SerialConnection, FlushGivesUpWhenTheQueueDoesNotMove) {
  ManualClock clock;
  Open(9600);
  device.calls.clear();
  device.on_clear = [&] {
    clock.now += 500;
    device.line = {{0, 30}};
  };
  EXPECT_EQ(connection.Flush(), S_OK);
  EXPECT_EQ(device.calls.back(), "PurgeComm");
  // The queue stands still since 500. At 3500 the limit is reached and not passed.
  EXPECT_EQ(clock.now, 4000u);
  EXPECT_TRUE(report.Has("CSerialConnection::Flush - output queue does not move [COM12]"));
}

TEST_F(SerialConnection, FlushWaitsWhileTheQueueMoves) {
  ManualClock clock;
  Open(9600);
  DWORD queued = 100;
  device.on_clear = [&] {
    clock.now += 2000;
    device.line = {{0, --queued}};
  };
  EXPECT_EQ(connection.Flush(), S_OK);
  EXPECT_EQ(queued, 0u);
  EXPECT_FALSE(report.HasStart("CSerialConnection::Flush - output queue"));
}

TEST_F(SerialConnection, FlushThatCannotReadTheStatusPurges) {
  Open(9600);
  device.failing_call = "ClearCommError";
  EXPECT_EQ(connection.Flush(), S_OK);
  EXPECT_TRUE(report.Has("CSerialConnection::Flush - ClearCommError failed [1] [COM12]"));
}

TEST_F(SerialConnection, FlushThatCannotPurgeFails) {
  Open(9600);
  device.failing_call = "PurgeComm";
  EXPECT_EQ(connection.Flush(), HResultFromError(ERROR_INVALID_FUNCTION));
  EXPECT_TRUE(report.Has("CSerialConnection::Flush - PurgeComm failed [1] [COM12]"));
}

std::vector<std::string> ErrorLines(const ReportCapture& report) {
  std::vector<std::string> lines = report.Lines();
  std::erase_if(lines, [](const std::string& line) {
    return line.find("error detected") == std::string::npos;
  });
  return lines;
}

TEST_F(SerialConnection, FlushReportsEachErrorOfTheLineInOrder) {
  Open(9600);
  device.line = {{0x10 | 0x08 | 0x400 | 0x02 | 0x01 | 0x04 | 0x100, 0}};
  connection.Flush();
  EXPECT_THAT(
      ErrorLines(report),
      ElementsAre(
          "CSerialConnection::Flush - error detected [The hardware detected a break condition.] "
          "[COM12]",
          "CSerialConnection::Flush - error detected [The hardware detected a framing error.] "
          "[COM12]",
          "CSerialConnection::Flush - error detected [An I/O error occurred during "
          "communications with the device.] [COM12]",
          "CSerialConnection::Flush - error detected [A character-buffer overrun has occurred. "
          "The next character is lost.] [COM12]",
          "CSerialConnection::Flush - error detected [An input buffer overflow has occurred. "
          "There is either no room in the input buffer, or a character was received after the "
          "end-of-file (EOF) character.] [COM12]",
          "CSerialConnection::Flush - error detected [The hardware detected a parity error.] "
          "[COM12]",
          "CSerialConnection::Flush - error detected [The application tried to transmit a "
          "character, but the output buffer was full.] [COM12]"));
}

TEST_F(SerialConnection, FlushReportsAModeErrorAlone) {
  Open(9600);
  device.line = {{0x8000 | 0x08, 0}};
  connection.Flush();
  EXPECT_THAT(ErrorLines(report),
              ElementsAre("CSerialConnection::Flush - error detected [The requested mode is not "
                          "supported, or the hFile parameter is invalid.] [COM12]"));
}

// --- Connect

struct Sweep {
  int probes = 0;
  int answer_at = -1;  // the probe (from 0) that finds a receiver
};
Sweep sweep;

bool ProbeAsTold(CIConnection*, HANDLE) { return sweep.probes++ == sweep.answer_at; }

std::vector<std::string> Tries(const ReportCapture& report) {
  std::vector<std::string> lines = report.Lines();
  std::erase_if(lines,
                [](const std::string& line) { return line.find(" - try ") == std::string::npos; });
  return lines;
}

TEST_F(SerialConnection, ConnectWithoutAProbeTakesTheFirstTry) {
  EXPECT_EQ(connection.Connect(L"COM12", nullptr, nullptr), S_OK);
  EXPECT_THAT(Tries(report),
              ElementsAre("CSerialConnection::Connect - try speed [115200] [COM12]",
                          "CSerialConnection::Connect - try RTS control is disable [COM12]"));
  EXPECT_TRUE(report.Has("CSerialConnection::Connect - OK [COM12]"));
  EXPECT_EQ(device.set_states.back().BaudRate, 115200u);
  EXPECT_EQ(device.set_states.back().fRtsControl, 0u);
  DWORD speed = 0;
  connection.GetSpeed(&speed);
  EXPECT_EQ(speed, 115200u);
}

TEST_F(SerialConnection, ConnectSweepsAllSpeedsAndModes) {
  sweep = {};
  EXPECT_EQ(connection.Connect(L"COM12", nullptr, ProbeAsTold), S_FALSE);
  EXPECT_EQ(sweep.probes, 15);
  EXPECT_EQ(Count("CreateFile"), 5);
  std::vector<std::string> expected;
  for (const char* speed : {"115200", "57600", "38400", "19200", "9600"}) {
    expected.push_back(std::string("CSerialConnection::Connect - try speed [") + speed +
                       "] [COM12]");
    for (const char* mode : {"disable", "enable", "handshake"}) {
      expected.push_back(std::string("CSerialConnection::Connect - try RTS control is ") + mode +
                         " [COM12]");
    }
  }
  EXPECT_EQ(Tries(report), expected);
  EXPECT_NE(connection.GetReadHandle(), INVALID_HANDLE_VALUE);  // left open at the last try
  EXPECT_EQ(device.set_states.back().BaudRate, 9600u);
  EXPECT_EQ(device.set_states.back().fRtsControl, 2u);
}

TEST_F(SerialConnection, ConnectKeepsTheSettingsThatAnswered) {
  sweep = {.answer_at = 5};  // 57600, handshake
  device.state.fParity = 1;
  device.state.fOutxDsrFlow = 1;
  device.state.fDtrControl = DTR_CONTROL_ENABLE;
  device.state.fDsrSensitivity = 1;
  device.state.fInX = 1;
  EXPECT_EQ(connection.Connect(L"COM12", nullptr, ProbeAsTold), S_OK);
  const DCB& set = device.set_states.back();
  EXPECT_EQ(set.BaudRate, 57600u);
  EXPECT_EQ(set.fBinary, 1u);
  EXPECT_EQ(set.fParity, 0u);
  EXPECT_EQ(set.fOutxCtsFlow, 1u);
  EXPECT_EQ(set.fOutxDsrFlow, 0u);
  EXPECT_EQ(set.fDtrControl, 0u);
  EXPECT_EQ(set.fDsrSensitivity, 0u);
  EXPECT_EQ(set.fRtsControl, 2u);
  EXPECT_EQ(set.fInX, 1u);
  EXPECT_EQ(set.ByteSize, 8);
  EXPECT_EQ(set.Parity, NOPARITY);
  EXPECT_EQ(set.StopBits, ONESTOPBIT);
  DWORD speed = 0;
  connection.GetSpeed(&speed);
  EXPECT_EQ(speed, 57600u);
}

TEST_F(SerialConnection, ConnectEndsWhenThePortCannotBeOpened) {
  device.open_error = ERROR_ACCESS_DENIED;
  EXPECT_EQ(connection.Connect(L"COM12", nullptr, ProbeAsTold),
            HResultFromError(ERROR_ACCESS_DENIED));
  EXPECT_EQ(Count("CreateFile"), 1);
}

TEST_F(SerialConnection, ConnectEndsWhenAborted) {
  sweep = {};
  const KernelHandle abort(CreateEventW(nullptr, TRUE, TRUE, nullptr));
  EXPECT_EQ(connection.Connect(L"COM12", abort.get(), ProbeAsTold), S_FALSE);
  EXPECT_EQ(sweep.probes, 0);
  EXPECT_EQ(Count("SetCommState"), 1);
}

}  // namespace
