// Uses several receivers at once, each on a thread of its own, and says what is on each port:
//   several COM7 COM8 COM9 COM10
// Exit code: 0 all answered, 1 one of them did not, 2 wrong usage.
#include <cstdio>
#include <exception>
#include <future>
#include <string>
#include <vector>

#include "rcvlink.hpp"

static std::wstring Describe(const std::wstring& port) {
  auto receiver = rcvlink::Receiver::Find(port);
  const rcvlink::Identity identity = receiver.Identify();
  unsigned long long bytes = 0;
  const std::vector<rcvlink::File> files = receiver.Files();
  for (const rcvlink::File& file : files) bytes += file.size;
  return identity.model + L" " + identity.id + L", " + std::to_wstring(files.size()) + L" files, " +
         std::to_wstring(bytes) + L" bytes";
}

int wmain(int argc, wchar_t** argv) {
  if (argc < 2) return std::puts("usage: several PORT..."), 2;

  const std::vector<std::wstring> ports(argv + 1, argv + argc);
  std::vector<std::future<std::wstring>> receivers;
  for (const std::wstring& port : ports) {
    receivers.push_back(std::async(std::launch::async, Describe, port));
  }
  int status = 0;
  for (size_t i = 0; i < ports.size(); ++i) {
    try {
      std::printf("%ls: %ls\n", ports[i].c_str(), receivers[i].get().c_str());
    } catch (const std::exception& error) {
      std::printf("%ls: %s\n", ports[i].c_str(), error.what());
      status = 1;
    }
  }
  return status;
}
