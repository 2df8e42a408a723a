// A whole download on a scripted connection: "A0101.log", of two blocks.
#ifndef RCVLINK_TESTS_QUORIN_DOWNLOAD_FIXTURE_H_
#define RCVLINK_TESTS_QUORIN_DOWNLOAD_FIXTURE_H_

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <vector>

#include "tests/quorin/quorin_driver.h"
#include "tests/support/block_stream.h"
#include "tests/support/content.h"
#include "tests/support/memory_stream.h"
#include "tests/support/report_capture.h"

inline constexpr char kGetPort[] = "print,/cur/term\r\n";
inline constexpr char kRaise[] = "set,/par/dev/ser/b/rate,115200\r\n";
inline constexpr char kGetSize[] = "print,/log/A0101.log&size\r\n";
inline constexpr char kGetFile[] = "get,\"A0101.log\":{500,512}\r\n";
inline constexpr char kPutBack[] = "set,cur/term/rate,9600\r\n";

// The commands in each part of a download of two blocks.
inline const std::vector<std::string> kSpeedUp = {"%%print,/cur/term\r\n", kRaise, "speed 115200"};
inline const std::vector<std::string> kStart = {
    "%%\n", "%%print,/log/A0101.log&size\r\n", "%%get,\"A0101.log\":{500,512}\r\n", "\x15"};
inline const std::vector<std::string> kBlocks = {"\x06", "#"};
inline const std::vector<std::string> kRestore = {"%%set,cur/term/rate,9600\r\n", "speed 9600"};

class QuorinDownloadTest : public QuorinDriverTest {
 protected:
  QuorinDownloadTest() {
    receiver.Reply(kGetPort, "/dev/ser/b");
    receiver.Reply("\n", "");
    receiver.Reply(kGetSize, "600");
    receiver.Reply(kGetFile, "");
    receiver.Reply(kPutBack, "");
    receiver.On("\x15", [this](const std::string&) {
      BlockStream blocks;
      connection->GiveRead(blocks.Data(0, content.substr(0, 512)));
      connection->GiveRead(blocks.Last(content.substr(512)));
    });
  }

  // Replaces the serial link. A speed of 0 would be raised.
  void UseUsb() {
    connection->instance_type = eInstanceUSB;
    connection->speed = 0;
    connection->speed_result = S_FALSE;
    connection->set_speed_result = S_FALSE;
  }
  HRESULT Download() { return driver.DownloadFile(L"A0101.log", &stream, nullptr); }
  void ExpectSaid(std::initializer_list<std::vector<std::string>> parts) {
    EXPECT_THAT(Said(), testing::ElementsAreArray(Joined(parts)));
  }

  const std::string content = Content(600);
  MemoryStream stream;
  const ReportCapture report;
};

#endif  // RCVLINK_TESTS_QUORIN_DOWNLOAD_FIXTURE_H_
