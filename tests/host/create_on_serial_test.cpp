// CreateReceiverOnSerial: one try with settings that the host knows.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <bit>
#include <string>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/handle.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

namespace {

// A port opened as another program would open it.
class RawPort {
 public:
  explicit RawPort(const std::wstring& path)
      : handle_(CreateFileW(
            path.c_str(), GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, 0, nullptr)) {}

  DCB GetSettings() const {
    DCB settings{};
    settings.DCBlength = sizeof(DCB);
    EXPECT_TRUE(GetCommState(handle_.get(), &settings));
    return settings;
  }
  void SetSpeed(DWORD speed) const {
    DCB settings = GetSettings();
    settings.BaudRate = speed;
    EXPECT_TRUE(SetCommState(handle_.get(), &settings));
  }

 private:
  bed::UniqueHandle handle_;
};

long Create(const bed::SimulatedPort& port,
            EProtocol protocol,
            DWORD speed,
            void** handle,
            HANDLE abort_event = nullptr) {
  std::wstring name = port.name();
  DCB settings = host::Settings(speed);
  return devapi::CreateReceiverOnSerial(name.data(), protocol, &settings, abort_event, handle);
}

TEST(ApiCreateOnSerial, TracesItsStepsAndProbesTheReceiver) {
  const bed::SimulatedPort port({"quorin"});
  const std::string name = host::Narrow(port.name());
  const host::Report report;
  void* handle = nullptr;
  ASSERT_EQ(Create(port, eProtocolQuorin, CBR_9600, &handle), S_OK);
  EXPECT_NE(handle, nullptr);

  EXPECT_THAT(report.Lines(),
              ElementsAre("CreateReceiverOnSerial - opening serial port [" + name + "]",
                          "CAbstractConnection::Cancel []",
                          "CSerialConnection::Flush",
                          "CSerialConnection::Open - OK [" + name + "]",
                          "CreateReceiverOnSerial - looking for Quorin receiver [" + name + "]",
                          "CSerialConnection::Flush",
                          "CEchoOffCmd::CEchoOffCmd",
                          "CSerialConnection::Flush",
                          "CSerialConnection::Flush",
                          "CPingCmd::CPingCmd",
                          "CSerialConnection::Flush",
                          "CQuorinCommand::Execute - start reading. Timeout is [8000 msec]",
                          "CGetPortCmd::CGetPortCmd",
                          "CSerialConnection::Flush",
                          "CQuorinCommand::Execute - start reading. Timeout is [30000 msec]",
                          "CDisableEchoCmd::CDisableEchoCmd",
                          "CSerialConnection::Flush",
                          "CreateReceiverOnSerial - Quorin receiver found [" + name + "]",
                          "CreateReceiverOnSerial - OK [" + name + "]"));

  port.WaitForTranscript(" echo /dev/null\n");
  const std::string transcript = port.Transcript();
  EXPECT_THAT(host::WireLines(transcript),
              ElementsAre(R"(> \n)",
                          R"(> #OFF#\r\n)",
                          "= echo off",
                          R"(> dm\r\n)",
                          R"(> %#%\r\n)",
                          R"(< RE%#%\r\n)",
                          R"(> %#%print,/cur/term\r\n)",
                          R"(< RE%#%/dev/ser/a\r\n)",
                          R"(> set,/par/dev/ser/a/echo,/dev/null\r\n)",
                          "= port a echo /dev/null"));
  const std::vector<int> tags = host::TagsOf(transcript);
  ASSERT_EQ(tags.size(), 2U);
  EXPECT_EQ(tags[1], tags[0] + 1);
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
}

TEST(ApiCreateOnSerial, RefusesMissingArguments) {
  const bed::SimulatedPort port({"quorin"});
  const host::Report report;
  std::wstring name = port.name();
  DCB settings = host::Settings(CBR_9600);
  void* handle = nullptr;
  EXPECT_EQ(devapi::CreateReceiverOnSerial(nullptr, eProtocolAny, &settings, nullptr, &handle),
            E_INVALIDARG);
  EXPECT_EQ(devapi::CreateReceiverOnSerial(name.data(), eProtocolAny, nullptr, nullptr, &handle),
            E_INVALIDARG);
  EXPECT_EQ(devapi::CreateReceiverOnSerial(name.data(), eProtocolAny, &settings, nullptr, nullptr),
            E_INVALIDARG);
  EXPECT_EQ(handle, nullptr);
  EXPECT_THAT(report.Lines(), IsEmpty());
  EXPECT_THAT(port.Transcript(), IsEmpty());
}

TEST(ApiCreateOnSerial, StrangeFamilyIsAnyFamily) {
  const bed::SimulatedPort port({"quorin", "--port-letter", "c"});
  void* handle = nullptr;
  ASSERT_EQ(Create(port, std::bit_cast<EProtocol>(7), CBR_9600, &handle), S_OK);
  port.WaitForTranscript("= port c echo /dev/null\n");
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
}

// A port is known by the first of "/a" to "/d" in its name.
TEST(ApiCreateOnSerial, PortOfAnotherNameIsReadTheSameWay) {
  const bed::SimulatedPort port({"quorin", "--port-name", "/dev/usb"});
  void* handle = nullptr;
  ASSERT_EQ(Create(port, eProtocolAny, CBR_9600, &handle), S_OK);
  port.WaitForTranscript("= port d echo /dev/null\n");
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
}

TEST(ApiCreateOnSerial, QuorinReceiverIsNotAskedWhereVelmarIsWanted) {
  bed::SimulatedPort port({"quorin"});
  const host::Report report;
  void* handle = nullptr;
  EXPECT_EQ(Create(port, eProtocolVelmar, CBR_9600, &handle), S_FALSE);
  EXPECT_EQ(handle, nullptr);
  EXPECT_THAT(report.LinesWith("CreateReceiverOnSerial - looking for Quorin"), IsEmpty());
  EXPECT_EQ(report.LinesWith("CreateReceiverOnSerial - looking for Velmar").size(), 1U);
  port.Stop();  // only then an unfinished line is recorded
  const std::string transcript = port.Transcript();
  for (const char* const greeting : {"#OFF#", "dm", "print,", "%"}) {
    EXPECT_EQ(transcript.find(greeting), std::string::npos) << transcript;
  }
}

TEST(ApiCreateOnSerial, SpeedZeroKeepsThePortsOwn) {
  const bed::SimulatedPort port({"quorin", "--speed", "38400"});
  RawPort(port.path()).SetSpeed(CBR_38400);
  void* handle = nullptr;
  ASSERT_EQ(Create(port, eProtocolAny, 0, &handle), S_OK);
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
  EXPECT_EQ(RawPort(port.path()).GetSettings().BaudRate, DWORD{CBR_38400});
}

TEST(ApiCreateOnSerial, UsesTheSettingsItIsGiven) {
  const bed::SimulatedPort port({"quorin", "--speed", "19200"});
  RawPort(port.path()).SetSpeed(CBR_57600);
  std::wstring name = port.name();
  DCB settings = host::Settings(CBR_19200);
  settings.StopBits = TWOSTOPBITS;
  void* handle = nullptr;
  ASSERT_EQ(devapi::CreateReceiverOnSerial(name.data(), eProtocolAny, &settings, nullptr, &handle),
            S_OK);
  EXPECT_EQ(devapi::CloseReceiver(handle), S_OK);
  const DCB used = RawPort(port.path()).GetSettings();
  EXPECT_EQ(used.BaudRate, DWORD{CBR_19200});
  EXPECT_EQ(used.StopBits, TWOSTOPBITS);
  EXPECT_EQ(used.ByteSize, 8);
}

TEST(ApiCreateOnSerial, AbortedBeforeItStartsItOnlyOpensThePort) {
  const bed::SimulatedPort port({"quorin"});
  const host::Event abort_event(true);
  const host::Report report;
  void* handle = nullptr;
  EXPECT_EQ(Create(port, eProtocolAny, CBR_9600, &handle, abort_event.get()), S_FALSE);
  EXPECT_EQ(handle, nullptr);
  EXPECT_EQ(report.LinesWith("CSerialConnection::Open - OK").size(), 1U);
  EXPECT_EQ(report.LinesWith("CreateReceiverOnSerial").size(), 1U);
  EXPECT_EQ(report.LinesWith("CAbstractConnection::Disconnect").size(), 1U);
  EXPECT_THAT(port.Transcript(), IsEmpty());
}

TEST(ApiCreateOnSerial, FindsNoneWherePortOrPingAreNotAnsweredRight) {
  for (const std::vector<std::string>& arguments :
       {std::vector<std::string>{"quorin", "--port-name", "usb"},
        std::vector<std::string>{"quorin", "--refuse", "print,/cur/term"},
        std::vector<std::string>{"quorin", "--refuse", "ping"}}) {
    const bed::SimulatedPort port(arguments);
    const host::Report report;
    void* handle = nullptr;
    EXPECT_EQ(Create(port, eProtocolQuorin, CBR_9600, &handle), S_FALSE) << arguments.back();
    EXPECT_EQ(handle, nullptr);
    EXPECT_TRUE(report.Lines().back().ends_with("disconnected [" + host::Narrow(port.name()) + "]"))
        << report.Lines().back();
    EXPECT_EQ(port.Transcript().find("/echo,"), std::string::npos) << port.Transcript();
  }
}

TEST(ApiCreateOnSerial, SilentReceiverIsNoReceiver) {
  bed::SimulatedPort port({"quorin"});
  port.Pause();
  const host::Report report;
  void* handle = nullptr;
  EXPECT_EQ(Create(port, eProtocolQuorin, CBR_9600, &handle), S_FALSE);
  EXPECT_EQ(handle, nullptr);
  EXPECT_TRUE(report.Has("CQuorinProtocol::CheckConnection - ping cmd failed [0x800705B4] [" +
                         host::Narrow(port.name()) + "]"));
}

// One receiver does not answer for a while; the other one is found in the meantime.
TEST(ApiCreateOnSerial, TwoPortsAreTriedAtOnce) {
  bed::SimulatedPort slow({"quorin"});
  const bed::SimulatedPort quick({"quorin"});
  const host::Report report;
  slow.Pause();
  void* slow_handle = nullptr;
  auto slow_create =
      host::OnThread([&] { return Create(slow, eProtocolQuorin, CBR_9600, &slow_handle); });
  report.WaitFor("CQuorinCommand::Execute - start reading. Timeout is [8000 msec]");

  void* quick_handle = nullptr;
  EXPECT_EQ(Create(quick, eProtocolQuorin, CBR_9600, &quick_handle), S_OK);
  EXPECT_EQ(slow_handle, nullptr);
  EXPECT_THAT(slow.Transcript(), IsEmpty());
  slow.Resume();
  EXPECT_EQ(slow_create.get(), S_OK);
  EXPECT_NE(slow_handle, quick_handle);

  const std::string name = host::Narrow(quick.name());
  const host::Lines lines = report.LinesWith("CreateReceiverOnSerial - OK");
  EXPECT_THAT(lines,
              ElementsAre("CreateReceiverOnSerial - OK [" + name + "]",
                          "CreateReceiverOnSerial - OK [" + host::Narrow(slow.name()) + "]"));
  EXPECT_EQ(devapi::CloseReceiver(slow_handle), S_OK);
  EXPECT_EQ(devapi::CloseReceiver(quick_handle), S_OK);
}

}  // namespace
