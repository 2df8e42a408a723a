// What the block transfers over both links are tested with: their blocks are made by hand.
#ifndef RCVLINK_TESTS_QUORIN_BLOCK_DOWNLOAD_FIXTURE_H_
#define RCVLINK_TESTS_QUORIN_BLOCK_DOWNLOAD_FIXTURE_H_

#include <string>

#include "tests/quorin/block_stream.h"
#include "tests/quorin/quorin_driver.h"
#include "tests/support/memory_stream.h"

inline constexpr char kAckWrite[] = "write \x06";
inline constexpr char kNakWrite[] = "write \x15";
inline constexpr char kEndWrite[] = "write #";

class QuorinBlockDownloadTest : public QuorinDriverTest {
 protected:
  void Give(const std::string& bytes) { connection->GiveRead(bytes); }
  // A whole small file: two blocks of data and a last one.
  void GiveFile() {
    Give(blocks.Data(0, content.substr(0, 512)));
    Give(blocks.Data(1, content.substr(512, 512)));
    Give(blocks.Last(content.substr(1024)));
  }
  std::string Controls() const { return connection->Written(); }

  const std::string content = TestContent(1100);
  BlockStream blocks;
  MemoryStream stream;
};

#endif  // RCVLINK_TESTS_QUORIN_BLOCK_DOWNLOAD_FIXTURE_H_
