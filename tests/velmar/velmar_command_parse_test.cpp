// The parse operations of a command, one by one.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <tuple>
#include <vector>

#include "tests/support/guarded_bytes.h"
#include "tests/velmar/velmar_replies.h"
#include "velmar/commands.h"
#include "velmar/velmar_command.h"

namespace {

using namespace VelmarCommands;

// Keeps the body that it is given.
class Bodies : public CVelmarCommand {
 public:
  explicit Bodies(uint32_t flags = 0) : CVelmarCommand("x", flags) {}
  HRESULT ParseLogBody(const char* bytes, uint32_t length, bool* done, uint32_t*) override {
    body = std::string(bytes, length);
    *done = true;
    return E_PENDING;  // a result to be returned
  }
  std::string body = "none";
};

TEST(VelmarCommandParse, ParsesNothingOfNothing) {
  CVelmarCommand command("x", 0);
  command.ParseAcknowledgement("<OK");
  uint32_t consumed = 0;
  bool done = true;
  EXPECT_EQ(command.ParseReply(nullptr, 5, &done, &consumed), S_FALSE);
  EXPECT_FALSE(done);
  done = true;
  EXPECT_EQ(command.ParseReply("\r", 0, &done, &consumed), S_FALSE);
  EXPECT_FALSE(done);
  EXPECT_EQ(command.Response(), RESPONSE_OK);  // unchanged
  EXPECT_EQ(command.ParseReply("x", 1, &done, &consumed), S_FALSE);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
}

TEST(VelmarCommandParse, AnAnswerThatIsNoneIsUnknownAlsoAfterOne) {
  CLogConfigCommand command;
  uint32_t consumed = 0;
  bool done = true;
  EXPECT_EQ(command.ParseReply(
                kOkPrompt.data(), static_cast<uint32_t>(kOkPrompt.size()), &done, &consumed),
            S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_OK);
  EXPECT_FALSE(done);
  done = true;
  EXPECT_EQ(command.ParseReply("x", 1, &done, &consumed), S_OK);
  EXPECT_EQ(command.Response(), RESPONSE_UNKNOWN);
  EXPECT_FALSE(done);
}

TEST(VelmarCommandParse, AStreamedReplyConsumesThePromptOnceMoreHasCome) {
  for (const uint32_t flags : {0u, kStreamed}) {
    Bodies command(flags);
    bool done = false;
    uint32_t consumed = 0;
    const auto length = static_cast<uint32_t>(kOkPrompt.size());
    EXPECT_EQ(command.ParseResponse(kOkPrompt.data(), length, &done, &consumed), S_OK);
    EXPECT_TRUE(done);
    EXPECT_EQ(consumed, 0u);
    const std::string more = kOkPrompt + "\xAA";
    EXPECT_EQ(command.ParseResponse(more.data(), length + 1, &done, &consumed), S_FALSE);
    EXPECT_FALSE(done);
    EXPECT_EQ(consumed, flags == kStreamed ? length : 0u);
    EXPECT_EQ(command.Response(), RESPONSE_OK);
  }
}

TEST(VelmarCommandParse, AsciiLogsNeedTheirHeader) {
  for (const std::string log : {"",
                                "#A",
                                "#A,COM1,0,3,4,5,6,7,8,9",
                                "#A,COM1,0,3,4,5,6,7,8;body",
                                "#A,COM1,0;b",
                                "a,b,c;d,e,f,g"}) {
    Bodies command;
    bool done = true;
    uint32_t consumed = 0;
    const auto length = static_cast<uint32_t>(log.size());
    EXPECT_EQ(command.ParseAsciiLog(log.data(), length, &done, &consumed), S_FALSE) << log;
    EXPECT_FALSE(done) << log;
    EXPECT_EQ(command.Response(), RESPONSE_INCOMPLETE) << log;
    EXPECT_EQ(command.body, "none") << log;
    EXPECT_EQ(command.Header().message_name, L"") << log;
  }
}

TEST(VelmarCommandParse, AsciiLogsAreHeaderAndBody) {
  Bodies command;
  bool done = false;
  uint32_t consumed = 0;
  const std::string log = "#NAMEA,COM3,-4,x,\"y,z\",1888,405078.5,7,8,9;a,b;c*crc\r\n";
  const auto length = static_cast<uint32_t>(log.size());
  EXPECT_EQ(command.ParseAsciiLog(log.data(), length, &done, &consumed), E_PENDING);
  EXPECT_EQ(command.body, "a,b;c*crc\r\n");
  EXPECT_EQ(command.Header().message_name, L"#NAMEA");
  EXPECT_EQ(command.Port(), L"COM3");
  EXPECT_EQ(command.Header().sequence, -4);
  EXPECT_EQ(command.Header().gps_week, 1888);
  EXPECT_EQ(command.Header().gps_seconds, 405078.5);
}

// As long as its three lengths say. The body always begins after 36 bytes.
TEST(VelmarCommandParse, BinaryLogsAreWaitedForByTheirLengths) {
  for (const uint8_t header : std::vector<uint8_t>{0, 28, 36, 255}) {
    for (const int message : {0, 8, 11, 60, 300}) {
      std::string log = BinaryLog{"abc", 7, message, header}.Bytes();
      const size_t told = static_cast<size_t>(message) + 4 + header;
      const size_t needed = std::max<size_t>(told, 36);
      log.resize(needed, '.');
      for (const size_t missing : {size_t{0}, size_t{1}, needed}) {
        SCOPED_TRACE(std::to_string(header) + " " + std::to_string(message));
        const GuardedBytes guarded(std::string_view(log).substr(0, needed - missing));
        Bodies command;
        bool done = true;
        uint32_t consumed = 0;
        const HRESULT result = command.ParseBinaryLog(
            guarded.View().data(), static_cast<uint32_t>(guarded.View().size()), &done, &consumed);
        EXPECT_EQ(result, missing == 0 ? E_PENDING : S_FALSE);
        EXPECT_EQ(done, missing == 0);
        EXPECT_EQ(command.body, missing == 0 ? log.substr(36) : "none");
        EXPECT_EQ(consumed, 0u);
      }
    }
  }
}

TEST(VelmarCommandParse, TheHeaderIsEmptyBeforeALog) {
  const CVelmarCommand command("x", 0);
  EXPECT_EQ(command.Header().message_name, L"");
  EXPECT_EQ(command.Header().port, L"");
  EXPECT_EQ(command.Header().sequence, 0);
  EXPECT_EQ(command.Header().gps_week, 0);
  EXPECT_EQ(command.Header().gps_seconds, 0);
}

TEST(VelmarCommandParse, ACommandWithoutABodyOfItsOwnEndsWithAnyLog) {
  CVelmarCommand command("x", 0);
  bool done = false;
  uint32_t consumed = 0;
  EXPECT_EQ(command.ParseLogBody("abc", 3, &done, &consumed), S_OK);
  EXPECT_TRUE(done);
  EXPECT_EQ(consumed, 0u);
}

TEST(VelmarCommandParse, AcknowledgementsAreParsedAsText) {
  const auto parse = [](const char* text) {
    CVelmarCommand command("x", 0);
    const int answer = command.ParseAcknowledgement(text);
    return std::tuple<int, int, std::string>(answer, command.Response(), command.ErrorText());
  };
  EXPECT_EQ(parse(nullptr), std::tuple(0, 3, ""));
  EXPECT_EQ(parse(""), std::tuple(0, 3, ""));
  EXPECT_EQ(parse("\r\n"), std::tuple(0, 3, ""));
  EXPECT_EQ(parse("\r\n<"), std::tuple(0, 3, ""));
  EXPECT_EQ(parse("\r\n<OK"), std::tuple(1, 0, ""));
  EXPECT_EQ(parse("<OK\r\n"), std::tuple(1, 0, ""));
  EXPECT_EQ(parse("<OK\r\nx"), std::tuple(1, 0, ""));
  EXPECT_EQ(parse("<OK\r\ntext"), std::tuple(0, 1, "text"));
  EXPECT_EQ(parse("\r\n\r\n<OK\r\n\r\nab"), std::tuple(0, 1, "ab"));
  EXPECT_EQ(parse("<OKab"), std::tuple(0, 1, "ab"));
  EXPECT_EQ(parse("<OK\r\nab\r\n"), std::tuple(0, 1, "ab\r\n"));
  EXPECT_EQ(parse("<OK\r\n\r"), std::tuple(1, 0, ""));
  EXPECT_EQ(parse("<OK\r\n\r\n"), std::tuple(1, 0, ""));
  EXPECT_EQ(parse("\r\n\r\n"), std::tuple(0, 3, ""));
  EXPECT_EQ(parse("x"), std::tuple(0, 3, ""));
  EXPECT_EQ(parse("<ok"), std::tuple(1, 2, ""));
  EXPECT_EQ(parse("<ERROR"), std::tuple(1, 2, ""));
  EXPECT_EQ(parse("text"), std::tuple(1, 4, ""));
}

TEST(VelmarCommandParse, AsciiMessagesAreHeaderAndBody) {
  CVelmarCommand command("x", 0);
  bool done = true;
  EXPECT_EQ(command.ParseAsciiMessage("no separator", &done), S_FALSE);
  EXPECT_FALSE(done);
  EXPECT_EQ(command.ParseAsciiMessage(AsciiLog("VERSIONA", "body", 7, "COM3").c_str(), &done),
            S_OK);
  EXPECT_TRUE(done);
  EXPECT_EQ(command.Header().message_name, L"#VERSIONA");
  EXPECT_EQ(command.Port(), L"COM3");
  EXPECT_EQ(command.Header().gps_week, 1888);
  EXPECT_EQ(command.Header().gps_seconds, 405078.5);
  EXPECT_EQ(command.Header().sequence, 0);  // this function does not read it
  EXPECT_EQ(command.ParseAsciiHeader("a,b,c", 5), S_FALSE);
}

// The results for the two halves of a message.
class Halves : public CVelmarCommand {
 public:
  Halves() : CVelmarCommand("x", 0) {}
  HRESULT ParseAsciiHeader(const char* text, uint32_t length) override {
    header = std::string(text, length);
    return header_result;
  }
  HRESULT ParseMessageBody(const char* text, uint32_t length, bool* done) override {
    body = std::string(text, length);
    *done = true;
    return body_result;
  }
  std::string header;
  std::string body;
  HRESULT header_result = S_OK;
  HRESULT body_result = S_OK;
};

TEST(VelmarCommandParse, AsciiMessagesFailWithTheirHalves) {
  const auto parse = [](HRESULT header, HRESULT body) {
    Halves command;
    command.header_result = header;
    command.body_result = body;
    bool done = false;
    const HRESULT result = command.ParseAsciiMessage("#A,b;c;d", &done);
    EXPECT_EQ(command.header, "#A,b");
    EXPECT_EQ(command.body, FAILED(header) ? "" : "c;d");
    EXPECT_EQ(done, !FAILED(header));
    return result;
  };
  EXPECT_EQ(parse(S_OK, S_OK), S_OK);
  EXPECT_EQ(parse(S_FALSE, S_OK), S_OK);  // too few fields are no failure
  EXPECT_EQ(parse(S_OK, S_FALSE), S_OK);
  EXPECT_EQ(parse(E_ACCESSDENIED, S_OK), E_ACCESSDENIED);
  EXPECT_EQ(parse(S_OK, E_HANDLE), E_HANDLE);
}

TEST(VelmarCommandParse, ReservedOperationsAreNotOffered) {
  CVelmarCommand command("x", 0);
  EXPECT_EQ(command.ParseAbbreviatedLog(nullptr, 0, nullptr, nullptr), E_NOTIMPL);
  EXPECT_EQ(command.ParseReserved(nullptr, 0, nullptr, nullptr), E_NOTIMPL);
}

}  // namespace
