#include "simulator/velmar/port_settings.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <span>

#include "simulator/velmar/command_reader.h"

namespace sim {
namespace {

constexpr std::array<std::string_view, 3> kSerialPorts = {"COM1", "COM2", "COM3"};

constexpr std::array<uint32_t, 13> kSpeeds = {
    300, 600, 1200, 2400, 4800, 9600, 19200, 38400, 57600, 115200, 230400, 460800, 921600};

constexpr std::array<std::string_view, 3> kParities = {"N", "E", "O"};
constexpr std::array<std::string_view, 2> kDataBits = {"7", "8"};
constexpr std::array<std::string_view, 2> kStopBits = {"1", "2"};
constexpr std::array<std::string_view, 3> kHandshakes = {"N", "XON", "CTS"};

// Echo, break, the interface modes of both directions, and whether commands are answered.
constexpr std::string_view kRestOfPort = ",OFF,ON,NOVATEL,NOVATEL,ON";

std::optional<uint32_t> ParseSpeed(std::string_view text) {
  uint32_t speed = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, speed);
  if (error != std::errc() || stop != end ||
      std::find(kSpeeds.begin(), kSpeeds.end(), speed) == kSpeeds.end()) {
    return std::nullopt;
  }
  return speed;
}

// Takes the next word of `arguments`, if there is one; it must be one of `choices`.
bool TakeChoice(std::string_view& arguments,
                std::span<const std::string_view> choices,
                std::string& value) {
  if (arguments.empty()) {
    return true;
  }
  const std::string_view word = TakeWord(arguments);
  for (const std::string_view choice : choices) {
    if (SameWord(word, choice)) {
      value = choice;
      return true;
    }
  }
  return false;
}

std::string PortEntry(std::string_view name, const VelmarPortSettings& settings) {
  return "," + std::string(name) + "," + std::to_string(settings.speed) + "," + settings.parity +
         "," + settings.data_bits + "," + settings.stop_bits + "," + settings.handshake +
         std::string(kRestOfPort);
}

}  // namespace

std::optional<VelmarPortSettings> ParsePortSettings(std::string_view arguments) {
  VelmarPortSettings settings;
  const std::optional<uint32_t> speed = ParseSpeed(TakeWord(arguments));
  if (!speed || !TakeChoice(arguments, kParities, settings.parity) ||
      !TakeChoice(arguments, kDataBits, settings.data_bits) ||
      !TakeChoice(arguments, kStopBits, settings.stop_bits) ||
      !TakeChoice(arguments, kHandshakes, settings.handshake) || !arguments.empty()) {
    return std::nullopt;
  }
  settings.speed = *speed;
  return settings;
}

AsciiLog PortConfigLog(std::string_view own_port, const VelmarPortSettings& settings) {
  std::string body = std::to_string(kSerialPorts.size());
  for (const std::string_view name : kSerialPorts) {
    body += PortEntry(name, SameWord(name, own_port) ? settings : VelmarPortSettings{});
  }
  return {"COMCONFIGA", body, true};
}

}  // namespace sim
