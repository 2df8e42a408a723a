// A whole search for a Velmar receiver: discovery, connection and both probes as they are, on a
// port in memory whose clock is moved by the waits.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sstream>
#include <string>
#include <vector>

#include "platform/api_types.h"
#include "platform/text.h"
#include "simulator/velmar/receiver.h"
#include "tests/support/manual_clock.h"
#include "tests/support/report_capture.h"
#include "tests/support/simulated_com_port.h"
#include "transport/device_calls.h"

using rcvlink::SystemCallsOverride;
using rcvlink::UniqueBstr;

namespace {

using testing::ElementsAreArray;
using testing::IsEmpty;
using testing::SizeIs;

// The speed at which a port was left; no receiver uses it.
constexpr DWORD kLeftAt = 4800;

struct Try {
  std::string speed;
  DWORD baud;
  std::string mode;
  DWORD rts;
};

// All tries in their order; the current speed as the port has it then.
std::vector<Try> AllTries(DWORD current) {
  std::vector<Try> tries;
  for (const auto& [mode, rts] : {std::pair<std::string, DWORD>("handshake", 2),
                                  std::pair<std::string, DWORD>("enable", 1),
                                  std::pair<std::string, DWORD>("disable", 0)}) {
    tries.push_back({"current port speed", current, mode, rts});
    for (const DWORD baud : {9600u, 115200u, 57600u, 38400u, 19200u}) {
      tries.push_back({"speed [" + std::to_string(baud) + "]", baud, mode, rts});
    }
  }
  return tries;
}

class VelmarSearch : public testing::Test {
 protected:
  explicit VelmarSearch(uint32_t receiver_speed = 19200)
      : receiver_(Options(receiver_speed), {}, &transcript_) {
    port_.state.BaudRate = kLeftAt;
    port_.forgets = true;
    // A side that holds RTS high blocks the line: data passes only while RTS is low.
    port_.carries = [](const DCB& state) { return state.fRtsControl == RTS_CONTROL_DISABLE; };
  }
  ~VelmarSearch() override {
    if (handle_) devapi::CloseReceiver(handle_);
  }

  static sim::VelmarOptions Options(uint32_t speed) {
    sim::VelmarOptions options;
    options.line.speed = speed;
    return options;
  }
  long Search(EProtocol protocol) {
    return SearchReceiverOnSerial(name_.data(), protocol, nullptr, &handle_);
  }

  // The report's lines of one try without or with an answer.
  static std::vector<std::string> LinesOf(const Try& one, EProtocol protocol, bool found) {
    std::vector<std::string> lines = {
        "SearchReceiverOnSerial - try " + one.speed + " [COM7]",
        "SearchReceiverOnSerial - try RTS control is " + one.mode + " [COM7]",
        "CreateReceiverOnSerial - opening serial port [COM7]",
        "CSerialConnection::Open - OK [COM7]"};
    if (protocol != eProtocolVelmar) {
      lines.push_back("CreateReceiverOnSerial - looking for Quorin receiver [COM7]");
    }
    lines.push_back("CreateReceiverOnSerial - looking for Velmar receiver [COM7]");
    if (found) {
      lines.push_back("CreateReceiverOnSerial - Velmar receiver found [COM7]");
      lines.push_back("CreateReceiverOnSerial - OK [COM7]");
    } else {
      lines.push_back("CAbstractConnection::Disconnect - disconnected [COM7]");
    }
    return lines;
  }
  // The lines of discovery, and those that show when the port is open.
  std::vector<std::string> Told() const {
    std::vector<std::string> told;
    for (const std::string& line : report_.Lines()) {
      for (const char* start : {"SearchReceiver",
                                "CreateReceiver",
                                "CSerialConnection::Open",
                                "CSerialConnection::Create",
                                "CAbstractConnection::Disconnect"}) {
        if (line.starts_with(start)) told.push_back(line);
      }
    }
    return told;
  }

  void ExpectTries(const std::vector<Try>& tries, EProtocol protocol, bool found) const {
    std::vector<std::string> lines;
    for (size_t i = 0; i < tries.size(); ++i) {
      const auto more = LinesOf(tries[i], protocol, found && i + 1 == tries.size());
      lines.insert(lines.end(), more.begin(), more.end());
    }
    EXPECT_THAT(Told(), ElementsAreArray(lines));
    EXPECT_EQ(port_.openings, tries.size());
    ASSERT_THAT(port_.set_states, SizeIs(tries.size()));
    for (size_t i = 0; i < tries.size(); ++i) {
      SCOPED_TRACE(i);
      const DCB& set = port_.set_states[i];
      EXPECT_EQ(set.DCBlength, 28u);
      EXPECT_EQ(set.BaudRate, tries[i].baud);
      EXPECT_EQ(set.fRtsControl, tries[i].rts);
      EXPECT_EQ(set.fOutxCtsFlow, tries[i].mode == "handshake");
      EXPECT_EQ(set.fBinary, 1u);
      EXPECT_EQ(set.fParity, 0u);
      EXPECT_EQ(set.fOutxDsrFlow, 0u);
      EXPECT_EQ(set.fDtrControl, 0u);
      EXPECT_EQ(set.fDsrSensitivity, 0u);
      EXPECT_EQ(set.fAbortOnError, 0u);
      EXPECT_EQ(set.ByteSize, 8);
      EXPECT_EQ(set.Parity, 0);
      EXPECT_EQ(set.StopBits, 0);
    }
  }
  // The handle is that of a receiver that answers.
  void ExpectReceiver() {
    ASSERT_NE(handle_, nullptr);
    CReceiverInfo info{};
    EXPECT_EQ(devapi::GetReceiverInfo(handle_, nullptr, &info), S_OK);
    const UniqueBstr id(info.bstrReceiverId);
    const UniqueBstr model(info.bstrModel);
    EXPECT_STREQ(info.bstrReceiverId, L"VM00731");
    EXPECT_EQ(info.dwProtocol, 2u);
  }

  std::wstring name_ = L"COM7";
  std::ostringstream log_;
  sim::Transcript transcript_{log_};
  sim::VelmarReceiver receiver_;
  ManualClock clock_;
  ReportCapture report_;
  SimulatedComPort port_{receiver_, clock_};
  SystemCallsOverride calls_{port_};
  void* handle_ = nullptr;
};

TEST_F(VelmarSearch, FindsTheLastSpeedInTheLastMode) {
  EXPECT_EQ(Search(eProtocolAny), S_OK);
  ExpectTries(AllTries(kLeftAt), eProtocolAny, true);
  EXPECT_EQ(port_.state.BaudRate, 19200u);
  ExpectReceiver();
}

// Each try without an answer takes the time-out and the pause after an exchange, and the last one
// the quiet second that ends a read.
TEST_F(VelmarSearch, OfThisFamilyAloneSendsNothingElse) {
  EXPECT_EQ(Search(eProtocolVelmar), S_OK);
  ExpectTries(AllTries(kLeftAt), eProtocolVelmar, true);
  EXPECT_EQ(clock_.paused, 18u * 500);
  EXPECT_EQ(clock_.now, 17u * (8000 + 500) + 1000 + 500);
  EXPECT_EQ(log_.str(),
            "- not heard at 4800\n"
            "> interfacemode thisport novatel novatel on\\r\n"
            "< \\r\\n<OK\\r\\n[COM1]\n"
            "> unlogall thisport\\r\n"
            "< \\r\\n<OK\\r\\n[COM1]\n");
  ExpectReceiver();
}

// A port that keeps its last settings has the right current speed when the mode is right.
TEST_F(VelmarSearch, APortThatRemembersIsTriedAtTheSpeedThatWasTriedLast) {
  port_.forgets = false;
  EXPECT_EQ(Search(eProtocolVelmar), S_OK);
  std::vector<Try> tries = AllTries(19200);
  tries.resize(13);
  tries[0].baud = kLeftAt;
  ExpectTries(tries, eProtocolVelmar, true);
  ExpectReceiver();
}

// The mode matters, not only the speed: the receiver is at the first speed tried in each.
class VelmarSearchAtCurrentSpeed : public VelmarSearch {
 protected:
  VelmarSearchAtCurrentSpeed() : VelmarSearch(kLeftAt) {}
};

TEST_F(VelmarSearchAtCurrentSpeed, FindsItInTheFirstModeThatReachesIt) {
  struct Mode {
    DWORD rts;
    size_t tries;
  };
  for (const Mode mode : {Mode{RTS_CONTROL_HANDSHAKE, 1},
                          Mode{RTS_CONTROL_ENABLE, 7},
                          Mode{RTS_CONTROL_DISABLE, 13}}) {
    port_.carries = [&](const DCB& state) { return state.fRtsControl == mode.rts; };
    port_.openings = 0;
    port_.state.BaudRate = kLeftAt;
    EXPECT_EQ(Search(eProtocolVelmar), S_OK);
    EXPECT_EQ(port_.openings, mode.tries);
    EXPECT_EQ(port_.state.fRtsControl, mode.rts);
    ASSERT_NE(handle_, nullptr);
    EXPECT_EQ(devapi::CloseReceiver(handle_), S_OK);
    handle_ = nullptr;
  }
}

TEST_F(VelmarSearch, EndsWithoutAReceiverWhereNothingPasses) {
  port_.carries = [](const DCB&) { return false; };
  EXPECT_EQ(Search(eProtocolAny), S_FALSE);
  EXPECT_EQ(handle_, nullptr);
  ExpectTries(AllTries(kLeftAt), eProtocolAny, false);
  EXPECT_THAT(log_.str(), IsEmpty());
}

// The receiver is a Velmar receiver: a search for the other family finds nothing at the right
// speed.
TEST_F(VelmarSearch, IsNoReceiverOfTheOtherFamily) {
  EXPECT_EQ(Search(eProtocolQuorin), S_FALSE);
  EXPECT_EQ(handle_, nullptr);
  EXPECT_EQ(port_.openings, 18u);
  EXPECT_NE(log_.str().find("> dm"), std::string::npos) << "it was not reached at all";
  EXPECT_EQ(log_.str().find("interfacemode"), std::string::npos) << log_.str();
}

}  // namespace
