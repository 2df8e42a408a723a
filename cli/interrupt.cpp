#include "interrupt.h"

#include <atomic>
#include <utility>

namespace cli {
namespace {

// Windows passes no context to the handler.
std::atomic<HANDLE> g_event{nullptr};
std::atomic<const std::string*> g_message{nullptr};

// Acknowledges Ctrl-C at once: the receiver may need a while to stop.
void PrintMessage() {
  const std::string* const message = g_message.exchange(nullptr);
  if (message == nullptr) return;
  DWORD written = 0;
  WriteFile(GetStdHandle(STD_ERROR_HANDLE),
            message->data(),
            static_cast<DWORD>(message->size()),
            &written,
            nullptr);
}

BOOL WINAPI OnConsoleEvent(DWORD type) {
  constexpr DWORD kTidyUpMs = 10'000;
  const HANDLE event = g_event.load();
  if (event == nullptr || !SetEvent(event)) return FALSE;
  PrintMessage();
  // When the window is closed the process ends as soon as this returns: let it tidy up first.
  if (type != CTRL_C_EVENT && type != CTRL_BREAK_EVENT) Sleep(kTidyUpMs);
  return TRUE;
}

}  // namespace

Interrupt::Interrupt(std::string message)
    : message_(std::move(message)), event_(CreateEventW(nullptr, TRUE, FALSE, nullptr)) {
  g_event = event_.get();
  g_message = message_.empty() ? nullptr : &message_;
  SetConsoleCtrlHandler(OnConsoleEvent, TRUE);
}

Interrupt::~Interrupt() {
  SetConsoleCtrlHandler(OnConsoleEvent, FALSE);
  g_event = nullptr;
  g_message = nullptr;
}

bool Interrupt::requested() const {
  return event_ && WaitForSingleObject(event_.get(), 0) == WAIT_OBJECT_0;
}

}  // namespace cli
