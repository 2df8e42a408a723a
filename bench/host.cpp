// A host of the DLL on COM ports; prints JSON.
//
//   bench-host calls PORT SMALL LARGE      the calls that the DLL makes for each 512 bytes: downloads the two files
//                                          of the receiver and compares. SMALL has 100 KiB, LARGE 200 KiB.
//   bench-host many FILE PORT...           downloads the file of that name from all receivers at once; once more while
//                                          other threads open and close the receivers, and compares with FILE
//   bench-host aborts OPERATION NAME COUNT PORT
//                                          milliseconds from Abort to the return of a list, a check, or a download of
//                                          the file, COUNT times
#include <windows.h>

#include <psapi.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <random>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "rcvlink.h"
#include "tests/support/memory_stream.h"

namespace {

// Counts what it gets.
class Sink : public MemoryStream {
 public:
  size_t size = 0;
  HRESULT STDMETHODCALLTYPE Write(const void*, ULONG count, ULONG* written) override {
    size += count;
    if (written) *written = count;
    return S_OK;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return 2; }
  ULONG STDMETHODCALLTYPE Release() override { return 1; }
};

// Counts the calls of one module to the functions that it imports: each entry of its import table leads to a few
// bytes of code that count and go on to the function.
class ImportCounter {
 public:
  explicit ImportCounter(HMODULE module) : base_(reinterpret_cast<uint8_t*>(module)) {
    code_ = static_cast<uint8_t*>(
        VirtualAlloc(nullptr, kCodeSize, MEM_COMMIT | MEM_RESERVE, PAGE_EXECUTE_READWRITE));
    if (!code_) throw std::runtime_error("no memory");
    const auto* dos = At<IMAGE_DOS_HEADER>(0);
    const auto* headers = At<IMAGE_NT_HEADERS64>(static_cast<DWORD>(dos->e_lfanew));
    const auto& directory = headers->OptionalHeader.DataDirectory[IMAGE_DIRECTORY_ENTRY_IMPORT];
    for (auto* dll = At<IMAGE_IMPORT_DESCRIPTOR>(directory.VirtualAddress); dll->Name != 0; ++dll) {
      auto* names = At<IMAGE_THUNK_DATA64>(dll->OriginalFirstThunk);
      auto* slots = At<IMAGE_THUNK_DATA64>(dll->FirstThunk);
      for (; names->u1.AddressOfData != 0; ++names, ++slots) {
        Wrap(*slots,
             reinterpret_cast<const char*>(
                 At<IMAGE_IMPORT_BY_NAME>(static_cast<DWORD>(names->u1.AddressOfData))->Name));
      }
    }
  }

  struct Function {
    std::string name;
    const uint64_t* count;
  };
  const std::vector<Function>& functions() const { return functions_; }
  std::vector<uint64_t> Counts() const {
    std::vector<uint64_t> counts;
    for (const Function& function : functions_) counts.push_back(*function.count);
    return counts;
  }

 private:
  static constexpr size_t kCodeSize = 65536;
  static constexpr size_t kThunkSize = 32;

  template <typename T>
  T* At(DWORD offset) const {
    return reinterpret_cast<T*>(base_ + offset);
  }

  // inc qword [rip + to the count]; jmp qword [rip + to the function]
  void Wrap(IMAGE_THUNK_DATA64& slot, const char* name) {
    uint8_t* const thunk = code_ + functions_.size() * kThunkSize;
    if (thunk + kThunkSize > code_ + kCodeSize) throw std::runtime_error("too many imports");
    constexpr uint8_t kCount = 16;  // where the two numbers stand in a thunk
    constexpr uint8_t kFunction = 24;
    const uint8_t code[] = {
        0x48, 0xFF, 0x05, kCount - 7, 0, 0, 0, 0xFF, 0x25, kFunction - 13, 0, 0, 0};
    std::memcpy(thunk, code, sizeof(code));
    const uint64_t function = slot.u1.Function;
    std::memcpy(thunk + kFunction, &function, sizeof(function));
    functions_.push_back({name, reinterpret_cast<const uint64_t*>(thunk + kCount)});
    DWORD old = 0;
    VirtualProtect(&slot, sizeof(slot), PAGE_READWRITE, &old);
    slot.u1.Function = reinterpret_cast<uint64_t>(thunk);
    VirtualProtect(&slot, sizeof(slot), old, &old);
  }

  uint8_t* base_;
  uint8_t* code_;
  std::vector<Function> functions_;
};

std::wstring Wide(const char* text) { return {text, text + std::strlen(text)}; }

void* Find(std::wstring port) {
  void* receiver = nullptr;
  if (devapi::SearchReceiver(port.data(), eInstanceSerial, eProtocolAny, nullptr, &receiver) !=
      S_OK) {
    throw std::runtime_error("no receiver");
  }
  return receiver;
}

size_t Download(void* receiver, std::wstring name) {
  Sink sink;
  if (devapi::DownloadFile(receiver, name.data(), &sink, nullptr) != S_OK)
    throw std::runtime_error("no download");
  return sink.size;
}

void CountCalls(char** arguments) {
  void* const receiver = Find(Wide(arguments[0]));
  Download(receiver, Wide(arguments[1]));
  const ImportCounter counter(GetModuleHandleW(L"rcvlink.dll"));
  const std::vector<uint64_t> start = counter.Counts();
  const size_t few = Download(receiver, Wide(arguments[1]));
  const std::vector<uint64_t> middle = counter.Counts();
  const size_t many = Download(receiver, Wide(arguments[2]));
  const std::vector<uint64_t> end = counter.Counts();

  constexpr double kPiece = 512;
  const double pieces = static_cast<double>(many - few) / kPiece;
  std::printf("{");
  for (size_t i = 0; i < end.size(); ++i) {
    const auto more =
        static_cast<double>(end[i] - middle[i]) - static_cast<double>(middle[i] - start[i]);
    if (more / pieces >= 0.05)
      std::printf("\"%s\": %.2f, ", counter.functions()[i].name.c_str(), more / pieces);
  }
  std::printf("\"bytes\": %zu}\n", many);
  std::fflush(stdout);
  devapi::CloseReceiver(receiver);
}

double ProcessorSeconds() {
  FILETIME created, ended, kernel, user;
  GetProcessTimes(GetCurrentProcess(), &created, &ended, &kernel, &user);
  const auto seconds = [](const FILETIME& time) {
    constexpr double kPerSecond = 1e7;
    return (static_cast<double>(time.dwHighDateTime) * 4294967296.0 + time.dwLowDateTime) /
           kPerSecond;
  };
  return seconds(kernel) + seconds(user);
}

size_t WorkingSet() {
  PROCESS_MEMORY_COUNTERS counters{};
  GetProcessMemoryInfo(GetCurrentProcess(), &counters, sizeof(counters));
  return counters.WorkingSetSize;
}

constexpr int kOpeners = 4;

void Many(const char* path, int ports, char** port) {
  const std::string name = std::filesystem::path(path).filename().string();
  std::vector<void*> receivers(static_cast<size_t>(ports));
  std::atomic<size_t> failures = 0;
  const auto at_once = [&](const auto& work) {
    std::vector<std::jthread> workers;
    for (int i = 0; i < ports; ++i) {
      workers.emplace_back([&, i] {
        try {
          work(static_cast<size_t>(i));
        } catch (const std::exception&) {
          ++failures;
        }
      });
    }
  };
  const size_t empty = WorkingSet();
  at_once([&](size_t i) { receivers[i] = Find(Wide(port[i])); });
  const size_t found = WorkingSet();
  std::atomic<size_t> bytes = 0;
  const double before = ProcessorSeconds();
  const auto start = std::chrono::steady_clock::now();
  at_once([&](size_t i) { bytes += Download(receivers[i], Wide(name.c_str())); });
  const std::chrono::duration<double> passed = std::chrono::steady_clock::now() - start;
  const double used = ProcessorSeconds() - before;

  std::ifstream file(path, std::ios::binary);
  const std::string content{std::istreambuf_iterator<char>(file), {}};
  std::atomic<bool> over = false;
  std::vector<std::jthread> openers;
  for (int n = 0; n < kOpeners; ++n) {
    openers.emplace_back([&, n] {
      for (size_t i = static_cast<size_t>(n); !over; ++i) {
        std::wstring wanted = Wide(port[i % receivers.size()]);
        void* receiver = nullptr;
        if (devapi::OpenReceiver(wanted.data(), &receiver) != S_OK) ++failures;
        if (devapi::CloseReceiver(receiver) != S_FALSE) ++failures;
      }
    });
  }
  at_once([&](size_t i) {
    MemoryStream stream;
    std::wstring wanted = Wide(name.c_str());
    if (devapi::DownloadFile(receivers[i], wanted.data(), &stream, nullptr) != S_OK ||
        stream.bytes != content) {
      ++failures;
    }
  });
  over = true;
  openers.clear();
  // One user of each is left.
  for (void* receiver : receivers) {
    if (devapi::CloseReceiver(receiver) != S_OK) ++failures;
  }
  std::printf(
      "{\"receivers\": %d, \"failures\": %zu, \"bytes\": %zu, \"seconds\": %.3f, \"processor_s\": "
      "%.3f, "
      "\"working_set_empty\": %zu, \"working_set_found\": %zu}\n",
      ports,
      failures.load(),
      bytes.load(),
      passed.count(),
      used,
      empty,
      found);
}

// How long an operation takes to return after its abort, in milliseconds, `count` times, each at another moment.
std::vector<double> AbortAgainAndAgain(void* receiver,
                                       int count,
                                       const std::function<void()>& operate) {
  using Clock = std::chrono::steady_clock;
  using Milliseconds = std::chrono::duration<double, std::milli>;
  constexpr double kLongest = 3000;  // no download ends before
  const auto recover = [&] {
    // The abort may end one more operation.
    long result = S_FALSE;
    while (result == S_FALSE) {
      void* list = nullptr;
      result = devapi::OpenFileList(receiver, &list);
      if (list) devapi::CloseFileList(list);
    }
    if (result != S_OK) throw std::runtime_error("no list after an abort");
  };
  std::mt19937 random;
  double longest = kLongest;
  std::vector<double> times;
  while (times.size() < static_cast<size_t>(count)) {
    Clock::time_point end;
    const auto begin = Clock::now();
    std::thread worker([&] {
      operate();
      end = Clock::now();
    });
    std::this_thread::sleep_for(
        Milliseconds(std::uniform_real_distribution<double>(0, longest)(random)));
    const auto aborted = Clock::now();
    devapi::Abort(receiver);
    worker.join();
    if (end > aborted) {
      times.push_back(Milliseconds(end - aborted).count());
    } else {
      longest = std::min(longest, Milliseconds(end - begin).count());
    }
    recover();
  }
  return times;
}

void Aborts(const std::string& operation, const char* name, int count, const char* port) {
  std::wstring wanted = Wide(port);
  std::wstring file = Wide(name);
  void* receiver = nullptr;
  DCB settings{};
  settings.BaudRate = CBR_115200;
  settings.fBinary = TRUE;
  settings.ByteSize = 8;
  if (devapi::CreateReceiverOnSerial(wanted.data(), eProtocolAny, &settings, nullptr, &receiver) !=
      S_OK) {
    throw std::runtime_error("no receiver");
  }
  const auto operate = [&] {
    if (operation == "check") {
      short answer = 0;
      devapi::CheckConnection(receiver, nullptr, &answer);
    } else if (operation == "list") {
      void* list = nullptr;
      devapi::OpenFileList(receiver, &list);
      if (list) devapi::CloseFileList(list);
    } else {
      Sink sink;
      devapi::DownloadFile(receiver, file.data(), &sink, nullptr);
    }
  };
  const std::vector<double> times = AbortAgainAndAgain(receiver, count, operate);
  std::printf("{\"milliseconds\": [");
  for (size_t n = 0; n < times.size(); ++n) std::printf("%s%.2f", n == 0 ? "" : ", ", times[n]);
  std::printf("]}\n");
  devapi::CloseReceiver(receiver);
}

}  // namespace

int main(int argc, char** argv) try {
  if (argc == 5 && std::strcmp(argv[1], "calls") == 0) return CountCalls(argv + 2), 0;
  if (argc >= 4 && std::strcmp(argv[1], "many") == 0) return Many(argv[2], argc - 3, argv + 3), 0;
  if (argc == 6 && std::strcmp(argv[1], "aborts") == 0)
    return Aborts(argv[2], argv[3], std::atoi(argv[4]), argv[5]), 0;
  std::puts(
      "usage: bench-host calls PORT SMALL LARGE | many FILE PORT... | aborts OPERATION NAME COUNT "
      "PORT");
  return 2;
} catch (const std::exception& error) {
  std::printf("bench-host: %s\n", error.what());
  return 1;
}
