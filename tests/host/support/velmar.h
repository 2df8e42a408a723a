// Velmar receivers opened through the library's exports.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_VELMAR_H_
#define RCVLINK_TESTS_HOST_SUPPORT_VELMAR_H_

#include <gtest/gtest.h>
#include <windows.h>

#include <map>
#include <string>
#include <utility>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/file_list.h"
#include "tests/host/support/receiver.h"

namespace host {

// A Velmar receiver on a port, opened and closed.
class Velmar {
 public:
  explicit Velmar(std::vector<std::string> switches,
                  const std::map<std::string, std::string>& files = {},
                  DWORD speed = CBR_9600)
      : port(Arguments(std::move(switches), speed), files) {
    std::wstring name = port.name();
    DCB settings = Settings(speed);
    const long result = devapi::CreateReceiverOnSerial(
        name.data(), eProtocolVelmar, &settings, nullptr, receiver_.out());
    if (result != S_OK) throw bed::Error("no receiver answers:\n" + port.Transcript());
  }

  void* get() const { return receiver_.get(); }
  // Gives up the ownership of the handle.
  void* Release() { return receiver_.Release(); }

  // What the host sent since the handshake.
  Lines Sent() const {
    Lines sent = SentByHost(port.Transcript());
    EXPECT_GE(sent.size(), kQuestionsOfGreeting);
    sent.erase(sent.begin(), sent.begin() + kQuestionsOfGreeting);
    return sent;
  }
  // The same, with the chunks of files and the changes of speed.
  Lines SentAndMoved() const {
    Lines lines;
    size_t questions = 0;
    for (const std::string& line : WireLines(port.Transcript())) {
      const bool said = line.starts_with("> ");
      if (said && ++questions <= kQuestionsOfGreeting) continue;
      if (said || line.starts_with("= speed") || line.starts_with("< log FILETRANSFERB")) {
        lines.push_back(line);
      }
    }
    return lines;
  }
  std::vector<std::wstring> Names() const {
    const FileList list(get());
    EXPECT_EQ(list.result(), S_OK);
    std::vector<std::wstring> names;
    for (long i = 0; i < list.Count(); ++i) names.push_back(list.At(i).name);
    return names;
  }
  long Download(const std::wstring& name, MemoryStream& stream, Progress* progress = nullptr) {
    return receiver_.Download(name, stream, progress);
  }
  long Delete(std::wstring name) const { return devapi::DeleteFileW(get(), name.data()); }

  bed::SimulatedPort port;

 private:
  static constexpr size_t kQuestionsOfGreeting = 2;

  static std::vector<std::string> Arguments(std::vector<std::string> switches, DWORD speed) {
    switches.insert(switches.begin(), {"velmar", "--speed", std::to_string(speed)});
    return switches;
  }

  OpenReceiver receiver_;  // on `port`, so closed before it
};

}  // namespace host

#endif  // RCVLINK_TESTS_HOST_SUPPORT_VELMAR_H_
