#include "output.h"

#include <string>

#include "text.h"

namespace cli {
namespace {

bool IsConsole(HANDLE handle) {
  DWORD mode = 0;
  return GetConsoleMode(handle, &mode) != FALSE;
}

}  // namespace

Output::Output(DWORD stream) : handle_(GetStdHandle(stream)), is_terminal_(IsConsole(handle_)) {}

size_t Output::Width() const {
  constexpr size_t kUsualWidth = 80;
  CONSOLE_SCREEN_BUFFER_INFO info{};
  if (!GetConsoleScreenBufferInfo(handle_, &info)) return kUsualWidth;
  const int width = info.srWindow.Right - info.srWindow.Left + 1;
  return width > 0 ? static_cast<size_t>(width) : kUsualWidth;
}

void Output::Write(std::string_view utf8) {
  if (!is_terminal_) {
    WriteBytes(utf8);
    return;
  }
  const std::wstring text = ToUtf16(utf8);
  DWORD written = 0;
  WriteConsoleW(handle_, text.data(), static_cast<DWORD>(text.size()), &written, nullptr);
}

DWORD Output::WriteRaw(std::string_view bytes) {
  WriteBytes(bytes);
  return first_error_;
}

void Output::WriteBytes(std::string_view bytes) {
  while (!bytes.empty() && first_error_ == ERROR_SUCCESS) {
    DWORD written = 0;
    const BOOL ok =
        WriteFile(handle_, bytes.data(), static_cast<DWORD>(bytes.size()), &written, nullptr);
    if (!ok) first_error_ = GetLastError();
    bytes.remove_prefix(written);
  }
}

}  // namespace cli
