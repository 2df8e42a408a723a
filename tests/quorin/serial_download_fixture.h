// A block transfer over a serial link, its blocks made by hand.
#ifndef RCVLINK_TESTS_QUORIN_SERIAL_DOWNLOAD_FIXTURE_H_
#define RCVLINK_TESTS_QUORIN_SERIAL_DOWNLOAD_FIXTURE_H_

#include <algorithm>
#include <cstdint>
#include <functional>
#include <string>

#include "tests/quorin/block_stream.h"
#include "tests/quorin/quorin_driver.h"
#include "tests/support/memory_stream.h"

inline constexpr char kAckWrite[] = "write \x06";
inline constexpr char kNakWrite[] = "write \x15";
inline constexpr char kEndWrite[] = "write #";
inline constexpr char kHeaderRead[] = "read 3 3000";
inline constexpr char kRestRead[] = "read 515 3000";
inline constexpr char kCancelLine[] = "CQuorinProtocol::DownloadOverSerial - download is cancelled";
inline constexpr char kTimeoutLine[] = "CQuorinProtocol::DownloadOverSerial - read timeout";

class QuorinSerialDownloadTest : public QuorinDriverTest {
 protected:
  HRESULT Download(int size = 1100) { return driver.DownloadOverSerial(&stream, size); }
  void Give(const std::string& bytes) { connection->GiveRead(bytes); }
  // The bytes in two reads, cut behind the header, as the driver asks for them.
  void GiveInTwo(const std::string& block, const std::function<void()>& before_rest) {
    Give(block.substr(0, 3));
    connection->Give({S_OK, block.substr(3), before_rest});
  }
  // A whole small file: two blocks of data and a last one.
  void GiveFile() {
    Give(blocks.Data(0, content.substr(0, 512)));
    Give(blocks.Data(1, content.substr(512, 512)));
    Give(blocks.Last(content.substr(1024)));
  }
  std::string Controls() const { return connection->Written(); }
  size_t Reads() const {
    return static_cast<size_t>(std::ranges::count(connection->calls, kHeaderRead));
  }

  const std::string content = TestContent(1100);
  BlockStream blocks;
  MemoryStream stream;
};

#endif  // RCVLINK_TESTS_QUORIN_SERIAL_DOWNLOAD_FIXTURE_H_
