#include "sweep.h"

#include <windows.h>

#include <gtest/gtest.h>

#include <algorithm>

namespace cli {
namespace {

using Families = std::vector<EProtocol>;

std::vector<unsigned long> SpeedsOf(const std::vector<Try>& tries, RtsMode rts) {
  std::vector<unsigned long> speeds;
  for (const Try& one : tries) {
    if (one.line.rts == rts) speeds.push_back(one.line.speed);
  }
  return speeds;
}

TEST(SweepTest, UsualSpeedsComeFirstThenThatOfThePort) {
  const std::vector<unsigned long> velmar = {9600, 115200, 4800, 57600, 38400, 19200};
  const std::vector<unsigned long> quorin = {115200, 9600, 4800, 57600, 38400, 19200};
  EXPECT_EQ(SpeedsOf(PlanSweep(eProtocolAny, 4800, {}), RtsMode::kOn), velmar);
  EXPECT_EQ(SpeedsOf(PlanSweep(eProtocolVelmar, 4800, {}), RtsMode::kOff), velmar);
  EXPECT_EQ(SpeedsOf(PlanSweep(eProtocolQuorin, 4800, {}), RtsMode::kHandshake), quorin);
}

TEST(SweepTest, NoSettingIsTriedTwice) {
  EXPECT_EQ(PlanSweep(eProtocolAny, 57600, {}).size(), 15U);
  EXPECT_EQ(PlanSweep(eProtocolAny, 0, {}).size(), 15U);
  EXPECT_EQ(PlanSweep(eProtocolAny, 4800, {}).size(), 18U);
  const KnownSetting known{{19200, RtsMode::kOff}, eProtocolQuorin};
  const std::vector<Try> tries = PlanSweep(eProtocolAny, 0, known);
  EXPECT_EQ(tries.size(), 15U);
  EXPECT_EQ(tries.front().line, known.line);
  const auto same = [&](const Try& one) { return one.line == known.line; };
  EXPECT_EQ(std::count_if(tries.begin(), tries.end(), same), 1);
}

TEST(SweepTest, RtsThatIsOnComesFirst) {
  const std::vector<Try> tries = PlanSweep(eProtocolAny, 0, {});
  EXPECT_EQ(tries[0].line.rts, RtsMode::kOn);
  EXPECT_EQ(tries[5].line.rts, RtsMode::kHandshake);
  EXPECT_EQ(tries[10].line.rts, RtsMode::kOff);
}

TEST(SweepTest, TheKnownSettingIsTriedFirstWithItsFamily) {
  const KnownSetting known{{1200, RtsMode::kHandshake}, eProtocolVelmar};
  const std::vector<Try> tries = PlanSweep(eProtocolAny, 0, known);
  EXPECT_EQ(tries.size(), 16U);
  EXPECT_EQ(tries[0], (Try{known.line, {eProtocolVelmar, eProtocolQuorin}}));
  EXPECT_EQ(tries[1].families, (Families{eProtocolQuorin, eProtocolVelmar}));
}

TEST(SweepTest, AKnownReceiverOfAnotherFamilyThanAskedForDoesNotCount) {
  const KnownSetting known{{1200, RtsMode::kHandshake}, eProtocolVelmar};
  EXPECT_EQ(PlanSweep(eProtocolQuorin, 0, known), PlanSweep(eProtocolQuorin, 0, {}));
}

TEST(SweepTest, DescribesATry) {
  EXPECT_EQ(InWords({57600, RtsMode::kOn}), "57600 bit/s, RTS on");
  EXPECT_EQ(InWords({0, RtsMode::kHandshake}), "the port's current speed, RTS handshake");
}

// A port on which a receiver of one family answers at one setting.
class FakePort : public SweepPort {
 public:
  long Ask(const LineSetting& line, EProtocol family, void** receiver) override {
    asked.push_back({line, family});
    if (asked.size() == fails_at) return E_ACCESSDENIED;
    if (asked.back() != answers_at) return S_FALSE;
    *receiver = this;
    return S_OK;
  }
  void Begin(size_t number, size_t count, const LineSetting& line) override {
    begun.push_back(std::to_string(number) + "/" + std::to_string(count) + " " +
                    std::to_string(line.speed));
  }
  bool IsCancelled() const override { return asked.size() == cancelled_at; }

  KnownSetting answers_at{};
  size_t fails_at = 0;
  size_t cancelled_at = 0;
  std::vector<KnownSetting> asked;
  std::vector<std::string> begun;
};

const std::vector<Try> kTries = {{{9600, RtsMode::kOn}, {eProtocolQuorin, eProtocolVelmar}},
                                 {{19200, RtsMode::kOff}, {eProtocolQuorin, eProtocolVelmar}}};

TEST(SweepTest, EndsWhereTheReceiverAnswers) {
  FakePort port;
  port.answers_at = {{19200, RtsMode::kOff}, eProtocolVelmar};
  const SweepResult result = RunSweep(kTries, port);
  EXPECT_EQ(result.code, S_OK);
  EXPECT_EQ(result.receiver, &port);
  EXPECT_EQ(result.setting, port.answers_at);
  EXPECT_EQ(port.asked.size(), 4U);
  EXPECT_EQ(port.begun, (std::vector<std::string>{"1/2 9600", "2/2 19200"}));
}

TEST(SweepTest, ASilentPortIsNoReceiver) {
  FakePort port;
  const SweepResult result = RunSweep(kTries, port);
  EXPECT_EQ(result.code, S_FALSE);
  EXPECT_EQ(result.receiver, nullptr);
  EXPECT_EQ(port.asked.size(), 4U);
}

TEST(SweepTest, APortThatFailsEndsIt) {
  FakePort port;
  port.fails_at = 2;
  EXPECT_EQ(RunSweep(kTries, port).code, E_ACCESSDENIED);
  EXPECT_EQ(port.asked.size(), 2U);
}

TEST(SweepTest, ACancellationEndsItBetweenTwoFamilies) {
  FakePort port;
  port.cancelled_at = 1;
  EXPECT_EQ(RunSweep(kTries, port).code, S_FALSE);
  EXPECT_EQ(port.asked.size(), 1U);
}

}  // namespace
}  // namespace cli
