#include "tests/host/support/simulated_usb.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <mutex>

namespace bed {
namespace {

constexpr wchar_t kProgram[] = L"rcvlink-sim-usb.exe";
constexpr UINT kKilled = 1;

std::string NewName() {
  static std::atomic<int> count = 0;
  return "rcvlink-usb-" + std::to_string(GetCurrentProcessId()) + "-" + std::to_string(++count);
}

std::string ToUtf8(const std::filesystem::path& path) {
  const std::u8string text = path.u8string();
  return std::string(text.begin(), text.end());
}

std::wstring FromUtf8(const std::string& text) {
  return std::filesystem::path(std::u8string(text.begin(), text.end())).wstring();
}

// Quotes a word, so that a program finds it unchanged in its command line.
std::wstring Quoted(const std::wstring& word) {
  std::wstring quoted = L"\"";
  size_t backslashes = 0;
  for (const wchar_t character : word) {
    if (character == L'"') quoted.append(backslashes + 1, L'\\');
    backslashes = character == L'\\' ? backslashes + 1 : 0;
    quoted += character;
  }
  return quoted.append(backslashes, L'\\') + L'"';
}

std::filesystem::path ProgramPath() {
  std::wstring path(MAX_PATH, L'\0');
  DWORD length = 0;
  while ((length = GetModuleFileNameW(nullptr, path.data(), static_cast<DWORD>(path.size()))) ==
         path.size()) {
    path.resize(2 * path.size());
  }
  path.resize(length);
  return std::filesystem::path(path).parent_path() / kProgram;
}

struct Pipe {
  UniqueHandle read;
  UniqueHandle write;
};

Pipe MakePipe() {
  SECURITY_ATTRIBUTES inherited{sizeof(SECURITY_ATTRIBUTES), nullptr, TRUE};
  HANDLE read = nullptr;
  HANDLE write = nullptr;
  if (!CreatePipe(&read, &write, &inherited, 0)) throw Error("no pipe");
  return {UniqueHandle(read), UniqueHandle(write)};
}

void KeepToThisProcess(const UniqueHandle& handle) {
  SetHandleInformation(handle.get(), HANDLE_FLAG_INHERIT, 0);
}

struct Started {
  UniqueHandle process;
  UniqueHandle input;
  UniqueHandle output;
};

PROCESS_INFORMATION CreateProgram(const std::wstring& program,
                                  std::wstring command,
                                  STARTUPINFOW& startup) {
  // Under load, one start in thousands fails so on Wine.
  constexpr DWORD kPassingError = ERROR_INTERNAL_ERROR;
  constexpr int kTries = 3;
  PROCESS_INFORMATION started{};
  for (int tries = 1;; ++tries) {
    if (CreateProcessW(program.c_str(),
                       command.data(),
                       nullptr,
                       nullptr,
                       /*bInheritHandles=*/TRUE,
                       0,
                       nullptr,
                       nullptr,
                       &startup,
                       &started)) {
      return started;
    }
    const DWORD error = GetLastError();
    if (error != kPassingError || tries == kTries) {
      throw Error("cannot start rcvlink-sim-usb: error " + std::to_string(error));
    }
  }
}

Started StartProgram(const std::vector<std::string>& arguments) {
  const std::wstring program = ProgramPath().wstring();
  std::wstring command = Quoted(program);
  for (const std::string& argument : arguments) command += L' ' + Quoted(FromUtf8(argument));

  // Another program started at the same moment would inherit the pipes' other ends.
  static std::mutex start_mutex;
  const std::scoped_lock lock(start_mutex);
  Pipe input = MakePipe();
  Pipe output = MakePipe();
  KeepToThisProcess(input.write);
  KeepToThisProcess(output.read);
  STARTUPINFOW startup{};
  startup.cb = sizeof(startup);
  startup.dwFlags = STARTF_USESTDHANDLES;
  startup.hStdInput = input.read.get();
  startup.hStdOutput = output.write.get();
  startup.hStdError = output.write.get();
  const PROCESS_INFORMATION started = CreateProgram(program, command, startup);
  CloseHandle(started.hThread);
  return {UniqueHandle(started.hProcess), std::move(input.write), std::move(output.read)};
}

// The text before the end of a line or of the output; false at the end of the output.
bool ReadLine(HANDLE output, std::string& line) {
  char character = 0;
  DWORD count = 0;
  while (ReadFile(output, &character, 1, &count, nullptr) && count == 1) {
    if (character == '\n') return true;
    line += character;
  }
  return false;
}

std::string ReadRest(HANDLE output) {
  std::string text;
  while (ReadLine(output, text)) text += '\n';
  return text;
}

int ExitStatus(HANDLE process) {
  DWORD status = 0;
  GetExitCodeProcess(process, &status);
  return static_cast<int>(status);
}

}  // namespace

SimulatedUsb::SimulatedUsb(std::vector<std::string> arguments,
                           const std::map<std::string, std::string>& files)
    : name_(NewName()) {
  for (const auto& [name, content] : files) files_.Write(name, content);
  Start(std::move(arguments));
}

SimulatedUsb::~SimulatedUsb() {
  if (process_) Unplug();
}

std::wstring SimulatedUsb::device() const { return LR"(\\?\)" + FromUtf8(name_); }

int SimulatedUsb::Unplug() {
  if (!process_) throw Error("nothing is plugged in");
  input_.reset();
  WaitForSingleObject(process_.get(), INFINITE);
  const int status = ExitStatus(process_.get());
  process_.reset();
  output_.reset();
  return status;
}

void SimulatedUsb::Kill() {
  TerminateProcess(process_.get(), kKilled);
  Unplug();
}

void SimulatedUsb::Start(std::vector<std::string> arguments) {
  if (std::find(arguments.begin(), arguments.end(), "--folder") == arguments.end()) {
    arguments.insert(arguments.end(), {"--folder", ToUtf8(files_.path())});
  }
  transcript_.Clear();
  arguments.insert(arguments.end(),
                   {"--device", name_, "--transcript", ToUtf8(transcript_.path())});
  Started started = StartProgram(arguments);
  std::string first_line;
  if (!ReadLine(started.output.get(), first_line) || !first_line.starts_with(R"(\\?\)")) {
    started.input.reset();
    const std::string output = first_line + '\n' + ReadRest(started.output.get());
    WaitForSingleObject(started.process.get(), INFINITE);
    const int status = ExitStatus(started.process.get());
    throw Error("rcvlink-sim-usb ended with " + std::to_string(status) + ": " + output);
  }
  process_ = std::move(started.process);
  input_ = std::move(started.input);
  output_ = std::move(started.output);
}

std::optional<int> SimulatedUsb::Status() const {
  return WaitForSingleObject(process_.get(), 0) == WAIT_OBJECT_0
             ? std::optional(ExitStatus(process_.get()))
             : std::nullopt;
}

int SimulatedUsb::WaitForEnd(std::chrono::milliseconds timeout) const {
  if (WaitForSingleObject(process_.get(), static_cast<DWORD>(timeout.count())) != WAIT_OBJECT_0) {
    throw Error("rcvlink-sim-usb does not end");
  }
  return ExitStatus(process_.get());
}

}  // namespace bed
