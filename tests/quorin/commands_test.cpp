#include "quorin/commands.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <string>

#include "platform/hresult.h"
#include "tests/support/report_capture.h"
#include "tests/support/scripted_connection.h"

using rcvlink::kNotConnected;

using namespace QuorinCommands;
using testing::ElementsAre;

namespace {

constexpr uint32_t kFlags = 4098;

using MakeCommand = std::function<std::unique_ptr<CQuorinCommand>()>;

template <typename Command, typename... Arguments>
MakeCommand Make(Arguments... arguments) {
  return [=] { return std::make_unique<Command>(arguments...); };
}

struct CommandCase {
  std::string name;
  MakeCommand make;
  std::string text;
  uint32_t flags;
  bool traced;
  uint32_t read_timeout_ms = 30000;
};

class QuorinCommandSet : public testing::TestWithParam<CommandCase> {};

TEST_P(QuorinCommandSet, IsSentAsItShould) {
  const auto command = GetParam().make();
  EXPECT_EQ(std::string(command->GetCommand(), command->GetCommand() + command->GetCommandLength()),
            GetParam().text);
  EXPECT_EQ(command->GetFlags(), GetParam().flags);
  EXPECT_EQ(command->GetWriteTimeout(), 3000U);
  EXPECT_EQ(command->GetReadTimeout(), GetParam().read_timeout_ms);
}

TEST_P(QuorinCommandSet, BeginsWithoutAnOutcome) {
  const auto command = GetParam().make();
  EXPECT_EQ(command->Result(), S_OK);
  EXPECT_EQ(command->Kind(), ReplyKind::kNone);
  EXPECT_EQ(command->GetReply(), nullptr);
  EXPECT_FALSE(command->IsCancelled(nullptr));
}

TEST_P(QuorinCommandSet, IsTracedWhenItIsMade) {
  const ReportCapture report;
  const auto command = GetParam().make();
  if (GetParam().traced) {
    EXPECT_THAT(report.Lines(), ElementsAre(GetParam().name + "::" + GetParam().name));
  } else {
    EXPECT_THAT(report.Lines(), ElementsAre());
  }
}

std::string NameOf(const testing::TestParamInfo<CommandCase>& info) { return info.param.name; }

INSTANTIATE_TEST_SUITE_P(
    WithoutReply,
    QuorinCommandSet,
    testing::Values(
        CommandCase{"CEchoOffCmd", Make<CEchoOffCmd>(kFlags), "#OFF#\r\n", 0x0001, true},
        CommandCase{"CDisableEchoCmd",
                    Make<CDisableEchoCmd>(3, kFlags),
                    "set,/par/dev/ser/d/echo,/dev/null\r\n",
                    0x0001,
                    true},
        CommandCase{"CChangeBaudRateCmd",
                    Make<CChangeBaudRateCmd>(0, 115200U, kFlags),
                    "set,/par/dev/ser/a/rate,115200\r\n",
                    0x0001,
                    false},
        CommandCase{"CChangeParityCmd",
                    Make<CChangeParityCmd>(1, uint8_t{1}, kFlags),
                    "set,/par/dev/ser/b/parity,odd\r\n",
                    0x0001,
                    false},
        CommandCase{"CChangeRTSSignalCmd",
                    Make<CChangeRTSSignalCmd>(2, true, kFlags),
                    "set,/par/dev/ser/c/rts,on\r\n",
                    0x0001,
                    false},
        CommandCase{"CChangeStopbitsCmd",
                    Make<CChangeStopbitsCmd>(3, true, kFlags),
                    "set,/par/dev/ser/d/stops,2\r\n",
                    0x0001,
                    false}),
    NameOf);

INSTANTIATE_TEST_SUITE_P(
    WithReply,
    QuorinCommandSet,
    testing::Values(
        CommandCase{"CPingCmd", Make<CPingCmd>(2U), "\r\n", 0x1002, true, 8000},
        CommandCase{"CGetPortCmd", Make<CGetPortCmd>(kFlags), "print,/cur/term\r\n", 4098, true},
        CommandCase{"CGetFileListCmd",
                    Make<CGetFileListCmd>(kFlags),
                    "print,/log/&[name,size,time]\r\n",
                    4098,
                    true},
        CommandCase{"CDeleteFileCmd",
                    Make<CDeleteFileCmd>(std::string("A%s 100%.log"), kFlags),
                    "remove,A%s 100%.log\r\n",
                    4098,
                    true},
        CommandCase{"CGetFileCmd",
                    Make<CGetFileCmd>(std::string("A0101.log"), 4294967295U, kFlags),
                    "get,\"A0101.log\":{500,4294967295}\r\n",
                    4098,
                    true},
        CommandCase{"CGetFileSizeCmd",
                    Make<CGetFileSizeCmd>(std::string("A0101.log"), kFlags),
                    "print,/log/A0101.log&size\r\n",
                    4098,
                    true},
        CommandCase{"CGetReceiverIDCmd",
                    Make<CGetReceiverIDCmd>(kFlags),
                    "print,/par/rcvid\r\n",
                    4098,
                    true},
        CommandCase{"CGetReceiverModelCmd",
                    Make<CGetReceiverModelCmd>(kFlags),
                    "print,/par/rcv/model\r\n",
                    4098,
                    true},
        CommandCase{"CSetBoudRateCmd",
                    Make<CSetBoudRateCmd>(4294967295U, kFlags),
                    "set,cur/term/rate,4294967295\r\n",
                    4098,
                    true}),
    NameOf);

std::string TextOf(const CQuorinCommand& command) {
  return std::string(command.GetCommand(), command.GetCommand() + command.GetCommandLength());
}

TEST(QuorinPortSetting, NamesThePort) {
  EXPECT_EQ(TextOf(CDisableEchoCmd(0, kFlags)), "set,/par/dev/ser/a/echo,/dev/null\r\n");
  EXPECT_EQ(TextOf(CDisableEchoCmd(1, kFlags)), "set,/par/dev/ser/b/echo,/dev/null\r\n");
  EXPECT_EQ(TextOf(CChangeBaudRateCmd(2, 9600, kFlags)), "set,/par/dev/ser/c/rate,9600\r\n");
  EXPECT_EQ(TextOf(CChangeParityCmd(3, 2, kFlags)), "set,/par/dev/ser/d/parity,even\r\n");
  EXPECT_EQ(TextOf(CChangeRTSSignalCmd(0, true, kFlags)), "set,/par/dev/ser/a/rts,on\r\n");
  EXPECT_EQ(TextOf(CChangeStopbitsCmd(1, true, kFlags)), "set,/par/dev/ser/b/stops,2\r\n");
}

TEST(QuorinPortSetting, HasAWordForEachParity) {
  const auto text = [](uint8_t parity) { return TextOf(CChangeParityCmd(0, parity, kFlags)); };
  EXPECT_EQ(text(0), "set,/par/dev/ser/a/parity,N\r\n");
  EXPECT_EQ(text(1), "set,/par/dev/ser/a/parity,odd\r\n");
  EXPECT_EQ(text(2), "set,/par/dev/ser/a/parity,even\r\n");
  EXPECT_EQ(text(3), "set,/par/dev/ser/a/parity,N\r\n");
  EXPECT_EQ(text(255), "set,/par/dev/ser/a/parity,N\r\n");
}

TEST(QuorinPortSetting, HasAWordForOff) {
  EXPECT_EQ(TextOf(CChangeRTSSignalCmd(0, false, kFlags)), "set,/par/dev/ser/a/rts,off\r\n");
}

TEST(QuorinPortSetting, CountsOneStopBit) {
  EXPECT_EQ(TextOf(CChangeStopbitsCmd(0, false, kFlags)), "set,/par/dev/ser/a/stops,1\r\n");
}

TEST(QuorinPortSetting, PrintsTheRateWithASign) {
  EXPECT_EQ(TextOf(CChangeBaudRateCmd(0, 4294967295, kFlags)), "set,/par/dev/ser/a/rate,-1\r\n");
}

TEST(QuorinGetFile, AsksForBlocksOfTheLength) {
  EXPECT_EQ(TextOf(CGetFileCmd("a b", 512, kFlags)), "get,\"a b\":{500,512}\r\n");
}

// The port index that a reply gives.
class QuorinPortIndex : public testing::TestWithParam<std::pair<const char*, int>> {};

TEST_P(QuorinPortIndex, IsThatOfTheFirstPortOfTheAlphabet) {
  CGetPortCmd command(kFlags);
  command.SetReply(GetParam().first);
  EXPECT_EQ(command.PortIndex(), GetParam().second);
}

INSTANTIATE_TEST_SUITE_P(Replies,
                         QuorinPortIndex,
                         testing::Values(std::pair("/dev/ser/a", 0),
                                         std::pair("/dev/ser/b", 1),
                                         std::pair("/dev/ser/c", 2),
                                         std::pair("/dev/ser/d", 3),
                                         std::pair("/cur/term/a", 0),
                                         std::pair("/d /c /b", 1),
                                         std::pair("/d/c/b/a", 0),
                                         std::pair("/dev/usb", 3),
                                         std::pair("ser/a", 0),
                                         std::pair("/ser/A", -1),
                                         std::pair("a b c d", -1),
                                         std::pair("/", -1),
                                         std::pair("/e", -1),
                                         std::pair("", -1)));

TEST(QuorinPortIndex, IsNoneWithoutAReply) { EXPECT_EQ(CGetPortCmd(kFlags).PortIndex(), -1); }

TEST(QuorinPortIndex, IsNoneOnceTheReplyIsFreed) {
  CGetPortCmd command(kFlags);
  command.SetReply("/dev/ser/a");
  command.FreeReply();
  EXPECT_EQ(command.PortIndex(), -1);
}

TEST(QuorinPortIndex, IsFoundAtTheVeryEndOfALongReply) {
  CGetPortCmd command(kFlags);
  command.SetReply((std::string(4000, '.') + "/c").c_str());
  EXPECT_EQ(command.PortIndex(), 2);
}

class QuorinFileSize : public testing::TestWithParam<std::pair<const char*, int>> {};

TEST_P(QuorinFileSize, IsTheNumberThatTheReplyBeginsWith) {
  CGetFileSizeCmd command("f", kFlags);
  command.SetReply(GetParam().first);
  EXPECT_EQ(command.Size(), GetParam().second);
}

INSTANTIATE_TEST_SUITE_P(Replies,
                         QuorinFileSize,
                         testing::Values(std::pair("1234", 1234),
                                         std::pair("0", 0),
                                         std::pair(" \t77", 77),
                                         std::pair("12ab", 12),
                                         std::pair("12,34", 12),
                                         std::pair("007", 7),
                                         std::pair("+5", 5),
                                         std::pair("-5", -5),
                                         std::pair("2147483647", 2147483647),
                                         std::pair("", 0),
                                         std::pair("none", 0),
                                         std::pair("{12}", 0)));

TEST(QuorinFileSize, IsZeroWithoutAReply) { EXPECT_EQ(CGetFileSizeCmd("f", kFlags).Size(), 0); }

TEST(QuorinFileSize, IsReadFromTheReplyAlone) {
  CGetFileSizeCmd command("f", kFlags);
  const std::string bytes = "12345";
  command.AppendReply(bytes.data(), 3);
  EXPECT_EQ(command.Size(), 123);
}

// Identity and model are read alike.
template <typename Command>
class QuorinText : public testing::Test {
 protected:
  static std::wstring TextOfReply(const std::string& reply) {
    Command command(kFlags);
    command.AppendReply(reply.data(), static_cast<uint32_t>(reply.size()));
    return command.Text();
  }
};

using TextCommands = testing::Types<CGetReceiverIDCmd, CGetReceiverModelCmd>;
TYPED_TEST_SUITE(QuorinText, TextCommands);

TYPED_TEST(QuorinText, IsTheReply) { EXPECT_EQ(this->TextOfReply("QR 00421"), L"QR 00421"); }

TYPED_TEST(QuorinText, LosesItsLeadingWhiteSpace) {
  EXPECT_EQ(this->TextOfReply(" \t\r\n\v\f QR"), L"QR");
}

TYPED_TEST(QuorinText, KeepsWhatTrails) {
  EXPECT_EQ(this->TextOfReply("QR 1 \t\r\n"), L"QR 1 \t\r\n");
}

TYPED_TEST(QuorinText, MayBeNothing) {
  EXPECT_EQ(this->TextOfReply(""), L"");
  EXPECT_EQ(this->TextOfReply(" \r\n"), L"");
  EXPECT_EQ(this->TextOfReply(std::string(1, '\0')), L"");
}

TYPED_TEST(QuorinText, IsReadInTheCodePageOfTheThread) {
  const std::string bytes = "\xC4\xE9 1";
  wchar_t expected[8] = {};
  MultiByteToWideChar(CP_THREAD_ACP, 0, bytes.c_str(), -1, expected, 8);
  EXPECT_EQ(this->TextOfReply(bytes), expected);
}

TYPED_TEST(QuorinText, IsEmptyWithoutAReply) { EXPECT_EQ(TypeParam(kFlags).Text(), L""); }

class QuorinPing : public testing::TestWithParam<std::pair<ReplyKind, HRESULT>> {};

TEST_P(QuorinPing, SucceedsOnTheReplyKindOnly) {
  CPingCmd ping(kFlags);
  bool done = false;
  EXPECT_EQ(ping.ParseReply("x", 1, GetParam().first, &done), GetParam().second);
  EXPECT_EQ(ping.Result(), GetParam().second);
  EXPECT_EQ(ping.Kind(), GetParam().first);
  EXPECT_TRUE(done);
}

INSTANTIATE_TEST_SUITE_P(Kinds,
                         QuorinPing,
                         testing::Values(std::pair(ReplyKind::kBlank, kNotConnected),
                                         std::pair(ReplyKind::kReply, S_OK),
                                         std::pair(ReplyKind::kError, kNotConnected),
                                         std::pair(ReplyKind::kNone, kNotConnected)));

TEST(QuorinPing, IsSatisfiedByAnEmptyBody) {
  CPingCmd ping(kFlags);
  bool done = false;
  EXPECT_EQ(ping.ParseReply("", 0, ReplyKind::kReply, &done), S_OK);
}

TEST(QuorinPing, FailsWhenAReadGivesNothing) {
  ScriptedConnection connection;
  connection.GiveRead("");
  CPingCmd ping(kFlags);
  EXPECT_EQ(ping.Execute(&connection, nullptr), kNotConnected);
  EXPECT_EQ(ping.Result(), kNotConnected);
}

class ForgetfulPing : public CPingCmd {
 public:
  ForgetfulPing() : CPingCmd(kFlags) {}
  HRESULT AppendReply(const void*, uint32_t) override { return E_OUTOFMEMORY; }
};

TEST(QuorinPing, FailsWhenItCannotKeepTheBody) {
  ForgetfulPing ping;
  bool done = false;
  EXPECT_EQ(ping.ParseReply("x", 1, ReplyKind::kReply, &done), kNotConnected);
  EXPECT_EQ(ping.Result(), kNotConnected);
}

}  // namespace
