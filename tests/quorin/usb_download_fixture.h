// A block transfer over USB, its blocks made by hand.
#ifndef RCVLINK_TESTS_QUORIN_USB_DOWNLOAD_FIXTURE_H_
#define RCVLINK_TESTS_QUORIN_USB_DOWNLOAD_FIXTURE_H_

#include <string>

#include "tests/quorin/block_download_fixture.h"

// How a block is asked for that comes as fast as it is.
inline constexpr char kFirstRead[] = "read 512 30000";
inline constexpr char kSecondRead[] = "read 6 30000";

inline constexpr char kUsbCancelLine[] = "CQuorinProtocol::DownloadOverUSB - download is cancelled";
inline constexpr char kUsbTimeoutLine[] = "CQuorinProtocol::DownloadOverUSB - read timeout.";
inline constexpr char kSequenceLine[] = "CQuorinProtocol::DownloadOverUSB - out of sequence";
inline constexpr char kEndLine[] = "CQuorinProtocol::DownloadOverUSB - recognisable byte is 0x23";
inline constexpr char kTypeLine[] =
    "CQuorinProtocol::DownloadOverUSB - recognisable byte is not recognised";
inline constexpr char kEndByteLine[] = "CQuorinProtocol::DownloadOverUSB - eob character is missed";
inline constexpr char kChecksumLine[] = "CQuorinProtocol::DownloadOverUSB - cheksum missmatch";

class QuorinUsbDownloadTest : public QuorinBlockDownloadTest {
 protected:
  QuorinUsbDownloadTest() { connection->instance_type = eInstanceUSB; }

  HRESULT Download(int size = 1100) { return driver.DownloadOverUSB(&stream, size, 512); }
};

#endif  // RCVLINK_TESTS_QUORIN_USB_DOWNLOAD_FIXTURE_H_
