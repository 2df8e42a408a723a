#include "velmar/commands.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
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

// A directory that is larger than the receive buffer ends with what fitted in.
TEST_F(VelmarExchange, ADirectoryLargerThanTheBufferIsCut) {
  CGetFileListCmd command;
  std::string reply = kOkPrompt;
  for (int i = 199; i >= 0; --i) {
    reply += AsciiLog("DIRENTA", "\"" + std::to_string(i) + "\",1,0,20120101,000000", i);
  }
  EXPECT_EQ(Run(command, {reply}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_DATA);
  EXPECT_GT(command.Entries().size(), 50u);
  EXPECT_LT(command.Entries().size(), 200u);
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
}

// --- FILETRANSFER

struct Chunks : CReadFileCmdCallback {
  HRESULT OnDataReceived(void* context) override {
    EXPECT_EQ(context, this);
    chunks.emplace_back(command->GetData(), command->GetData() + command->GetDataSize());
    return chunks.size() == fail_at ? E_ACCESSDENIED : S_OK;
  }
  const CReadFileCmd* command = nullptr;
  std::vector<std::string> chunks;
  size_t fail_at = 0;
};

class FileTransfer : public VelmarExchange {
 protected:
  HRESULT Transfer(const std::vector<std::string>& reads) { return Run(command, reads); }

  Chunks chunks;
  CReadFileCmd command{&chunks, &chunks};
  FileTransfer() { chunks.command = &command; }
};

TEST_F(FileTransfer, ChunksArriveInOrderWhateverThePieces) {
  const std::string reply = kOkPrompt + BinaryLog{std::string(1024, 'a'), 2}.Bytes() +
                            BinaryLog{std::string(1024, 'b'), 1}.Bytes() +
                            BinaryLog{"the end", 0}.Bytes();
  for (const size_t piece : {size_t{1}, size_t{13}, size_t{100}, size_t{1072}, reply.size()}) {
    ScriptedConnection pieces;
    for (size_t i = 0; i < reply.size(); i += piece) pieces.GiveRead(reply.substr(i, piece));
    Chunks got;
    CReadFileCmd read(&got, &got);
    got.command = &read;
    EXPECT_EQ(read.Execute(&pieces, nullptr), S_OK);
    EXPECT_EQ(read.Response(), RESPONSE_DATA);
    EXPECT_THAT(got.chunks, ElementsAre(std::string(1024, 'a'), std::string(1024, 'b'), "the end"));
    EXPECT_EQ(read.GetReplyLength(), 0u);  // a streamed reply is not kept
  }
}

TEST_F(FileTransfer, MessageLengthsOutsideTheirRangeMeanAFullChunk) {
  for (const int length : {0, 4, 7, 1033, 2000}) {
    ScriptedConnection once;
    once.GiveRead(kOkPrompt + BinaryLog{std::string(3000, 'x'), 0, length}.Bytes());
    Chunks got;
    CReadFileCmd read(&got, &got);
    got.command = &read;
    EXPECT_EQ(read.Execute(&once, nullptr), S_OK);
    ASSERT_EQ(got.chunks.size(), 1u) << length;
    EXPECT_EQ(got.chunks[0].size(), 1024u) << length;
  }
}

TEST_F(FileTransfer, MessageLengthsInTheirRangeTellTheChunk) {
  for (const int length : {8, 9, 1031, 1032}) {
    ScriptedConnection once;
    once.GiveRead(kOkPrompt + BinaryLog{std::string(3000, 'x'), 0, length}.Bytes());
    Chunks got;
    CReadFileCmd read(&got, &got);
    got.command = &read;
    EXPECT_EQ(read.Execute(&once, nullptr), S_OK);
    ASSERT_EQ(got.chunks.size(), 1u) << length;
    EXPECT_EQ(got.chunks[0].size(), static_cast<size_t>(length) - 8) << length;
  }
}

// Whatever the lengths claim, the exchange ends and nothing outside the buffer is touched.
TEST_F(FileTransfer, LyingLengthsEnd) {
  for (const uint8_t header : std::vector<uint8_t>{0, 1, 28, 255}) {
    for (const int length : {0, 8, 1032, 9000, 65535}) {
      for (const uint16_t sequence : std::vector<uint16_t>{0, 1, 65535}) {
        ScriptedConnection liar;
        std::string reply = kOkPrompt;
        for (int i = 0; i < 12; ++i) {
          reply += BinaryLog{std::string(1024, 'x'), sequence, length, header}.Bytes();
        }
        liar.GiveRead(reply);
        Chunks got;
        CReadFileCmd read(&got, &got);
        got.command = &read;
        EXPECT_EQ(read.Execute(&liar, nullptr), S_OK);
        for (const std::string& chunk : got.chunks) EXPECT_LE(chunk.size(), 1024u);
      }
    }
  }
}

TEST_F(FileTransfer, AFailingHostEndsIt) {
  chunks.fail_at = 2;
  const std::string chunk = BinaryLog{"data", 1}.Bytes();
  EXPECT_EQ(Transfer({kOkPrompt + chunk + chunk + chunk}), E_ACCESSDENIED);
  EXPECT_EQ(chunks.chunks.size(), 2u);
  EXPECT_EQ(clock.paused, 0u);
}

TEST_F(FileTransfer, WithoutACallbackTheLastChunkStays) {
  CReadFileCmd read(nullptr, nullptr);
  EXPECT_EQ(Run(read, {kOkPrompt + BinaryLog{"abcd", 1}.Bytes() + BinaryLog{"efghi", 0}.Bytes()}),
            S_OK);
  EXPECT_EQ(std::string(read.GetData(), read.GetData() + read.GetDataSize()), "efghi");
}

// With its checksum such a chunk is shorter than the 8 bytes that are waited for.
TEST_F(FileTransfer, ALastChunkOfLessThanFourBytesIsWaitedForInVain) {
  EXPECT_EQ(Transfer({kOkPrompt + BinaryLog{"data", 1}.Bytes() + BinaryLog{"abc", 0}.Bytes()}),
            S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_THAT(chunks.chunks, ElementsAre("data"));
}

TEST_F(FileTransfer, ASequenceThatNeverEndsTimesOut) {
  const std::string chunk = BinaryLog{"data", 5}.Bytes();
  EXPECT_EQ(Transfer({kOkPrompt + chunk, chunk}), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_EQ(chunks.chunks.size(), 2u);
}

}  // namespace
