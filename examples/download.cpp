// Finds the receiver on a COM port and downloads one of its files:
//   download COM7 LOG0801A.JPS copy.jps
#include <cstdio>
#include <exception>

#include "rcvlink.hpp"

int wmain(int argc, wchar_t** argv) try {
  if (argc != 4) return std::puts("usage: download PORT NAME FILE"), 2;

  auto receiver = rcvlink::Receiver::Find(argv[1]);
  const rcvlink::File file = receiver.FindFile(argv[2]);
  const auto show = [](int percent) { std::printf("\r%3d %%", percent); };
  // Makes copy.jps when all bytes have come, as many as the receiver lists.
  receiver.Download(file, argv[3], {.progress = show});
  std::puts("\nsaved");
  return 0;
} catch (const std::exception& error) {
  std::printf("\nnot saved: %s\n", error.what());
  return 1;
}
