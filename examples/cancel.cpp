// Downloads a file until Ctrl-C is pressed, and shows its progress:
//   cancel COM7 LOG0801A.JPS copy.jps
// Exit code: 0 saved, 1 failed, 2 wrong usage, 3 cancelled.
#include <cstdio>
#include <exception>
#include <stop_token>
#include <system_error>

#include "rcvlink.hpp"

// Windows gives the handler of Ctrl-C no context.
static std::stop_source g_stop;

// Windows calls it on a thread of its own.
static BOOL WINAPI OnCtrlC(DWORD type) {
  if (type != CTRL_C_EVENT) return FALSE;
  g_stop.request_stop();
  return TRUE;
}

static void ShowPercent(int percent) {
  std::printf("\r%3d %%", percent);
  std::fflush(stdout);
}

int wmain(int argc, wchar_t** argv) try {
  if (argc != 4) return std::puts("usage: cancel PORT NAME FILE"), 2;

  SetConsoleCtrlHandler(OnCtrlC, TRUE);
  const std::stop_token stop = g_stop.get_token();
  auto receiver = rcvlink::Receiver::Find(argv[1], {.stop = stop});
  const rcvlink::File file = receiver.FindFile(argv[2], stop);
  receiver.Download(file, argv[3], {.progress = ShowPercent, .stop = stop});
  std::puts("\nsaved");
  return 0;
} catch (const std::system_error& error) {
  std::printf("\nnot saved: %s\n", error.what());
  return error.code() == rcvlink::Error::kCancelled ? 3 : 1;
} catch (const std::exception& error) {
  std::printf("\nnot saved: %s\n", error.what());
  return 1;
}
