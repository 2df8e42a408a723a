// A block transfer over a serial link, its blocks made by hand.
#ifndef RCVLINK_TESTS_QUORIN_SERIAL_DOWNLOAD_FIXTURE_H_
#define RCVLINK_TESTS_QUORIN_SERIAL_DOWNLOAD_FIXTURE_H_

#include <algorithm>
#include <cstddef>
#include <functional>
#include <string>

#include "tests/quorin/block_download_fixture.h"

inline constexpr char kHeaderRead[] = "read 3 3000";
inline constexpr char kRestRead[] = "read 515 3000";
inline constexpr char kCancelLine[] = "CQuorinProtocol::DownloadOverSerial - download is cancelled";
inline constexpr char kTimeoutLine[] = "CQuorinProtocol::DownloadOverSerial - read timeout";

class QuorinSerialDownloadTest : public QuorinBlockDownloadTest {
 protected:
  HRESULT Download(int size = 1100) { return driver.DownloadOverSerial(&stream, size); }
  // The bytes in two reads, cut behind the header, as the driver asks for them.
  void GiveInTwo(const std::string& block, const std::function<void()>& before_rest) {
    Give(block.substr(0, 3));
    connection->Give({S_OK, block.substr(3), before_rest});
  }
  size_t Reads() const {
    return static_cast<size_t>(std::ranges::count(connection->calls, kHeaderRead));
  }
};

#endif  // RCVLINK_TESTS_QUORIN_SERIAL_DOWNLOAD_FIXTURE_H_
