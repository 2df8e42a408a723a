// A driver, its link and the simulated receiver at the other end, which serves "A0101.log" and
// "second.log".
#ifndef RCVLINK_TESTS_QUORIN_SIMULATED_DOWNLOAD_H_
#define RCVLINK_TESTS_QUORIN_SIMULATED_DOWNLOAD_H_

#include <cstddef>
#include <string>

#include "simulator/quorin/receiver.h"
#include "tests/quorin/quorin_driver.h"
#include "tests/support/block_stream.h"
#include "tests/support/content.h"
#include "tests/support/simulated_connection.h"
#include "tests/support/simulated_driver.h"

struct SimulatedDownload : SimulatedDriver<QuorinDriver, sim::QuorinReceiver, SimulatedConnection> {
  static constexpr size_t kUsualSize = 1300;  // two blocks of data and a last one

  explicit SimulatedDownload(const sim::QuorinOptions& options,
                             size_t size = kUsualSize,
                             DWORD host_speed = 9600)
      : SimulatedDriver(options, Files(Content(size)), host_speed), content(Content(size)) {}

  HRESULT Run() { return driver.DownloadFile(L"A0101.log", &stream, nullptr); }
  bool HasWholeFile() const { return stream.bytes == content; }
  std::string Log() const { return log.str(); }
  size_t CountInLog(const std::string& text) const {
    const std::string lines = Log();
    size_t count = 0;
    for (size_t at = lines.find(text); at != std::string::npos; at = lines.find(text, at + 1)) {
      ++count;
    }
    return count;
  }

  static sim::FileStore Files(const std::string& bytes) {
    sim::FileStore files;
    files.Add("A0101.log", sim::ToBytes(bytes), 600000000);
    files.Add("second.log", sim::ToBytes("second"), 700000000);
    return files;
  }

  const std::string content;
};

#endif  // RCVLINK_TESTS_QUORIN_SIMULATED_DOWNLOAD_H_
