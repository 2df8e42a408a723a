#include "settings.h"

#include <gtest/gtest.h>

namespace cli {
namespace {

std::optional<unsigned long> Number(const char* setting, const char* value, EProtocol family) {
  const auto change = ParseSetting(setting, value);
  if (!change) {
    ADD_FAILURE() << setting << " " << value << " was not understood";
    return std::nullopt;
  }
  EXPECT_EQ(SettingWord(change->setting), setting);
  EXPECT_EQ(ValueWord(*change), value);
  return FamilyNumber(*change, family);
}

TEST(SettingsTest, ParityHasTheFamilysNumber) {
  EXPECT_EQ(Number("parity", "none", eProtocolQuorin), 0U);
  EXPECT_EQ(Number("parity", "odd", eProtocolQuorin), 1U);
  EXPECT_EQ(Number("parity", "even", eProtocolQuorin), 2U);
  EXPECT_EQ(Number("parity", "none", eProtocolVelmar), 0U);
  EXPECT_EQ(Number("parity", "odd", eProtocolVelmar), 2U);
  EXPECT_EQ(Number("parity", "even", eProtocolVelmar), 1U);
}

TEST(SettingsTest, StopBitsHaveTheFamilysNumber) {
  EXPECT_EQ(Number("stopbits", "1", eProtocolQuorin), 0U);
  EXPECT_EQ(Number("stopbits", "2", eProtocolQuorin), 1U);
  EXPECT_EQ(Number("stopbits", "1", eProtocolVelmar), 1U);
  EXPECT_EQ(Number("stopbits", "2", eProtocolVelmar), 2U);
}

TEST(SettingsTest, OnlyQuorinControlsRts) {
  EXPECT_EQ(Number("rts", "on", eProtocolQuorin), 1U);
  EXPECT_EQ(Number("rts", "off", eProtocolQuorin), 0U);
  EXPECT_EQ(Number("rts", "on", eProtocolVelmar), std::nullopt);
  EXPECT_EQ(Number("rts", "off", eProtocolVelmar), std::nullopt);
}

TEST(SettingsTest, SpeedsAreTheSameForAll) {
  EXPECT_EQ(Number("baud", "115200", eProtocolQuorin), 115200U);
  EXPECT_EQ(Number("baud", "115200", eProtocolVelmar), 115200U);
}

TEST(SettingsTest, OtherWordsAreRefused) {
  for (const char* value : {"", "0", "-9600", "9600x", "5", "99999999", "99999999999999999999"}) {
    EXPECT_FALSE(ParseSetting("baud", value)) << value;
  }
  EXPECT_FALSE(ParseSetting("parity", "1"));
  EXPECT_FALSE(ParseSetting("stopbits", "3"));
  EXPECT_FALSE(ParseSetting("rts", "handshake"));
  EXPECT_FALSE(ParseSetting("speed", "9600"));
}

TEST(SettingsTest, RtsHasTwoWordsForEach) {
  EXPECT_EQ(ParseSetting("rts", "enable")->value, 1U);
  EXPECT_EQ(ParseSetting("rts", "disable")->value, 0U);
}

TEST(SettingsTest, FamiliesHaveNames) {
  EXPECT_EQ(FamilyName(eProtocolQuorin), "Quorin");
  EXPECT_EQ(FamilyName(eProtocolVelmar), "Velmar");
  EXPECT_EQ(FamilyName(7), "unknown");
  EXPECT_EQ(FamilyWord(eProtocolVelmar), "velmar");
}

TEST(SettingsTest, PortIsOpenedWithPlainSettings) {
  const DCB settings = PortSettings(57600, RtsMode::kOn);
  EXPECT_EQ(settings.BaudRate, 57600U);
  EXPECT_EQ(settings.ByteSize, 8);
  EXPECT_EQ(settings.Parity, NOPARITY);
  EXPECT_EQ(settings.StopBits, ONESTOPBIT);
  EXPECT_TRUE(settings.fBinary);
  EXPECT_EQ(settings.fRtsControl, DWORD{RTS_CONTROL_ENABLE});
  EXPECT_FALSE(settings.fOutxCtsFlow);
}

TEST(SettingsTest, HandshakeListensToCtsToo) {
  const DCB handshake = PortSettings(0, RtsMode::kHandshake);
  EXPECT_EQ(handshake.BaudRate, 0U);
  EXPECT_EQ(handshake.fRtsControl, DWORD{RTS_CONTROL_HANDSHAKE});
  EXPECT_TRUE(handshake.fOutxCtsFlow);
  const DCB off = PortSettings(0, RtsMode::kOff);
  EXPECT_EQ(off.fRtsControl, DWORD{RTS_CONTROL_DISABLE});
  EXPECT_FALSE(off.fOutxCtsFlow);
}

}  // namespace
}  // namespace cli
