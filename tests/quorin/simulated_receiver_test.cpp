// The operations of the driver with the simulated receiver, but for the download.
#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <string_view>

#include "platform/hresult.h"
#include "tests/quorin/simulated_download.h"

using rcvlink::kNotConnected;

namespace {

TEST(QuorinSimulatedReceiver, IsFoundWhateverStateItIsIn) {
  for (const bool echo : {false, true}) {
    for (const size_t piece_size : std::initializer_list<size_t>{0, 1, 3}) {
      sim::QuorinOptions options;
      options.echo = echo;
      options.line.piece_size = piece_size;
      SimulatedDownload bench(options);
      short answer = 0;
      EXPECT_EQ(bench.driver.CheckConnection(nullptr, &answer), S_OK);
      EXPECT_EQ(answer, -1) << bench.Log();
      EXPECT_FALSE(bench.receiver.echoes());
    }
  }
}

TEST(QuorinSimulatedReceiver, IsFoundInTheMiddleOfATransfer) {
  SimulatedDownload bench({});
  constexpr std::string_view kStart = "%1%get,\"A0101.log\":{500,512}\r\n\x15";
  bench.connection->Write(kStart.data(), static_cast<DWORD>(kStart.size()), 3000);
  ASSERT_TRUE(bench.receiver.in_transfer());
  short answer = 0;
  bench.driver.CheckConnection(nullptr, &answer);
  EXPECT_EQ(answer, -1) << bench.Log();
  EXPECT_FALSE(bench.receiver.in_transfer());
}

TEST(QuorinSimulatedReceiver, IsNotFoundAtAnotherSpeed) {
  for (const bool garbled : {false, true}) {
    sim::QuorinOptions options;
    options.line.speed = 57600;
    options.line.garbled = garbled;
    SimulatedDownload bench(options);
    short answer = -1;
    EXPECT_EQ(bench.driver.CheckConnection(nullptr, &answer), S_OK);
    EXPECT_EQ(answer, 0);
  }
}

TEST(QuorinSimulatedReceiver, ReportsItsIdentity) {
  sim::QuorinOptions options;
  options.identity.id = "  ID 7";
  options.identity.model = "HVB5-X";
  SimulatedDownload bench(options);
  CReceiverInfo info{};
  EXPECT_EQ(bench.driver.GetReceiverInfo(nullptr, &info), S_OK);
  EXPECT_STREQ(info.bstrReceiverId, L"ID 7");
  EXPECT_STREQ(info.bstrModel, L"HVB5-X");
  EXPECT_EQ(info.dwVariant, 2U);
  SysFreeString(info.bstrReceiverId);
  SysFreeString(info.bstrModel);
}

TEST(QuorinSimulatedReceiver, ListsAndRemovesItsFiles) {
  SimulatedDownload bench({});
  CFileList files;
  EXPECT_EQ(bench.driver.GetFiles(&files), S_OK);
  ASSERT_EQ(files.Count(), 2);
  EXPECT_STREQ(files.At(0).bstrName, L"A0101.log");
  EXPECT_EQ(files.At(0).dwSize, SimulatedDownload::kUsualSize);
  EXPECT_STREQ(files.At(1).bstrName, L"second.log");
  EXPECT_EQ(bench.driver.DeleteFile(L"A0101.log"), S_OK);
  EXPECT_EQ(bench.driver.DeleteFile(L"A0101.log"), kNotConnected);
  CFileList rest;
  EXPECT_EQ(bench.driver.GetFiles(&rest), S_OK);
  EXPECT_EQ(rest.Count(), 1);
}

TEST(QuorinSimulatedReceiver, ListsLongNamesCut) {
  sim::QuorinOptions options;
  options.faults.long_names = true;
  SimulatedDownload bench(options);
  CFileList files;
  EXPECT_EQ(bench.driver.GetFiles(&files), S_OK);
  ASSERT_EQ(files.Count(), 2);
  EXPECT_EQ(std::wstring(files.At(0).bstrName), L"A0101.log" + std::wstring(23, L'_'));
  EXPECT_EQ(files.At(0).dwSize, SimulatedDownload::kUsualSize);
}

TEST(QuorinSimulatedReceiver, TakesItsPortSettings) {
  SimulatedDownload bench({});
  EXPECT_EQ(bench.driver.DCSetRcvParity(2), S_OK);
  EXPECT_EQ(bench.driver.DCSetRcvStopbits(1), S_OK);
  EXPECT_EQ(bench.driver.DCSetRcvRTSControl(0), S_OK);
  const sim::PortSettings& settings = bench.receiver.port_settings('a');
  EXPECT_EQ(settings.find("parity")->second, "even");
  EXPECT_EQ(settings.find("stops")->second, "2");
  EXPECT_EQ(settings.find("rts")->second, "off");
  EXPECT_EQ(bench.driver.DCSetRcvBaudrate(57600), S_OK);
  EXPECT_EQ(bench.receiver.speed(), 57600U);
}

}  // namespace
