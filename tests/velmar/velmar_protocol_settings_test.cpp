// The driver's port settings.
#include <string>
#include <vector>

#include "tests/velmar/velmar_driver.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

const std::string kConfig = "log comconfiga once\r";

std::string ConfigReply(const std::string& port = "COM1") {
  return kOkPrompt +
         AsciiLog("COMCONFIGA", "1," + port + ",9600,E,7,2,XON,ON,OFF,NOVATEL,NOVATEL,ON");
}

TEST_F(VelmarDriver, ChangesOneSettingOfItsPort) {
  answers = {{kConfig, ConfigReply()}};
  EXPECT_EQ(driver.DCSetRcvBaudrate(115200), S_OK);
  EXPECT_EQ(driver.DCSetRcvParity(2), S_OK);
  EXPECT_EQ(driver.DCSetRcvStopbits(1), S_OK);
  EXPECT_THAT(connection->Writes(),
              ElementsAre(kConfig,
                          "COM 115200 E 7 2 XON\r",
                          kConfig,
                          "COM 9600 O 7 2 XON\r",
                          kConfig,
                          "COM 9600 E 7 1 XON\r"));
}

TEST_F(VelmarDriver, SendsNothingWithoutAPortName) {
  answers = {{kConfig, ConfigReply("COM9")}};
  EXPECT_EQ(driver.DCSetRcvBaudrate(115200), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig));
}

TEST_F(VelmarDriver, AnAbortEndsAPortSettingBeforeItIsSent) {
  answers = {{kConfig, ConfigReply()}};
  driver.Abort();
  EXPECT_EQ(driver.DCSetRcvParity(1), S_FALSE);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig));
}

TEST_F(VelmarDriver, APortSettingClearsTheAbort) {
  answers = {{kConfig, ConfigReply()}};
  driver.Abort();
  EXPECT_EQ(driver.DCSetRcvBaudrate(57600), S_FALSE);
  EXPECT_TRUE(IsFreeForOthers(driver));
  EXPECT_EQ(driver.DCSetRcvBaudrate(57600), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig, kConfig, "COM 57600 E 7 2 XON\r"));
}

// The abort is checked only between the two commands: one that comes with the second stays set for
// the next operation.
TEST_F(VelmarDriver, AnAbortWithTheSettingItselfOutlivesIt) {
  answers = {{kConfig, ConfigReply()}};
  before_command = [&](const std::string& command) {
    if (command.starts_with("COM ")) driver.Abort();
  };
  EXPECT_EQ(driver.DCSetRcvStopbits(1), S_OK);
  before_command = nullptr;
  EXPECT_EQ(driver.DeleteFile(L"a"), S_FALSE);
  EXPECT_EQ(driver.DeleteFile(L"a"), S_OK);
}

TEST_F(VelmarDriver, APortSettingThatCannotBeReadGivesItsCode) {
  answers = {{kConfig, kOkPrompt + "<COMCONFIG"}};
  EXPECT_EQ(driver.DCSetRcvBaudrate(1), E_NOTIMPL);
  EXPECT_EQ(driver.DCSetRcvParity(1), E_NOTIMPL);
  EXPECT_EQ(driver.DCSetRcvStopbits(1), E_NOTIMPL);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig, kConfig, kConfig));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, APortSettingThatCannotBeSentGivesItsCode) {
  answers = {{kConfig, ConfigReply()}, {"COM 9600 N 7 2 XON\r", kOkPrompt + "<"}};
  EXPECT_EQ(driver.DCSetRcvParity(0), E_NOTIMPL);
  EXPECT_TRUE(IsFreeForOthers(driver));
}

TEST_F(VelmarDriver, APortSettingThatIsRefusedCountsAsDone) {
  for (const std::string& refusal : {kErrorPrompt, kErrorTextPrompt, std::string()}) {
    answers = {{kConfig, ConfigReply()}, {"COM 9600 O 7 2 XON\r", refusal}};
    EXPECT_EQ(driver.DCSetRcvParity(2), S_OK);
  }
}

TEST_F(VelmarDriver, SendsItsSettingsAsTheyAre) {
  answers = {{kConfig, ConfigReply()}};
  EXPECT_EQ(driver.DCSetRcvBaudrate(4294967295), S_OK);
  EXPECT_EQ(driver.DCSetRcvBaudrate(0), S_OK);
  EXPECT_EQ(driver.DCSetRcvParity(0), S_OK);
  EXPECT_EQ(driver.DCSetRcvParity(1), S_OK);
  EXPECT_EQ(driver.DCSetRcvParity(255), S_OK);
  EXPECT_EQ(driver.DCSetRcvStopbits(255), S_OK);
  std::vector<std::string> sent;
  for (const std::string& command : connection->Writes()) {
    if (command != kConfig) sent.push_back(command);
  }
  EXPECT_THAT(sent,
              ElementsAre("COM 4294967295 E 7 2 XON\r",
                          "COM 0 E 7 2 XON\r",
                          "COM 9600 N 7 2 XON\r",
                          "COM 9600 E 7 2 XON\r",
                          "COM 9600 N 7 2 XON\r",
                          "COM 9600 E 7 255 XON\r"));
}

// The header of the log names the port in use.
TEST_F(VelmarDriver, ChangesThePortThatItUses) {
  const std::string ports =
      "2,COM1,9600,N,8,1,N,ON,OFF,NOVATEL,NOVATEL,ON,COM2,38400,O,7,2,CTS,ON,OFF,NOVATEL,NOVATEL,"
      "ON";
  answers = {{kConfig, kOkPrompt + AsciiLog("COMCONFIGA", ports, 0, "COM2")}};
  EXPECT_EQ(driver.DCSetRcvBaudrate(115200), S_OK);
  EXPECT_THAT(connection->Writes(), ElementsAre(kConfig, "COM 115200 O 7 2 CTS\r"));
}

TEST_F(VelmarDriver, PortSettingsReportNoProgress) {
  answers = {{kConfig, ConfigReply()}};
  driver.DCSetRcvParity(1);
  EXPECT_THAT(percents, IsEmpty());
}

TEST_F(VelmarDriver, PortSettingsHoldTheConnection) {
  answers = {{kConfig, ConfigReply()}};
  std::vector<bool> free;
  before_command = [&](const std::string&) { free.push_back(IsFreeForOthers(driver)); };
  driver.DCSetRcvBaudrate(1);
  driver.DCSetRcvParity(1);
  driver.DCSetRcvStopbits(1);
  EXPECT_THAT(free, ElementsAre(false, false, false, false, false, false));
  EXPECT_TRUE(IsFreeForOthers(driver));
}

}  // namespace
