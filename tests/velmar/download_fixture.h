// The download of "a.pdc" from a Velmar receiver, on a scripted connection.
#ifndef RCVLINK_TESTS_VELMAR_DOWNLOAD_FIXTURE_H_
#define RCVLINK_TESTS_VELMAR_DOWNLOAD_FIXTURE_H_

#include <cstdint>
#include <string>

#include "tests/support/memory_stream.h"
#include "tests/velmar/velmar_driver.h"

// The log with the size of the file.
inline std::string HeaderReply(const std::string& size) {
  std::string body = "\"a.pdc\"," + size;
  for (int i = 2; i < 23; ++i) body += ",0";
  return kOkPrompt + AsciiLog("FILEHDRA", body);
}

class VelmarDownload : public VelmarDriver {
 protected:
  static inline const std::string kCurrent = "currentfile a.pdc all\r";
  static inline const std::string kHeader = "log filehdra\r";
  static inline const std::string kRead = "log filetransferb\r";
  static inline const std::string kConfig = "log comconfiga once\r";
  static inline const std::string kStop = "unlogall thisport\r";
  static inline const std::string kRaise = "COM 115200 N 8 1 N\r";
  static inline const std::string kRestore = "COM 9600 N 8 1 N\r";

  VelmarDownload() {
    connection->speed = 115200;
    answers = {
        {kCurrent, kOkPrompt},
        {kConfig,
         kOkPrompt + AsciiLog("COMCONFIGA", "1,COM1,9600,N,8,1,N,ON,OFF,NOVATEL,NOVATEL,ON")},
        {kRaise, kOkPrompt},
        {kRestore, kOkPrompt}};
  }
  // A file in chunks of 100 bytes.
  void Serve(int chunks) {
    answers[kHeader] = HeaderReply(std::to_string(chunks * 100));
    std::string reply = kOkPrompt;
    for (int i = chunks - 1; i >= 0; --i) {
      reply +=
          BinaryLog{std::string(100, static_cast<char>('a' + i)), static_cast<uint16_t>(i)}.Bytes();
    }
    answers[kRead] = reply;
  }
  HRESULT Download() { return driver.DownloadFile(L"a.pdc", &stream, nullptr); }

  MemoryStream stream;
};

#endif  // RCVLINK_TESTS_VELMAR_DOWNLOAD_FIXTURE_H_
