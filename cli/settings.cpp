#include "settings.h"

#include <algorithm>
#include <array>
#include <cctype>
#include <charconv>

#include "families.h"

namespace cli {
namespace {

// A word of the command line and the value that it stands for.
struct Word {
  Setting setting;
  std::string_view word;
  unsigned long value;
};

constexpr unsigned long Value(Parity parity) { return static_cast<unsigned long>(parity); }

// The first word of a value is the one that the program itself uses.
constexpr std::array kWords = {
    Word{Setting::kParity, "none", Value(Parity::kNone)},
    Word{Setting::kParity, "odd", Value(Parity::kOdd)},
    Word{Setting::kParity, "even", Value(Parity::kEven)},
    Word{Setting::kStopBits, "1", 1},
    Word{Setting::kStopBits, "2", 2},
    Word{Setting::kRts, "on", 1},
    Word{Setting::kRts, "off", 0},
    Word{Setting::kRts, "enable", 1},
    Word{Setting::kRts, "disable", 0},
};

struct SettingText {
  Setting setting;
  std::string_view word;
  const char* name;
};

constexpr std::array kSettings = {
    SettingText{Setting::kBaud, "baud", "baud rate"},
    SettingText{Setting::kParity, "parity", "parity"},
    SettingText{Setting::kStopBits, "stopbits", "stop bits"},
    SettingText{Setting::kRts, "rts", "RTS line"},
};

const SettingText& TextOf(Setting setting) {
  return *std::find_if(kSettings.begin(), kSettings.end(), [setting](const SettingText& text) {
    return text.setting == setting;
  });
}

std::optional<unsigned long> ParseSpeed(std::string_view text) {
  unsigned long speed = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, speed);
  if (error != std::errc() || stop != end) return std::nullopt;
  if (speed < kSlowestSpeed || speed > kFastestSpeed) return std::nullopt;
  return speed;
}

std::optional<unsigned long> ParseValue(Setting setting, std::string_view text) {
  if (setting == Setting::kBaud) return ParseSpeed(text);
  const auto* const word = std::find_if(kWords.begin(), kWords.end(), [&](const Word& candidate) {
    return candidate.setting == setting && candidate.word == text;
  });
  if (word == kWords.end()) return std::nullopt;
  return word->value;
}

}  // namespace

std::string FamilyName(unsigned family) {
  const Family* const known = FindFamily(family);
  return known == nullptr ? "unknown" : known->name;
}

std::string FamilyWord(unsigned family) {
  std::string word = FamilyName(family);
  word.front() = static_cast<char>(std::tolower(static_cast<unsigned char>(word.front())));
  return word;
}

std::string RtsWord(RtsMode rts) {
  switch (rts) {
    case RtsMode::kHandshake:
      return "handshake";
    case RtsMode::kOn:
      return "on";
    case RtsMode::kOff:
      break;
  }
  return "off";
}

std::optional<RtsMode> ParseRts(std::string_view word) {
  for (const RtsMode rts : {RtsMode::kHandshake, RtsMode::kOn, RtsMode::kOff}) {
    if (word == RtsWord(rts)) return rts;
  }
  return std::nullopt;
}

std::optional<EProtocol> ParseFamily(std::string_view word) {
  for (const Family& family : kFamilies) {
    if (word == FamilyWord(family.protocol)) return family.protocol;
  }
  return std::nullopt;
}

std::optional<SettingChange> ParseSetting(std::string_view setting, std::string_view value) {
  const auto* const known =
      std::find_if(kSettings.begin(), kSettings.end(), [&](const SettingText& candidate) {
        return candidate.word == setting;
      });
  if (known == kSettings.end()) return std::nullopt;
  const auto number = ParseValue(known->setting, value);
  if (!number) return std::nullopt;
  return SettingChange{known->setting, *number};
}

std::string SettingName(Setting setting) { return TextOf(setting).name; }

std::string SettingWord(Setting setting) { return std::string(TextOf(setting).word); }

std::string ValueWord(const SettingChange& change) {
  const auto* const word = std::find_if(kWords.begin(), kWords.end(), [&](const Word& candidate) {
    return candidate.setting == change.setting && candidate.value == change.value;
  });
  return word == kWords.end() ? std::to_string(change.value) : std::string(word->word);
}

std::optional<unsigned long> FamilyNumber(const SettingChange& change, EProtocol family) {
  const Family* const known = FindFamily(family);
  if (known == nullptr) return std::nullopt;
  switch (change.setting) {
    case Setting::kParity:
      if (change.value == Value(Parity::kNone)) return 0;
      return change.value == Value(Parity::kOdd) ? known->odd : known->even;
    case Setting::kStopBits:
      return change.value - 1 + known->one_stop_bit;
    case Setting::kRts:
      if (!known->sets_rts) return std::nullopt;
      return change.value;
    case Setting::kBaud:
      break;
  }
  return change.value;
}

DCB PortSettings(unsigned long speed, RtsMode rts) {
  constexpr BYTE kDataBits = 8;
  DCB settings{};
  settings.DCBlength = sizeof(settings);
  settings.BaudRate = speed;
  settings.fBinary = TRUE;
  settings.ByteSize = kDataBits;
  settings.Parity = NOPARITY;
  settings.StopBits = ONESTOPBIT;
  settings.fRtsControl = RTS_CONTROL_DISABLE;
  if (rts == RtsMode::kOn) settings.fRtsControl = RTS_CONTROL_ENABLE;
  if (rts == RtsMode::kHandshake) {
    settings.fRtsControl = RTS_CONTROL_HANDSHAKE;
    settings.fOutxCtsFlow = TRUE;
  }
  return settings;
}

}  // namespace cli
