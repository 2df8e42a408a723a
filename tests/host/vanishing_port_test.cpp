// Ports that vanish during an operation, and receivers that stop answering.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <functional>
#include <ostream>
#include <string>

#include "rcvlink.h"
#include "tests/host/support/file_list.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/support/content.h"

namespace {

constexpr const char* kReading = "CQuorinCommand::Execute - start reading";

struct Operation {
  std::string name;
  std::function<long(const host::Receiver&)> run;
};

std::ostream& operator<<(std::ostream& out, const Operation& operation) {
  return out << operation.name;
}

std::string OperationName(const testing::TestParamInfo<Operation>& operation) {
  return operation.param.name;
}

long Delete(const host::Receiver& receiver) {
  wchar_t name[] = L"A.log";
  return devapi::DeleteFileW(receiver.get(), name);
}

long List(const host::Receiver& receiver) { return host::FileList(receiver.get()).result(); }

long Identify(const host::Receiver& receiver) { return receiver.Identify().result; }

long Download(const host::Receiver& receiver) {
  MemoryStream stream;
  return receiver.Download(L"A.log", stream);
}

class ApiVanishingPort : public testing::TestWithParam<Operation> {};

TEST_P(ApiVanishingPort, IsAFailure) {
  bed::SimulatedPort port({"quorin"}, {{"A.log", "a"}});
  {
    const host::Receiver receiver(port);
    const host::Report report;
    port.Pause();
    auto operation = host::OnThread([&] { return GetParam().run(receiver); });
    report.WaitFor(kReading);
    port.Kill();
    const long result = operation.get();
    EXPECT_TRUE(FAILED(result)) << result;
    EXPECT_TRUE(FAILED(GetParam().run(receiver))) << "it has gone for good";
    EXPECT_EQ(receiver.Check(), 0);
  }
  port.Start({"quorin"});
  const host::Receiver receiver(port);
  EXPECT_EQ(receiver.Identify().result, S_OK);
}

INSTANTIATE_TEST_SUITE_P(Operations,
                         ApiVanishingPort,
                         testing::Values(Operation{"Identify", Identify},
                                         Operation{"List", List},
                                         Operation{"Delete", Delete},
                                         Operation{"Download", Download}),
                         OperationName);

TEST(ApiVanishingReceiver, EndsATransfer) {
  bed::SimulatedPort port({"quorin", "--vanish-after", "3"}, {{"A.log", Content(5000)}});
  {
    const host::Receiver receiver(port);
    MemoryStream stream;
    const long result = receiver.Download(L"A.log", stream);
    EXPECT_TRUE(FAILED(result)) << result;
    EXPECT_TRUE(stream.bytes == Content(5000).substr(0, 4 * 512));
  }
  port.Kill();
  port.Start({"quorin"});
  const host::Receiver receiver(port);
  EXPECT_EQ(receiver.Identify().result, S_OK);
}

// Waits for the whole time-out of a reply, for three receivers at once.
//
// The third one does not follow to the higher speed of a download, so it would not receive the
// command that puts the speed back either: an abort ends the wait for that reply.
TEST(ApiSilence, IsATimeOut) {
  bed::SimulatedPort first({"quorin"});
  bed::SimulatedPort second({"quorin"});
  const bed::SimulatedPort third({"quorin", "--keep-speed"}, {{"A.log", "a"}});
  const host::Receiver identified(first);
  const host::Receiver listed(second);
  const host::Receiver downloaded(third);
  const host::Report report;
  auto download = host::OnThread([&] { return Download(downloaded); });
  report.WaitFor("CSerialConnection::SetSpeed - changing of baudrate [9600 -> 115200]");
  first.Pause();
  second.Pause();
  auto identify = host::OnThread([&] { return Identify(identified); });
  auto list = host::OnThread([&] { return List(listed); });
  EXPECT_EQ(identify.get(), host::kTimedOut);
  EXPECT_EQ(list.get(), host::kTimedOut);
  report.WaitFor("CSetBoudRateCmd::CSetBoudRateCmd");
  EXPECT_EQ(devapi::Abort(downloaded.get()), S_OK);
  EXPECT_EQ(download.get(), S_FALSE);
  EXPECT_TRUE(
      report.Has("CQuorinProtocol::DownloadFile - download [A.log] is failed [0x800705B4]"));
  EXPECT_TRUE(report.Has("CSerialConnection::SetSpeed - changing of baudrate [115200 -> 9600]"));

  first.Resume();
  second.Resume();
  auto first_again = host::OnThread([&] { return Identify(identified); });
  auto second_again = host::OnThread([&] { return Identify(listed); });
  EXPECT_EQ(Identify(downloaded), S_OK);
  EXPECT_EQ(first_again.get(), S_OK);
  EXPECT_EQ(second_again.get(), S_OK);
}

}  // namespace
