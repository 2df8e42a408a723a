// SearchReceiver and its serial part: from the name of a port to a receiver.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <filesystem>
#include <fstream>
#include <string>

#include "rcvlink.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"

using testing::ElementsAre;
using testing::ElementsAreArray;
using testing::IsEmpty;

namespace {

constexpr HRESULT kUnexpected = static_cast<HRESULT>(0x8000FFFFU);
constexpr auto kNoInstanceType = static_cast<EInstanceType>(3);

class ApiSearch : public testing::Test {
 protected:
  long Search(EInstanceType type, EProtocol protocol, HANDLE abort_event = nullptr) {
    return devapi::SearchReceiver(name_.data(), type, protocol, abort_event, &handle_);
  }
  // The lines of one try that opens the port and then fails.
  host::Lines LinesOfTry(const std::string& speed, const std::string& rts) const {
    return {"SearchReceiverOnSerial - try " + speed + " [" + port_ + "]",
            "SearchReceiverOnSerial - try RTS control is " + rts + " [" + port_ + "]",
            "CreateReceiverOnSerial - opening serial port [" + port_ + "]",
            "CAbstractConnection::Cancel []",
            "CSerialConnection::Flush",
            "CSerialConnection::Open - OK [" + port_ + "]"};
  }
  // The lines at the end of a connection.
  host::Lines LinesOfEnd() const {
    return {"CAbstractConnection::Cancel [" + port_ + "]",
            "CAbstractConnection::Disconnect - disconnected [" + port_ + "]"};
  }

  void UsePort(const std::wstring& name) {
    name_ = name;
    port_ = host::Narrow(name);
  }

  std::wstring name_;
  std::string port_;
  void* handle_ = nullptr;
};

void Append(host::Lines& lines, const host::Lines& more) {
  lines.insert(lines.end(), more.begin(), more.end());
}

// Nothing is plugged in.
class ApiSearchOfMissingPort : public ApiSearch {
 protected:
  ApiSearchOfMissingPort() {
    const std::string name = lease_.name();
    UsePort(std::wstring(name.begin(), name.end()));
  }
  host::Lines LinesOfTheOnlyTry() const {
    host::Lines lines = LinesOfTry("current port speed", "handshake");
    lines.resize(4);
    Append(lines,
           {"CSerialConnection::Create - CreateFile failed [2] [" + port_ + "]",
            "CAbstractConnection::Cancel [" + port_ + "]"});
    return lines;
  }
  // A device that cannot be opened is still tried, and does not answer.
  host::Lines LinesOfUsb() const {
    return {
        "CreateReceiverOnUSB - opening USB [" + port_ + "]",
        "CUSBConnection::Create",
        "CUSBConnection::Disconnect",
        "2",
        "2",
        "CUSBConnection::Create - DeviceIoControl(IOCTL_USBIO_SET_CONFIGURATION) is failed [6] [" +
            port_ + "]. Try to continue...",
        "CreateReceiverOnUSB - looking for Quorin receiver [" + port_ + "]",
        "CUSBConnection::Flush",
        "CAbstractConnection::Read - read failed [6] [(null)]",
        "CAbstractConnection::Write - write failed [6] [(null)]",
        "CUSBConnection::Disconnect",
        "CAbstractConnection::Cancel []"};
  }

  const bed::PortLease lease_;
  const host::Report report_;
};

TEST_F(ApiSearchOfMissingPort, EndsAfterOneTry) {
  EXPECT_EQ(Search(eInstanceSerial, eProtocolAny), host::kFileNotFound);
  EXPECT_THAT(report_.Lines(), ElementsAreArray(LinesOfTheOnlyTry()));
  EXPECT_EQ(handle_, nullptr);
}

TEST_F(ApiSearchOfMissingPort, SerialHalfDoesTheSame) {
  EXPECT_EQ(SearchReceiverOnSerial(name_.data(), eProtocolAny, nullptr, &handle_),
            host::kFileNotFound);
  EXPECT_THAT(report_.Lines(), ElementsAreArray(LinesOfTheOnlyTry()));
}

TEST_F(ApiSearchOfMissingPort, GoesOnToUsbWhereAnyLinkWillDo) {
  EXPECT_EQ(Search(eInstanceAny, eProtocolAny), S_FALSE);
  host::Lines lines = LinesOfTheOnlyTry();
  Append(lines, {"SearchReceiver - SearchReceiverOnSerial failed[" + port_ + "] [0x80070002]"});
  Append(lines, LinesOfUsb());
  EXPECT_THAT(report_.Lines(), ElementsAreArray(lines));
  EXPECT_EQ(handle_, nullptr);
}

TEST_F(ApiSearchOfMissingPort, UsbAloneLeavesTheSerialPortAlone) {
  EXPECT_EQ(Search(eInstanceUSB, eProtocolVelmar), S_FALSE);
  EXPECT_THAT(report_.Lines(), ElementsAreArray(LinesOfUsb()));
}

TEST_F(ApiSearchOfMissingPort, RefusesAStrangeKindOfLink) {
  EXPECT_EQ(Search(kNoInstanceType, eProtocolAny), kUnexpected);
  EXPECT_THAT(report_.Lines(), IsEmpty());
}

TEST_F(ApiSearchOfMissingPort, RefusesMissingArguments) {
  EXPECT_EQ(devapi::SearchReceiver(name_.data(), eInstanceAny, eProtocolAny, nullptr, nullptr),
            E_INVALIDARG);
  EXPECT_EQ(devapi::SearchReceiver(nullptr, eInstanceSerial, eProtocolAny, nullptr, &handle_),
            E_INVALIDARG);
  EXPECT_EQ(devapi::CreateReceiverOnUSB(nullptr, eProtocolAny, nullptr, &handle_), E_INVALIDARG);
  EXPECT_EQ(devapi::CreateReceiverOnUSB(name_.data(), eProtocolAny, nullptr, nullptr),
            E_INVALIDARG);
  EXPECT_THAT(report_.LinesWith("CSerialConnection"), IsEmpty());
}

TEST_F(ApiSearch, ReturnsARegisteredReceiverAtOnce) {
  const bed::SimulatedPort port({"quorin"});
  UsePort(port.name());
  const host::Receiver receiver(port);
  const std::string before = port.Transcript();
  const host::Report report;

  EXPECT_EQ(Search(eInstanceSerial, eProtocolVelmar), S_OK);
  EXPECT_EQ(handle_, receiver.get());
  EXPECT_EQ(Search(kNoInstanceType, eProtocolAny), S_OK) << "it is looked for before the type";
  EXPECT_THAT(report.Lines(),
              ElementsAre("OpenReceiver - ref [2] [" + port_ + "]",
                          "SearchReceiver - receiver already exists [" + port_ + "]",
                          "OpenReceiver - ref [3] [" + port_ + "]",
                          "SearchReceiver - receiver already exists [" + port_ + "]"));
  EXPECT_EQ(devapi::CloseReceiver(handle_), S_FALSE);
  EXPECT_EQ(devapi::CloseReceiver(handle_), S_FALSE);
  EXPECT_EQ(port.Transcript(), before) << "it was asked nevertheless";
}

// The port was left at another speed than the receiver's, so it is found at the second try.
TEST_F(ApiSearch, SweepsTheSpeedsFromTheCurrentOneOn) {
  const bed::SimulatedPort port({"quorin"});
  UsePort(port.name());
  const host::Report report;
  DCB settings = host::Settings(CBR_57600);
  const host::Event at_once(true);
  ASSERT_EQ(devapi::CreateReceiverOnSerial(
                name_.data(), eProtocolAny, &settings, at_once.get(), &handle_),
            S_FALSE);

  ASSERT_EQ(Search(eInstanceSerial, eProtocolQuorin), S_OK);
  EXPECT_THAT(report.LinesWith("SearchReceiverOnSerial"),
              ElementsAre("SearchReceiverOnSerial - try current port speed [" + port_ + "]",
                          "SearchReceiverOnSerial - try RTS control is handshake [" + port_ + "]",
                          "SearchReceiverOnSerial - try speed [9600] [" + port_ + "]",
                          "SearchReceiverOnSerial - try RTS control is handshake [" + port_ + "]"));
  EXPECT_TRUE(report.Has("CQuorinProtocol::CheckConnection - ping cmd failed [0x800705B4] [" +
                         port_ + "]"));
  EXPECT_TRUE(report.Has("CreateReceiverOnSerial - OK [" + port_ + "]"));
  port.WaitForTranscript(" echo /dev/null\n");
  EXPECT_EQ(host::SentByHost(port.Transcript()), host::HandshakeOfHost());
  EXPECT_EQ(host::CountOf(host::WireLines(port.Transcript()), "- not heard at 57600"), 1U);
  EXPECT_EQ(devapi::CloseReceiver(handle_), S_OK);
}

TEST_F(ApiSearch, FindsItAtTheSpeedThatThePortWasLeftAt) {
  const bed::SimulatedPort port({"quorin", "--speed", "38400"});
  UsePort(port.name());
  { const host::Receiver before(port, CBR_38400); }
  const host::Report report;

  ASSERT_EQ(Search(eInstanceAny, eProtocolAny), S_OK);
  EXPECT_EQ(report.LinesWith("SearchReceiverOnSerial").size(), 2U);
  EXPECT_EQ(devapi::CloseReceiver(handle_), S_OK);
}

TEST_F(ApiSearch, EndsOnceThePortIsOpenWhenItWasAbortedBefore) {
  const bed::SimulatedPort port({"quorin"});
  UsePort(port.name());
  const host::Event abort_event(true);
  const host::Report report;

  EXPECT_EQ(Search(eInstanceSerial, eProtocolAny, abort_event.get()), S_FALSE);
  EXPECT_EQ(handle_, nullptr);
  host::Lines lines = LinesOfTry("current port speed", "handshake");
  Append(lines, LinesOfEnd());
  EXPECT_THAT(report.Lines(), ElementsAreArray(lines));
  EXPECT_THAT(port.Transcript(), IsEmpty());
}

TEST_F(ApiSearch, EndsWhenItIsAbortedInASilence) {
  bed::SimulatedPort port({"quorin"});
  UsePort(port.name());
  host::Event abort_event;
  const host::Report report;
  port.Pause();

  auto search =
      host::OnThread([&] { return Search(eInstanceSerial, eProtocolAny, abort_event.get()); });
  report.WaitFor("CQuorinCommand::Execute - start reading. Timeout is [8000 msec]");
  abort_event.Set();
  EXPECT_EQ(search.get(), S_FALSE);
  EXPECT_EQ(handle_, nullptr);
  EXPECT_EQ(report.LinesWith("SearchReceiverOnSerial").size(), 2U);
  EXPECT_THAT(report.LinesWith("CAbstractConnection::Read"), IsEmpty()) << "it was waited out";
  EXPECT_THAT(report.LinesWith("CQuorinProtocol::CheckConnection - ping"), IsEmpty());
  EXPECT_TRUE(report.Has("CAbstractConnection::Disconnect - disconnected [" + port_ + "]"));
}

// A plain file in place of a port: it can be opened, and every try fails at once.
class ApiSearchOfNoPort : public ApiSearch {
 protected:
  ApiSearchOfNoPort() {
    const std::string name = lease_.name();
    UsePort(std::wstring(name.begin(), name.end()));
    file_ = std::filesystem::path("build") / "ports" / ("com" + name.substr(3));
    std::ofstream{file_};
  }
  ~ApiSearchOfNoPort() override { std::filesystem::remove(file_); }

  const bed::PortLease lease_;
  std::filesystem::path file_;
  const host::Report report_;
};

TEST_F(ApiSearchOfNoPort, TriesEverySpeedInEveryMode) {
  EXPECT_EQ(Search(eInstanceSerial, eProtocolAny), S_FALSE);
  EXPECT_EQ(handle_, nullptr);
  host::Lines expected;
  for (const char* const rts : {"handshake", "enable", "disable"}) {
    for (const char* const speed : {"current port speed",
                                    "speed [9600]",
                                    "speed [115200]",
                                    "speed [57600]",
                                    "speed [38400]",
                                    "speed [19200]"}) {
      host::Lines lines = LinesOfTry(speed, rts);
      lines.resize(2);
      Append(expected, lines);
    }
  }
  EXPECT_THAT(report_.LinesWith("SearchReceiverOnSerial"), ElementsAreArray(expected));
  EXPECT_EQ(report_.LinesWith("CSerialConnection::Open - OK").size(), 18U);
  EXPECT_EQ(report_.LinesWith("CAbstractConnection::Disconnect").size(), 18U);
  EXPECT_EQ(report_.LinesWith("CreateReceiverOnSerial - looking for Quorin").size(), 18U);
  EXPECT_EQ(report_.LinesWith("CreateReceiverOnSerial - looking for Velmar").size(), 18U);
}

TEST_F(ApiSearchOfNoPort, LooksForTheFamilyNamedOnly) {
  EXPECT_EQ(Search(eInstanceSerial, eProtocolQuorin), S_FALSE);
  EXPECT_THAT(report_.LinesWith("CreateReceiverOnSerial - looking for Velmar"), IsEmpty());
  const size_t before = report_.Lines().size();
  EXPECT_EQ(Search(eInstanceSerial, eProtocolVelmar), S_FALSE);
  EXPECT_EQ(
      host::CountStarting(report_.LinesFrom(before), "CreateReceiverOnSerial - looking for Q"), 0U);
}

TEST_F(ApiSearchOfNoPort, TakesAStaleHandleForAFoundReceiver) {
  void* const stale = &name_;
  handle_ = stale;
  EXPECT_EQ(Search(eInstanceSerial, eProtocolAny), S_OK);
  EXPECT_EQ(handle_, stale);
  EXPECT_EQ(report_.LinesWith("SearchReceiverOnSerial").size(), 2U);
}

}  // namespace
