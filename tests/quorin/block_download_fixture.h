// A block transfer over either kind of link, its blocks made by hand.
#ifndef RCVLINK_TESTS_QUORIN_BLOCK_DOWNLOAD_FIXTURE_H_
#define RCVLINK_TESTS_QUORIN_BLOCK_DOWNLOAD_FIXTURE_H_

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstddef>
#include <functional>
#include <string>
#include <tuple>
#include <vector>

#include "platform/hresult.h"
#include "tests/quorin/quorin_driver.h"
#include "tests/support/block_stream.h"
#include "tests/support/content.h"
#include "tests/support/manual_clock.h"
#include "tests/support/memory_stream.h"
#include "tests/support/report_capture.h"

inline constexpr char kAckWrite[] = "write \x06";
inline constexpr char kNakWrite[] = "write \x15";
inline constexpr char kEndWrite[] = "write #";

inline constexpr HRESULT kPositive = 2;  // a success code other than S_OK and S_FALSE

// A kind of link, and how a transfer over it behaves.
struct Link {
  EInstanceType type;
  const char* name;  // in the report
  // The two reads of a block that arrives without delay.
  const char* first_read;
  const char* second_read;
  size_t first_size;   // what the first read gives
  size_t header_size;  // what is read before the header is checked
  const char* timeout_text;
  bool tells_why;  // a block was rejected
};

inline constexpr Link kSerialLink = {.type = eInstanceSerial,
                                     .name = "Serial",
                                     .first_read = "read 3 3000",
                                     .second_read = "read 515 3000",
                                     .first_size = 3,
                                     .header_size = 3,
                                     .timeout_text = "read timeout",
                                     .tells_why = false};
inline constexpr Link kUsbLink = {.type = eInstanceUSB,
                                  .name = "USB",
                                  .first_read = "read 512 30000",
                                  .second_read = "read 6 30000",
                                  .first_size = 512,
                                  .header_size = 518,
                                  .timeout_text = "read timeout.",
                                  .tells_why = true};

inline auto BothLinks() { return testing::Values(kSerialLink, kUsbLink); }
inline std::string LinkName(const testing::TestParamInfo<Link>& link) { return link.param.name; }

class QuorinBlockDownloadTest : public QuorinDriverTest {
 protected:
  explicit QuorinBlockDownloadTest(const Link& used) : link(used) {
    connection->instance_type = link.type;
  }

  HRESULT Download(int size = 1100) { return DownloadInto(&stream, size); }
  HRESULT DownloadInto(IStream* into, int size) {
    return link.type == eInstanceUSB ? driver.DownloadOverUSB(into, size, 512)
                                     : driver.DownloadOverSerial(into, size);
  }

  // What the receiver sends.
  void Give(const std::string& bytes) { connection->GiveRead(bytes); }
  // A whole small file: two blocks of data and a last one.
  void GiveFile() {
    Give(FirstBlock());
    Give(blocks.Data(1, content.substr(512, 512)));
    Give(blocks.Last(content.substr(1024)));
  }
  std::string FirstBlock() { return blocks.Data(0, content.substr(0, 512)); }
  // In its two reads, with an action at the beginning of the second.
  void GiveInTwo(const std::string& block, const std::function<void()>& before_rest) {
    Give(block.substr(0, link.first_size));
    connection->Give({S_OK, block.substr(link.first_size), before_rest});
  }
  // The part of a block that is read before its header is checked. The part after a wrong header is
  // discarded.
  void GiveHeaderOf(const std::string& block) { Give(block.substr(0, link.header_size)); }
  void GiveSilences(int count) {
    for (int i = 0; i < count; ++i) connection->GiveResult(rcvlink::kTimedOut);
  }

  // The outcome of the transfer.
  std::string Controls() const { return connection->Written(); }
  std::vector<std::string> BlockReads() const { return {link.first_read, link.second_read}; }
  // Of a block whose header is wrong.
  std::vector<std::string> HeaderReads() const {
    if (link.header_size == link.first_size) return {link.first_read};
    return BlockReads();
  }
  std::string Line(const std::string& text) const {
    return "CQuorinProtocol::DownloadOver" + std::string(link.name) + " - " + text;
  }
  std::string CancelLine() const { return Line("download is cancelled"); }
  std::string TimeoutLine() const { return Line(link.timeout_text); }
  // The line of the report for a rejected block, if there is one.
  std::vector<std::string> Why(const std::vector<std::string>& texts) const {
    std::vector<std::string> lines;
    for (const std::string& text : texts) {
      if (link.tells_why) lines.push_back(Line(text));
    }
    return lines;
  }

  const Link link;
  const std::string content = Content(1100);
  BlockStream blocks;
  MemoryStream stream;
  ManualClock clock;
  const ReportCapture report;
};

inline constexpr char kEndText[] = "recognisable byte is 0x23";
inline constexpr char kTypeText[] = "recognisable byte is not recognised";
inline constexpr char kSequenceText[] = "out of sequence";
inline constexpr char kEndByteText[] = "eob character is missed";
inline constexpr char kChecksumText[] = "cheksum missmatch";

// For tests that are the same over both links.
class QuorinBothLinksTest : public QuorinBlockDownloadTest,
                            public testing::WithParamInterface<Link> {
 protected:
  QuorinBothLinksTest() : QuorinBlockDownloadTest(GetParam()) {}
};

// The same with a parameter of the test.
template <typename More>
class QuorinBothLinksTestWith : public QuorinBlockDownloadTest,
                                public testing::WithParamInterface<std::tuple<Link, More>> {
 protected:
  using Parameters = testing::WithParamInterface<std::tuple<Link, More>>;

  QuorinBothLinksTestWith() : QuorinBlockDownloadTest(std::get<0>(Parameters::GetParam())) {}
  static const More& Param() { return std::get<1>(Parameters::GetParam()); }
};

#endif  // RCVLINK_TESTS_QUORIN_BLOCK_DOWNLOAD_FIXTURE_H_
