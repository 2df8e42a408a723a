#include "tests/support/usb_pipes.h"

#include <algorithm>
#include <atomic>
#include <optional>

using rcvlink::FileHandle;
using rcvlink::KernelHandle;

namespace {

constexpr DWORD kBufferSize = 65536;

}  // namespace

UsbPipes::UsbPipes(sim::Receiver& receiver)
    : receiver_(receiver), stop_(CreateEventW(nullptr, TRUE, FALSE, nullptr)) {
  static std::atomic<int> counter = 0;
  path_ = L"\\\\.\\pipe\\rcvlink-test-" + std::to_wstring(GetCurrentProcessId()) + L"-" +
          std::to_wstring(counter++);
  for (End& end : ends_) {
    end.pipe = FileHandle(CreateNamedPipeW(path_.c_str(),
                                           PIPE_ACCESS_DUPLEX | FILE_FLAG_OVERLAPPED,
                                           PIPE_TYPE_BYTE,
                                           2,
                                           kBufferSize,
                                           kBufferSize,
                                           0,
                                           nullptr));
    end.event = KernelHandle(CreateEventW(nullptr, TRUE, FALSE, nullptr));
    end.block.hEvent = end.event.get();
    end.pending = !ConnectNamedPipe(end.pipe.get(), &end.block);
  }
  thread_ = std::thread([this] { Serve(); });
}

UsbPipes::~UsbPipes() {
  SetEvent(stop_.get());
  if (thread_.joinable()) thread_.join();
  for (End& end : ends_) {
    if (!end.pending) continue;
    DWORD count = 0;
    CancelIoEx(end.pipe.get(), &end.block);
    GetOverlappedResult(end.pipe.get(), &end.block, &count, TRUE);
  }
}

void UsbPipes::WaitUntilClosed() { thread_.join(); }

void UsbPipes::Serve() {
  const std::array<HANDLE, 3> events = {ends_[0].event.get(), ends_[1].event.get(), stop_.get()};
  for (;;) {
    const DWORD ended = WaitForMultipleObjects(3, events.data(), FALSE, INFINITE);
    if (ended > WAIT_OBJECT_0 + 1) return;
    const size_t index = ended - WAIT_OBJECT_0;
    if (!Advance(ends_.at(index), ends_.at(1 - index))) return;
  }
}

// Takes the received bytes and waits for more; false when the host has closed its end.
bool UsbPipes::Advance(End& end, End& other) {
  DWORD count = 0;
  end.pending = false;
  if (!GetOverlappedResult(end.pipe.get(), &end.block, &count, FALSE)) return false;
  if (end.connected) Hear(end.buffer.data(), count, other);
  end.connected = true;
  ResetEvent(end.event.get());
  const auto size = static_cast<DWORD>(end.buffer.size());
  end.pending = ReadFile(end.pipe.get(), end.buffer.data(), size, nullptr, &end.block) ||
                GetLastError() == ERROR_IO_PENDING;
  return end.pending;
}

void UsbPipes::Hear(const uint8_t* bytes, size_t size, End& other) {
  constexpr uint32_t kNoSpeed = 0;
  receiver_.Receive({bytes, size}, kNoSpeed, now_ms_);
  while (const std::optional<uint64_t> due = receiver_.NextSendTime()) {
    now_ms_ = std::max(now_ms_, *due);
    const sim::Bytes output = receiver_.Send(now_ms_, kNoSpeed);
    const KernelHandle done(CreateEventW(nullptr, TRUE, FALSE, nullptr));
    OVERLAPPED block{};
    block.hEvent = done.get();
    DWORD written = 0;
    WriteFile(other.pipe.get(), output.data(), static_cast<DWORD>(output.size()), nullptr, &block);
    GetOverlappedResult(other.pipe.get(), &block, &written, TRUE);
  }
}
