#include "sweep.h"

#include <windows.h>

#include <algorithm>
#include <array>

#include "families.h"

namespace cli {
namespace {

constexpr std::array<unsigned long, 2> kUsualOfAny = {CBR_9600, CBR_115200};
constexpr std::array<unsigned long, 3> kOtherSpeeds = {CBR_57600, CBR_38400, CBR_19200};
constexpr std::array<RtsMode, 3> kRtsModes = {RtsMode::kOn, RtsMode::kHandshake, RtsMode::kOff};

std::vector<unsigned long> SpeedsToTry(EProtocol protocol, unsigned long port_speed) {
  const Family* const family = FindFamily(protocol);
  const auto& usual = family == nullptr ? kUsualOfAny : family->usual_speeds;
  std::vector<unsigned long> speeds(usual.begin(), usual.end());
  const auto add = [&speeds](unsigned long speed) {
    if (std::find(speeds.begin(), speeds.end(), speed) == speeds.end()) speeds.push_back(speed);
  };
  if (port_speed != 0) add(port_speed);
  for (const unsigned long speed : kOtherSpeeds) add(speed);
  return speeds;
}

}  // namespace

std::string InWords(const LineSetting& line) {
  const std::string speed =
      line.speed == 0 ? "the port's current speed" : std::to_string(line.speed) + " bit/s";
  return speed + ", RTS " + RtsWord(line.rts);
}

std::vector<EProtocol> FamiliesOf(EProtocol protocol) {
  if (FindFamily(protocol) != nullptr) return {protocol};
  std::vector<EProtocol> all;
  for (const Family& family : kFamilies) all.push_back(family.protocol);
  return all;
}

std::vector<Try> PlanSweep(EProtocol protocol,
                           unsigned long port_speed,
                           const std::optional<KnownSetting>& known) {
  const std::vector<EProtocol> families = FamiliesOf(protocol);
  std::vector<Try> tries;
  const auto known_family =
      known ? std::find(families.begin(), families.end(), known->family) : families.end();
  if (known_family != families.end()) {
    Try first{known->line, families};
    std::rotate(first.families.begin(),
                first.families.begin() + (known_family - families.begin()),
                first.families.end());
    tries.push_back(std::move(first));
  }
  for (const RtsMode rts : kRtsModes) {
    for (const unsigned long speed : SpeedsToTry(protocol, port_speed)) {
      const LineSetting line{speed, rts};
      if (tries.empty() || tries.front().line != line) tries.push_back({line, families});
    }
  }
  return tries;
}

SweepResult RunSweep(const std::vector<Try>& tries, SweepPort& port) {
  for (size_t i = 0; i < tries.size(); ++i) {
    const LineSetting& line = tries[i].line;
    port.Begin(i + 1, tries.size(), line);
    for (const EProtocol family : tries[i].families) {
      void* receiver = nullptr;
      const long code = port.Ask(line, family, &receiver);
      if (receiver != nullptr) return {S_OK, receiver, {line, family}};
      if (FAILED(code)) return {.code = code};
      if (port.IsCancelled()) return {.code = S_FALSE};
    }
  }
  return {.code = S_FALSE};
}

}  // namespace cli
