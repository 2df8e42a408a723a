#include "simulator/transcript.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>

#include "tests/simulator/session.h"

namespace sim {
namespace {

constexpr const char* kSessionText =
    "\n#OFF#\r\ndm\r\n%1%\r\nset,/par/dev/ser/a/parity,odd\r\n"
    "%2%get,\"A0101.log\":{500,512}\r\n";

constexpr const char* kExpected =
    "> \\n\n"
    "> #OFF#\\r\\n\n"
    "= echo off\n"
    "> dm\\r\\n\n"
    "> %1%\\r\\n\n"
    "< RE003%1%\\r\\n\n"
    "> set,/par/dev/ser/a/parity,odd\\r\\n\n"
    "= port a parity odd\n"
    "> %2%get,\"A0101.log\":{500,512}\\r\\n\n"
    "< RE003%2%\\r\\n\n"
    "> \\x15\n"
    "< block type=02 seq=0 bytes=518 crc=B8C4\n"
    "> \\x06\n"
    "< block type=02 seq=1 bytes=518 crc=89F0 fault=crc\n"
    "> \\x15\n"
    "< block type=02 seq=1 bytes=518 crc=8870\n"
    "> \\x06\n"
    "< block type=04 len=76 bytes=518 crc=6AE6\n"
    "> #\n"
    "> %3%set,cur/term/rate,115200\\r\\n\n"
    "< RE003%3%\\r\\n\n"
    "= speed 115200\n"
    "- not heard at 9600\n";

// A session whose lines are written `step` bytes at a time.
std::string Record(size_t step, size_t piece_size) {
  QuorinOptions options;
  options.line.piece_size = piece_size;
  options.faults.blocks = {{BlockFaultKind::kDamagedCrc, 1, kOnce, 0}};
  Session session(options);
  const auto say = [&](std::string_view text) {
    for (; !text.empty(); text.remove_prefix(std::min(step, text.size()))) {
      session.Ask(text.substr(0, step));
    }
  };
  for (std::string_view rest = kSessionText; !rest.empty();) {
    const size_t line = rest.find('\n') + 1;
    say(rest.substr(0, line));
    rest.remove_prefix(line);
  }
  for (const char* control : {"\x15", "\x06", "\x15", "\x06", "#"}) {
    session.Ask(control);
  }
  say("%3%set,cur/term/rate,115200\r\n");
  say("%4%\r\n");
  return session.log.str();
}

TEST(TranscriptTest, RecordsASessionInOrder) { EXPECT_EQ(Record(1000, 0), kExpected); }

TEST(TranscriptTest, DoesNotDependOnReadsAndPieces) {
  EXPECT_EQ(Record(1, 0), kExpected);
  EXPECT_EQ(Record(3, 5), kExpected);
}

TEST(TranscriptTest, EscapesWhatCannotBePrinted) {
  EXPECT_EQ(Escape(std::string_view("a\\\r\n\t\0\x7F\xFF~ ", 10)),
            "a\\\\\\r\\n\\x09\\x00\\x7F\\xFF~ ");
}

TEST(TranscriptTest, AnEchoIsRecordedLineByLine) {
  QuorinOptions options;
  options.echo = true;
  Session session(options);
  session.Ask("#OF");
  session.Ask("F#\r\n");
  EXPECT_EQ(session.log.str(), "> #OFF#\\r\\n\n= echo off\n< echo #OFF#\\r\\n\n");
}

TEST(TranscriptTest, AnUnfinishedLineIsRecordedAtTheEnd) {
  std::ostringstream log;
  Transcript transcript(log);
  {
    QuorinReceiver receiver({}, FileStore(), &transcript);
    MemoryPort port(receiver);
    port.Write("%7%", kHostSpeed);
    EXPECT_EQ(log.str(), "");
  }
  EXPECT_EQ(log.str(), "> %7%\n");
}

TEST(TranscriptTest, AnAbandonedTransferGetsARemark) {
  Session session;
  session.StartTransfer();
  session.Ask("%5%\r\n");
  EXPECT_NE(session.log.str().find("> %5%\\r\\n\n- transfer abandoned\n< RE003%5%\\r\\n\n"),
            std::string::npos);
}

}  // namespace
}  // namespace sim
