#include <gtest/gtest.h>
#include <stdlib.h>
#include <time.h>

#include <string>
#include <tuple>

#include "simulator/quorin/directory.h"
#include "tests/simulator/session.h"

namespace sim {
namespace {

using Exchange = std::tuple<std::string, std::string>;

class ExchangeTest : public testing::TestWithParam<Exchange> {};

TEST_P(ExchangeTest, IsAnsweredToTheByte) {
  Session session;
  const auto& [command, reply] = GetParam();
  EXPECT_EQ(session.Ask(command), reply);
}

INSTANTIATE_TEST_SUITE_P(
    Tagged,
    ExchangeTest,
    testing::Values(
        Exchange("%1%\r\n", "RE003%1%\r\n"),
        Exchange("%1%\n", "RE003%1%\r\n"),
        Exchange("%123456%\n", "RE008%123456%\r\n"),
        Exchange("%2%print,/cur/term\r\n", "RE00D%2%/dev/ser/a\r\n"),
        Exchange("%3%print,/par/rcvid\r\n", "RE00A%3%QR00421\r\n"),
        Exchange("%4%print,/par/rcv/model\r\n", "RE00B%4%HVA3-G3T\r\n"),
        Exchange("%5%print,/log/A0101.log&size\r\n", "RE007%5%1100\r\n"),
        Exchange("%5%print,/log/none&size\r\n", "ER011%5%{no such file}\r\n"),
        Exchange("%6%print,/par/none\r\n", "ER013%6%{unknown object}\r\n"),
        Exchange("%7%nonsense\r\n", "ER014%7%{unknown command}\r\n"),
        Exchange("%8%get,\"A0101.log\":{500,512}\r\n", "RE003%8%\r\n"),
        Exchange("%8%get,\"none\":{500,512}\r\n", "ER011%8%{no such file}\r\n"),
        Exchange("%8%get,A0101.log:{500,512}\r\n", "ER014%8%{wrong arguments}\r\n"),
        Exchange("%8%get,\"A0101.log\":{500,0}\r\n", "ER014%8%{wrong arguments}\r\n"),
        Exchange("%8%get,\"A0101.log\":{500,4097}\r\n", "ER014%8%{wrong arguments}\r\n"),
        Exchange("%8%get,\"A0101.log\":{500,512}x\r\n", "ER014%8%{wrong arguments}\r\n"),
        Exchange("%8%get,\"A0101.log\":{,512}\r\n", "ER014%8%{wrong arguments}\r\n"),
        Exchange("%9%remove,none\r\n", "ER011%9%{no such file}\r\n"),
        Exchange("%9%dm\r\n", "RE003%9%\r\n"),
        Exchange("%9%#OFF#\r\n", "RE003%9%\r\n"),
        Exchange("%9%set,/par/dev/ser/a/parity,odd\r\n", "RE003%9%\r\n"),
        Exchange("%9%set,/par/dev/ser/a/parity,O\r\n", "ER010%9%{wrong value}\r\n"),
        Exchange("%9%set,/par/dev/ser/e/parity,odd\r\n", "ER013%9%{unknown object}\r\n"),
        Exchange("%9%set,cur/term/rate,9601\r\n", "ER010%9%{wrong value}\r\n"),
        Exchange("%9%set,cur/term/rate\r\n", "ER012%9%{value missing}\r\n")));

INSTANTIATE_TEST_SUITE_P(Untagged,
                         ExchangeTest,
                         testing::Values(Exchange("\n", ""),
                                         Exchange("#OFF#\r\n", ""),
                                         Exchange("dm\r\n", ""),
                                         Exchange("set,/par/dev/ser/a/rts,on\r\n", ""),
                                         Exchange("set,/par/dev/ser/a/rts,5\r\n", ""),
                                         Exchange("print,/par/rcvid\r\n", "RE007QR00421\r\n"),
                                         Exchange("nonsense\r\n", "ER011{unknown command}\r\n")));

INSTANTIATE_TEST_SUITE_P(Leftovers,
                         ExchangeTest,
                         testing::Values(Exchange("%1%%2%print,/par/rcvid\r\n",
                                                  "RE00A%2%QR00421\r\n"),
                                         Exchange("\x15\x06%1%\r\n", "RE003%1%\r\n"),
                                         Exchange("#%1%\r\n", "RE003%1%\r\n"),
                                         Exchange("##OFF#\r\n", ""),
                                         Exchange("%1%\r\n%2%\r\n", "RE003%1%\r\nRE003%2%\r\n")));

TEST(CommandsTest, ACommandMayComeByteByByte) {
  Session session;
  for (const char byte : std::string("%1%print,/par/rcvid\r")) {
    EXPECT_EQ(session.Ask(std::string(1, byte)), "");
  }
  EXPECT_EQ(session.Ask("\n"), "RE00A%1%QR00421\r\n");
}

TEST(CommandsTest, AnEndlessLineIsRefusedAndDiscarded) {
  Session session;
  EXPECT_EQ(session.Ask(std::string(100'000, 'x') + "\r\n"), "ER011{unknown command}\r\n");
  EXPECT_EQ(session.Ask("%1%\r\n"), "RE003%1%\r\n");
}

TEST(CommandsTest, IdentityComesFromTheOptions) {
  QuorinOptions options;
  options.identity = {"ID 7", "M-9", 'c', ""};
  Session session(options);
  EXPECT_EQ(session.Ask("%1%print,/par/rcvid\r\n"), "RE007%1%ID 7\r\n");
  EXPECT_EQ(session.Ask("%1%print,/par/rcv/model\r\n"), "RE006%1%M-9\r\n");
  EXPECT_EQ(session.Ask("%1%print,/cur/term\r\n"), "RE00D%1%/dev/ser/c\r\n");
}

TEST(CommandsTest, APortMayHaveANameWithoutLetter) {
  QuorinOptions options;
  options.identity.port_name = "/dev/usb";
  Session session(options);
  EXPECT_EQ(session.Ask("%1%print,/cur/term\r\n"), "RE00B%1%/dev/usb\r\n");
}

TEST(CommandsTest, SettingsAreRememberedPortByPort) {
  Session session;
  session.Say("set,/par/dev/ser/a/parity,even\r\nset,/par/dev/ser/b/parity,N\r\n");
  session.Say("set,/par/dev/ser/a/stops,2\r\nset,/par/dev/ser/a/rts,off\r\n");
  session.Say("set,/par/dev/ser/a/rts,maybe\r\n");
  EXPECT_EQ(session.receiver.port_settings('a'),
            (PortSettings{{"parity", "even"}, {"stops", "2"}, {"rts", "off"}}));
  EXPECT_EQ(session.receiver.port_settings('b'), (PortSettings{{"parity", "N"}}));
}

TEST(CommandsTest, AFileCanBeRemovedOnce) {
  Session session;
  EXPECT_EQ(session.Ask("%1%remove,A0101.log\r\n"), "RE003%1%\r\n");
  EXPECT_EQ(session.Ask("%2%remove,A0101.log\r\n"), "ER011%2%{no such file}\r\n");
  EXPECT_EQ(session.Ask("%3%print,/log/&[name,size,time]\r\n"), "RE005%3%{}\r\n");
}

class EchoTest : public testing::TestWithParam<std::string> {};

TEST_P(EchoTest, EndsWithTheCommandThatTurnsItOff) {
  QuorinOptions options;
  options.echo = true;
  Session session(options);
  EXPECT_EQ(session.Ask("%1"), "%1");
  EXPECT_EQ(session.Ask("%\r\n"), "%\r\nRE003%1%\r\n");
  EXPECT_EQ(session.Ask(GetParam()), GetParam());
  EXPECT_EQ(session.Ask("%2%\r\n"), "RE003%2%\r\n");
}

INSTANTIATE_TEST_SUITE_P(Ways,
                         EchoTest,
                         testing::Values("#OFF#\r\n", "set,/par/dev/ser/a/echo,/dev/null\r\n"));

TEST(OtherPortEchoTest, GoesOnWhenAnotherPortIsSet) {
  QuorinOptions options;
  options.echo = true;
  Session session(options);
  session.Ask("set,/par/dev/ser/b/echo,/dev/null\r\n");
  EXPECT_TRUE(session.receiver.echoes());
}

// Sets the time zone of the process for one test.
class ListTest : public testing::TestWithParam<std::string> {
 protected:
  void SetUp() override {
    setenv("TZ", GetParam().c_str(), 1);
    tzset();
  }
  void TearDown() override {
    unsetenv("TZ");
    tzset();
  }
};

TEST_P(ListTest, HasNameSizeAndLocalTimeOfEachFile) {
  // 1988-01-02 00:00:05 in local time is a day and five seconds after the zero.
  tm wall{};
  wall.tm_year = 88;
  wall.tm_mday = 2;
  wall.tm_sec = 5;
  wall.tm_isdst = -1;
  FileStore files;
  files.Add("first", TestPayload(10), mktime(&wall));
  files.Add("middle", TestPayload(0), 0);
  files.Add("end", TestPayload(3), mktime(&wall) - 5);
  Session session({}, files);
  EXPECT_EQ(session.Ask("%1%print,/log/&[name,size,time]\r\n"),
            "RE014%1%{{first,10,86405}\r\n"
            "RE00F%1%{middle,0,0}\r\n"
            "RE011%1%{end,3,86400}}\r\n");
}

INSTANTIATE_TEST_SUITE_P(Zones,
                         ListTest,
                         testing::Values("UTC", "EST5EDT", "Asia/Tokyo", "<+0330>-3:30"));

TEST(DirectoryTest, OneFileOpensAndClosesTheList) {
  const std::string time = std::to_string(SecondsSince1988(1'700'000'000));
  Session session;
  const std::string reply = session.Ask("%1%print,/log/&[name,size,time]\r\n");
  EXPECT_EQ(reply, "RE020%1%{{A0101.log,1100," + time + "}}\r\n");
}

TEST(DirectoryTest, LongNamesExceedTheHostsField) {
  QuorinOptions options;
  options.faults.long_names = true;
  Session session(options);
  const std::string reply = session.Ask("%1%print,/log/&[name,size,time]\r\n");
  EXPECT_NE(reply.find("{{A0101.log" + std::string(31, '_') + ",1100,"), std::string::npos);
}

TEST(DirectoryTest, AWrongSizeIsReportedEverywhere) {
  QuorinOptions options;
  options.faults.sizes = {{"A0101.log", 99}};
  Session session(options);
  EXPECT_EQ(session.Ask("%1%print,/log/A0101.log&size\r\n"), "RE005%1%99\r\n");
  const std::string list = session.Ask("%2%print,/log/&[name,size,time]\r\n");
  EXPECT_NE(list.find("{{A0101.log,99,"), std::string::npos);
  EXPECT_EQ(SeenBlock(session.StartTransfer()).type, 2U);
}

}  // namespace
}  // namespace sim
