#include "simulator/program/interrupt.h"

#include <shellapi.h>

#include <filesystem>
#include <memory>

#include "simulator/ports/handle.h"
#include "simulator/program/platform.h"

namespace sim {
namespace {

struct LocalFreer {
  void operator()(wchar_t** memory) const { LocalFree(memory); }
};

BOOL WINAPI StopForControl(DWORD) {
  SetEvent(StopEvent());
  return TRUE;
}

}  // namespace

HANDLE StopEvent() {
  static const UniqueHandle event(CreateEventW(nullptr, /*bManualReset=*/TRUE, FALSE, nullptr));
  return event.get();
}

void CatchInterrupts() { SetConsoleCtrlHandler(StopForControl, TRUE); }

std::vector<std::string> CommandLineWords(int, const char* const*) {
  int count = 0;
  const std::unique_ptr<wchar_t*, LocalFreer> words(CommandLineToArgvW(GetCommandLineW(), &count));
  std::vector<std::string> in_utf8;
  for (int i = 1; i < count; ++i) {
    const std::u8string word = std::filesystem::path(words.get()[i]).u8string();
    in_utf8.emplace_back(word.begin(), word.end());
  }
  return in_utf8;
}

}  // namespace sim
