#include "results.h"

#include <windows.h>

#include <algorithm>
#include <array>

#include "text.h"
#include "troubleshooting.h"

namespace cli {
namespace {

constexpr unsigned long kWin32Mask = 0xFFFF0000UL;
constexpr unsigned long kWin32Results = 0x80070000UL;

struct KnownCode {
  long code;
  const char* meaning;
};

const std::array kKnownCodes = {
    KnownCode{S_OK, "done"},
    KnownCode{S_FALSE, "no result: nothing found, aborted, or ended by the receiver"},
    KnownCode{E_INVALIDARG, "invalid argument"},
    KnownCode{E_OUTOFMEMORY, "this computer is out of memory"},
    KnownCode{E_NOTIMPL, "not supported by this receiver family or by this version"},
    KnownCode{E_FAIL, "internal failure"},
    KnownCode{E_UNEXPECTED, "unexpected kind of link"},
    KnownCode{HRESULT_FROM_WIN32(ERROR_DEVICE_NOT_CONNECTED),
              "no connection, no complete reply, or the receiver refused the command"},
    KnownCode{HRESULT_FROM_WIN32(ERROR_TIMEOUT), "the receiver did not answer in time"},
    KnownCode{HRESULT_FROM_WIN32(ERROR_FILE_NOT_FOUND), "it does not exist"},
    KnownCode{HRESULT_FROM_WIN32(ERROR_NOT_READY),
              "the device does not answer: switched off or out of reach"},
    KnownCode{HRESULT_FROM_WIN32(ERROR_ACCESS_DENIED), "access denied: in use, or not allowed"},
};

std::string WindowsText(unsigned long error) {
  constexpr DWORD kLongestText = 512;
  std::array<wchar_t, kLongestText> buffer{};
  const DWORD length = FormatMessageW(FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS,
                                      nullptr,
                                      error,
                                      0,
                                      buffer.data(),
                                      kLongestText,
                                      nullptr);
  std::wstring text(buffer.data(), length);
  std::replace(text.begin(), text.end(), L'\r', L' ');
  std::replace(text.begin(), text.end(), L'\n', L' ');
  text.erase(text.find_last_not_of(L". ") + 1);
  return Printable(text);
}

}  // namespace

std::string ExitCodeTable() {
  return "Exit codes:\n"
         "  0  done\n"
         "  1  the receiver refused, or the operation failed\n"
         "  2  invalid command line\n"
         "  3  no receiver: none answered, or the port could not be opened\n"
         "  4  cancelled with Ctrl-C\n"
         "  5  a file of this computer could not be written, or already exists\n";
}

std::string MeaningOf(long code) {
  const auto* known = std::find_if(
      kKnownCodes.begin(), kKnownCodes.end(), [code](const auto& k) { return k.code == code; });
  if (known != kKnownCodes.end()) return known->meaning;
  const auto value = static_cast<unsigned long>(code);
  const bool is_win32 = (value & kWin32Mask) == kWin32Results;
  const std::string text = WindowsText(is_win32 ? value & ~kWin32Mask : value);
  return text.empty() ? "unknown result code" : text;
}

long ResultOfWin32(unsigned long error) { return HRESULT_FROM_WIN32(error); }

std::string MeaningOf(const Failure& failure) {
  return failure.meaning.empty() ? MeaningOf(failure.code) : failure.meaning;
}

std::string HintOf(const Failure& failure) {
  if (!failure.hint.empty() || failure.exit == ExitCode::kCancelled) return failure.hint;
  if (!FindTroubleshooting(failure.code)) return "";
  return "`rcvlink-cli explain " + HexCode(failure.code) + "` says what to try.";
}

std::string Describe(const Failure& failure) {
  const bool cancelled = failure.exit == ExitCode::kCancelled;
  // A success code does not help the user; the meaning says what failed.
  const bool has_code = failure.code < 0;
  std::string text = "rcvlink-cli: ";
  if (!failure.port.empty()) text += failure.port + ": ";
  text += cancelled ? "cancelled: did not " : "could not ";
  text += failure.tried;
  text += ": ";
  if (has_code) text += HexCode(failure.code) + ", ";
  text += MeaningOf(failure) + "\n";
  if (!failure.kept.empty()) {
    text += "  The received data is kept in " + Printable(ToUtf16(failure.kept)) + "\n";
  }
  if (const std::string hint = HintOf(failure); !hint.empty()) text += "  " + hint + "\n";
  return text;
}

}  // namespace cli
