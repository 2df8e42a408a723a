#include "interrupt.h"

#include <atomic>

namespace cli {
namespace {

// Windows calls the handler without a context of ours.
std::atomic<HANDLE> g_event{nullptr};

BOOL WINAPI OnConsoleEvent(DWORD type) {
  constexpr DWORD kTidyUpMs = 10'000;
  const HANDLE event = g_event.load();
  if (event == nullptr || SetEvent(event) == FALSE) return FALSE;
  // When the window is closed the process ends as soon as this returns: let it tidy up first.
  if (type != CTRL_C_EVENT && type != CTRL_BREAK_EVENT) Sleep(kTidyUpMs);
  return TRUE;
}

}  // namespace

Interrupt::Interrupt() : event_(CreateEventW(nullptr, TRUE, FALSE, nullptr)) {
  g_event = event_.get();
  SetConsoleCtrlHandler(OnConsoleEvent, TRUE);
}

Interrupt::~Interrupt() {
  SetConsoleCtrlHandler(OnConsoleEvent, FALSE);
  g_event = nullptr;
}

bool Interrupt::requested() const {
  return event_ && WaitForSingleObject(event_.get(), 0) == WAIT_OBJECT_0;
}

}  // namespace cli
