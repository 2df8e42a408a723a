#include "velmar/commands.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

#include "tests/support/manual_clock.h"
#include "tests/support/report_capture.h"
#include "tests/support/scripted_connection.h"
#include "tests/velmar/velmar_replies.h"

namespace {

using namespace VelmarCommands;
using testing::ElementsAre;

std::string Text(const CReceiverCmd& command) {
  return {command.GetCommand(), command.GetCommand() + command.GetCommandLength()};
}

TEST(VelmarCommands, HaveTheirTextsFlagsAndTimeOuts) {
  const auto expect = [](const CVelmarCommand& command,
                         const std::string& text,
                         uint32_t flags = 0,
                         uint32_t read_timeout = 30000) {
    EXPECT_EQ(Text(command), text);
    EXPECT_EQ(command.GetFlags(), flags) << text;
    EXPECT_EQ(command.GetWriteTimeout(), 500u) << text;
    EXPECT_EQ(command.GetReadTimeout(), read_timeout) << text;
    EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN) << text;
  };
  expect(CGetReceiverInfoCmd(), "log versiona once\r");
  expect(CGetFileListCmd(), "log direnta once\r");
  expect(CGetFileHeaderCmd(), "log filehdra\r");
  expect(CLogConfigCommand(), "log comconfiga once\r");
  expect(CReadFileCmd(nullptr, nullptr), "log filetransferb\r", 0x1000);
  expect(CSetCurrentFileCmd("a b.pdc"), "currentfile a b.pdc all\r");
  expect(CSetCurrentFileCmd(nullptr), "currentfile\r");
  expect(CDeleteFileCmd("a.pdc"), "del file a.pdc\r");
  expect(CRenameFileCmd("a", "b"), "rename a b\r");
  expect(CSetPortParamsCmd("COM1", 115200, 2, 8, 1, 2), "COM 115200 O 8 1 CTS\r");
  expect(CSetPortParamsCmd("COM1", 4294967295, 1, 7, 2, 1), "COM 4294967295 E 7 2 XON\r");
  expect(CSetPortParamsCmd("COM1", 0, 3, 8, 1, 3), "COM 0 N 8 1 N\r");
  expect(CSetInterfacemodeCommand(), "interfacemode thisport novatel novatel on\r", 1);
  expect(CUnlogAllCommand(), "unlogall thisport\r", 0, 8000);
}

TEST(VelmarCommands, WriteTheirNameWhenMade) {
  const ReportCapture report;
  CGetReceiverInfoCmd{};
  CGetFileListCmd{};
  CGetFileHeaderCmd{};
  CLogConfigCommand{};
  CReadFileCmd(nullptr, nullptr);
  CSetCurrentFileCmd("a");  // writes nothing
  CDeleteFileCmd("a");
  CRenameFileCmd("a", "b");
  CSetPortParamsCmd("a", 1, 1, 1, 1, 1);
  CSetInterfacemodeCommand{};
  CUnlogAllCommand{};  // neither does this
  EXPECT_THAT(report.Lines(),
              ElementsAre("CGetReceiverInfoCmd::CGetReceiverInfoCmd",
                          "CGetFileListCmd::CGetFileListCmd",
                          "CGetFileHeaderCmd::CGetFileHeaderCmd",
                          "CLogConfigCommand::CLogConfigCommand",
                          "CReadFileCmd::CReadFileCmd",
                          "CDeleteFileCmd::CDeleteFileCmd",
                          "CRenameFileCmd::CRenameFileCmd",
                          "CSetPortParamsCmd::CSetPortParamsCmd",
                          "CSetInterfacemodeCommand::CSetInterfacemodeCommand"));
}

class VelmarExchange : public testing::Test {
 protected:
  HRESULT Run(CVelmarCommand& command, const std::vector<std::string>& reads) {
    for (const std::string& bytes : reads) connection.GiveRead(bytes);
    return command.Execute(&connection, nullptr);
  }

  ManualClock clock;
  ScriptedConnection connection;
};

TEST_F(VelmarExchange, AnAcknowledgementAloneDoesNotEndTheWaitForALog) {
  CGetReceiverInfoCmd command;
  EXPECT_EQ(Run(command, {kOkPrompt}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_THAT(
      connection.calls,
      ElementsAre("flush", "write log versiona once\r", "read 8192 30000", "read 8179 30000"));
}

TEST_F(VelmarExchange, ALogInPiecesOfAnySizeIsRead) {
  const std::string reply =
      kOkPrompt +
      AsciiLog("VERSIONA", "1,GPSCARD,\"OEM\",\"SN,1\",\"HW\",\"SW\",\"B\",\"D\",\"T\"");
  for (size_t piece = 1; piece < reply.size(); piece += 7) {
    ScriptedConnection pieces;
    for (size_t i = 0; i < reply.size(); i += piece) pieces.GiveRead(reply.substr(i, piece));
    CGetReceiverInfoCmd command;
    EXPECT_EQ(command.Execute(&pieces, nullptr), S_OK);
    EXPECT_EQ(command.Response(), RESPONSE_DATA) << piece;
    EXPECT_EQ(command.Version().serial_number, L"SN,1") << piece;
    EXPECT_EQ(command.Version().model, L"OEM");
  }
}

std::string Version(const std::string& body) { return kOkPrompt + AsciiLog("VERSIONA", body); }

const std::string kVersionBody = "1,GPSCARD,\"OEM\",\"SN\",\"HW\",\"SW\",\"B\",\"D\",\"T\"";
const std::string kPorts =
    "2,COM1,9600,N,8,1,N,ON,OFF,NOVATEL,NOVATEL,ON,COM2,57600,E,7,2,XON,ON,OFF,NOVATEL,NOVATEL,ON";

std::string FileHeader(const std::string& size) {
  std::string body = "\"a.pdc\"," + size;
  for (int i = 2; i < 23; ++i) body += ",0";
  return kOkPrompt + AsciiLog("FILEHDRA", body);
}

std::string Directory(int files) {
  std::string reply = kOkPrompt;
  for (int i = files - 1; i >= 0; --i) {
    reply +=
        AsciiLog("DIRENTA", "\"" + std::to_string(i) + "\"," + std::to_string(i) + ",0,1,1", i);
  }
  return reply;
}

// Executes a command for each place at which its reply can be cut in two.
template <typename Command, typename Check>
void AtEverySplit(const std::string& reply, Check check) {
  for (size_t cut = 1; cut < reply.size(); ++cut) {
    SCOPED_TRACE(cut);
    ScriptedConnection connection;
    connection.GiveRead(reply.substr(0, cut));
    connection.GiveRead(reply.substr(cut));
    Command command;
    EXPECT_EQ(command.Execute(&connection, nullptr), S_OK);
    check(command);
    // The kept reply repeats the bytes that were held when the second part came.
    const std::string kept(command.GetReply(), command.GetReply() + command.GetReplyLength());
    const bool both = connection.AnswersLeft() == 0;
    EXPECT_EQ(kept, both ? reply.substr(0, cut) + reply : reply.substr(0, cut));
  }
}

TEST_F(VelmarExchange, AVersionIsReadWhereverItIsCut) {
  AtEverySplit<CGetReceiverInfoCmd>(Version(kVersionBody), [](const auto& command) {
    EXPECT_EQ(command.Response(), RESPONSE_DATA);
    EXPECT_EQ(command.Version().model, L"OEM");
    EXPECT_EQ(command.Version().serial_number, L"SN");
    EXPECT_EQ(command.Version().hardware_version, L"HW");
    EXPECT_EQ(command.Version().software_version, L"SW");
  });
}

TEST_F(VelmarExchange, ADirectoryIsReadWhereverItIsCut) {
  AtEverySplit<CGetFileListCmd>(Directory(3), [](auto& command) {
    EXPECT_EQ(command.Response(), RESPONSE_DATA);
    ASSERT_EQ(command.Entries().size(), 3u);
    EXPECT_EQ(command.Entries()[0].name, L"2");
    EXPECT_EQ(command.Entries()[2].name, L"0");
  });
}

TEST_F(VelmarExchange, AFileHeaderIsReadWhereverItIsCut) {
  AtEverySplit<CGetFileHeaderCmd>(FileHeader("123456"), [](const auto& command) {
    EXPECT_EQ(command.Response(), RESPONSE_DATA);
    EXPECT_EQ(command.FileHeader().file_name, L"\"a.pdc\"");
    EXPECT_EQ(command.FileHeader().file_size, 123456);
  });
}

TEST_F(VelmarExchange, AConfigurationIsReadWhereverItIsCut) {
  const std::string reply = kOkPrompt + AsciiLog("COMCONFIGA", kPorts, 0, "COM2");
  AtEverySplit<CLogConfigCommand>(reply, [](const auto& command) {
    EXPECT_EQ(command.Response(), RESPONSE_DATA);
    EXPECT_EQ(command.Config().port_name, L"COM2");
    EXPECT_EQ(command.Config().baud, 57600);
    EXPECT_EQ(command.Config().parity, 1);
    EXPECT_EQ(command.Config().data_bits, 7);
    EXPECT_EQ(command.Config().stop_bits, 2);
    EXPECT_EQ(command.Config().handshake, 1);
  });
}

TEST_F(VelmarExchange, AnAcknowledgementIsReadWhereverItIsCut) {
  AtEverySplit<CUnlogAllCommand>(
      kOkPrompt, [](const auto& command) { EXPECT_EQ(command.Response(), RESPONSE_OK); });
  AtEverySplit<CUnlogAllCommand>(
      kErrorPrompt, [](const auto& command) { EXPECT_EQ(command.Response(), RESPONSE_ERROR); });
}

TEST_F(VelmarExchange, AVersionWithoutComponentsIsCompleteAndEmpty) {
  CGetReceiverInfoCmd command;
  EXPECT_EQ(Run(command, {Version("0")}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  EXPECT_EQ(connection.calls.size(), 3u);  // it does not wait for more
  EXPECT_EQ(command.Version().model, L"");
  EXPECT_EQ(command.Version().serial_number, L"");
  EXPECT_EQ(command.Version().hardware_version, L"");
  EXPECT_EQ(command.Version().software_version, L"");
}

// The type is data as soon as some has arrived; only the fields show that it is incomplete.
TEST_F(VelmarExchange, ALogThatStaysIncompleteEndsWithTheTimeOut) {
  const auto run = [&](CVelmarCommand& command, const std::string& reply) {
    connection.calls.clear();
    EXPECT_EQ(Run(command, {reply}), S_OK);
    EXPECT_EQ(connection.calls.size(), 4u) << reply;
    return command.Response();
  };
  CGetReceiverInfoCmd version;
  EXPECT_EQ(run(version, Version("2" + kVersionBody.substr(1))), RESPONSE_DATA);
  EXPECT_EQ(version.Version().model, L"");
  CGetReceiverInfoCmd many;
  EXPECT_EQ(run(many, Version("2147483647" + kVersionBody.substr(1))), RESPONSE_DATA);
  CGetReceiverInfoCmd open;
  EXPECT_EQ(run(open, kOkPrompt + "#VERSIONA,COM1,0,55,F,1888,4,0,0,1;\"1"), RESPONSE_INCOMPLETE);
  CGetFileListCmd files;
  EXPECT_EQ(run(files, kOkPrompt + AsciiLog("DIRENTA", "a,1,0,1,1", 1)), RESPONSE_DATA);
  EXPECT_EQ(files.Entries().size(), 1u);
  CGetFileListCmd quoted;
  EXPECT_EQ(run(quoted, kOkPrompt + "#\"DIRENTA,COM1"), RESPONSE_OK);
  CGetFileHeaderCmd header;
  EXPECT_EQ(run(header, kOkPrompt + AsciiLog("FILEHDRA", "\"a\",5,0")), RESPONSE_DATA);
  EXPECT_EQ(header.FileHeader().file_size, 0);
  CLogConfigCommand config;
  EXPECT_EQ(run(config, kOkPrompt + AsciiLog("COMCONFIGA", "1,COM1,9600")), RESPONSE_DATA);
  EXPECT_EQ(config.Config().port_name, L"");
}

TEST_F(VelmarExchange, ADirectoryDistinguishesALogThatIsCutOffFromOneThatIsNotTheLast) {
  CGetFileListCmd command;
  const std::string log = AsciiLog("DIRENTA", "a,1,0,1,1", 1);
  const auto parse = [&](const std::string& text) {
    bool done = true;
    uint32_t consumed = 0;
    const HRESULT result =
        command.ParseAsciiLog(text.data(), static_cast<uint32_t>(text.size()), &done, &consumed);
    EXPECT_FALSE(done);
    EXPECT_EQ(command.Response(), RESPONSE_DATA);
    return result;
  };
  EXPECT_EQ(parse(log), S_OK);
  EXPECT_EQ(parse(log + "#DIRENTA,COM1"), S_FALSE);
}

TEST_F(VelmarExchange, ARefusalWithoutTextEndsTheWaitForALog) {
  CGetReceiverInfoCmd command;
  EXPECT_EQ(Run(command, {kErrorPrompt}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_ERROR);
  EXPECT_EQ(connection.calls.size(), 3u);
}

TEST_F(VelmarExchange, ARefusalWithTextEndsTheWaitForALog) {
  CGetFileListCmd command;
  EXPECT_EQ(Run(command, {kErrorTextPrompt}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_EQ(connection.calls.size(), 3u);
}

TEST_F(VelmarExchange, StrayBytesEndTheWaitForALog) {
  CGetFileListCmd command;
  EXPECT_EQ(Run(command, {"x" + Directory(1)}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_EQ(connection.calls.size(), 3u);
}

// A log after a line end is not found, however long the command waits.
TEST_F(VelmarExchange, ALogAfterALineEndIsIgnored) {
  CGetReceiverInfoCmd command;
  const std::string log = AsciiLog("VERSIONA", kVersionBody);
  EXPECT_EQ(Run(command, {kOkPrompt + "\r\n", log}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_EQ(connection.calls.size(), 5u);
}

TEST_F(VelmarExchange, ALogOfAnotherNameIsReadByItsFields) {
  CGetReceiverInfoCmd command;
  EXPECT_EQ(Run(command, {kOkPrompt + AsciiLog("OTHERA", kVersionBody)}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  EXPECT_EQ(command.Version().model, L"OEM");
}

TEST_F(VelmarExchange, ALogOfAPortIsThatOfTheHeader) {
  for (const char* port : {"COM1", "COM2"}) {
    CLogConfigCommand command;
    EXPECT_EQ(Run(command, {kOkPrompt + AsciiLog("COMCONFIGA", kPorts, 0, port)}), S_OK);
    EXPECT_EQ(command.Config().port_name, port == std::string("COM1") ? L"COM1" : L"COM2");
    EXPECT_EQ(command.Config().baud, port == std::string("COM1") ? 9600 : 57600);
  }
}

TEST_F(VelmarExchange, WithoutPortsThereIsNoConfiguration) {
  for (const char* count : {"0", "-1", "-2147483648"}) {
    CLogConfigCommand command;
    connection.calls.clear();
    EXPECT_EQ(Run(command, {kOkPrompt + AsciiLog("COMCONFIGA", count)}), S_OK);
    EXPECT_EQ(command.Response(), RESPONSE_DATA) << count;
    EXPECT_EQ(command.Config().port_name, L"") << count;
    EXPECT_EQ(connection.calls.size(), 3u) << count;
  }
}

TEST_F(VelmarExchange, ADirectoryIsReadFromItsFirstByteEachTime) {
  CGetFileListCmd command;
  const std::string first = AsciiLog("DIRENTA", "\"a\",1,0,20120101,000000", 1);
  const std::string second = AsciiLog("DIRENTA", "\"b\",2,0,20120101,000000", 0);
  EXPECT_EQ(Run(command, {kOkPrompt, first, second}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  ASSERT_EQ(command.Entries().size(), 2u);
  EXPECT_EQ(command.Entries()[1].name, L"b");
}

TEST_F(VelmarExchange, AGapInTheDirectoryIsAnError) {
  CGetFileListCmd command;
  const std::string reply = kOkPrompt + AsciiLog("DIRENTA", "a,1,0,20120101,000000", 3) +
                            AsciiLog("DIRENTA", "b,2,0,20120101,000000", 1);
  EXPECT_EQ(Run(command, {reply}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_ERROR);
  EXPECT_EQ(command.Entries().size(), 2u);
}

// A directory that is larger than the receive buffer ends with what fits into it.
TEST_F(VelmarExchange, ADirectoryLargerThanTheBufferIsCut) {
  constexpr size_t kBuffer = 8192;
  const std::string reply = Directory(200);
  ASSERT_GT(reply.size(), kBuffer);
  size_t fitting = 0;
  for (size_t end = 0; (end = reply.find("*12345678\r\n", end)) != std::string::npos; ++fitting) {
    end += 11;
    if (end > kBuffer) break;
  }
  for (const size_t piece : {size_t{100}, size_t{4000}, kBuffer, reply.size()}) {
    ScriptedConnection pieces;
    for (size_t i = 0; i < reply.size(); i += piece) pieces.GiveRead(reply.substr(i, piece));
    CGetFileListCmd command;
    EXPECT_EQ(command.Execute(&pieces, nullptr), S_OK);
    EXPECT_EQ(command.Response(), RESPONSE_DATA);
    EXPECT_EQ(command.Entries().size(), fitting) << piece;
    EXPECT_EQ(command.Entries().front().name, L"199");
    EXPECT_GT(pieces.AnswersLeft(), 0u);
  }
}

TEST_F(VelmarExchange, ADirectoryThatJustFillsTheBufferIsWhole) {
  constexpr size_t kBuffer = 8192;
  std::string reply = Directory(80);
  ASSERT_LT(reply.size(), kBuffer);
  const std::string padding(kBuffer - reply.size(), 'x');
  reply.insert(reply.find("\"79\"") + 1, padding);
  CGetFileListCmd command;
  EXPECT_EQ(Run(command, {reply.substr(0, 8191), reply.substr(8191)}), S_OK);
  EXPECT_EQ(command.Entries().size(), 80u);
  EXPECT_EQ(connection.calls.back(), "read 1 30000");
}

TEST_F(VelmarExchange, AHeaderOfTooFewFieldsIsIncomplete) {
  CGetFileHeaderCmd command;
  EXPECT_EQ(Run(command, {kOkPrompt + "#FILEHDRA,COM1,0;body*crc\r\n"}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_INCOMPLETE);
}

TEST_F(VelmarExchange, TheConfigurationIsThatOfThePortOfTheLog) {
  CLogConfigCommand command;
  const std::string port = ",COM2,57600,E,8,1,XON,ON,OFF,NOVATEL,NOVATEL,ON";
  EXPECT_EQ(Run(command, {kOkPrompt + AsciiLog("COMCONFIGA", "1" + port, 0, "COM2")}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  EXPECT_EQ(command.Config().baud, 57600);
}

TEST_F(VelmarExchange, TheCurrentFileIsSetOnceAcknowledged) {
  CSetCurrentFileCmd command("a");
  EXPECT_EQ(Run(command, {kOkPrompt}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_EQ(connection.calls.size(), 3u);
  EXPECT_EQ(Run(command, {kErrorPrompt}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_ERROR);
  EXPECT_EQ(connection.calls.size(), 6u);
}

TEST_F(VelmarExchange, TheCurrentFileIsRefusedWithAText) {
  CSetCurrentFileCmd command("a");
  EXPECT_EQ(Run(command, {kErrorTextPrompt}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_EQ(connection.calls.size(), 3u);
}

TEST_F(VelmarExchange, TheCurrentFileIsNotSetBeforeThePromptHasEnded) {
  for (size_t cut = 1; cut < kOkPrompt.size(); ++cut) {
    ScriptedConnection pieces;
    pieces.GiveRead(kOkPrompt.substr(0, cut));
    pieces.GiveRead(kOkPrompt.substr(cut));
    CSetCurrentFileCmd command("a");
    EXPECT_EQ(command.Execute(&pieces, nullptr), S_OK);
    EXPECT_EQ(command.Response(), RESPONSE_OK) << cut;
    EXPECT_EQ(pieces.AnswersLeft(), 0u) << cut;
  }
}

// For a command that reads a log after its acknowledgement and needs more.
TEST_F(VelmarExchange, TheCurrentFileIsSetOnceDataHasCome) {
  struct WithData : CSetCurrentFileCmd {
    using CSetCurrentFileCmd::CSetCurrentFileCmd;
    HRESULT ParseLogBody(const char*, uint32_t, bool* done, uint32_t*) override {
      SetResponse(RESPONSE_DATA);
      *done = false;
      return S_FALSE;
    }
  } command("a");
  EXPECT_EQ(Run(command, {kOkPrompt + AsciiLog("A", "body")}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  EXPECT_EQ(connection.calls.size(), 3u);
}

TEST_F(VelmarExchange, TheCurrentFileFailsWithAnAbbreviatedLog) {
  CSetCurrentFileCmd command("a");
  EXPECT_EQ(Run(command, {kOkPrompt + "<"}), E_NOTIMPL);
}

}  // namespace
