// The opening of a USB device whose driver answers what the input says, and transfers on it.
#include "platform/hresult.h"
#include "tests/fuzz/target.h"
#include "tests/support/fake_device.h"
#include "tests/support/manual_clock.h"
#include "transport/usb_connection.h"

namespace {

// Each request and each transfer takes an answer: a byte for its kind and the kind's own bytes. After the end of the
// input all succeed without bytes.
class Driver : public FakeDevice {
 public:
  Driver(fuzz::Input& input, ManualClock& clock) : input_(input), clock_(clock) {}

  BOOL DeviceIoControl(HANDLE,
                       DWORD,
                       void*,
                       DWORD,
                       void* output,
                       DWORD output_size,
                       DWORD* returned,
                       OVERLAPPED* block) override {
    return Answer(output, output_size, returned, block);
  }
  BOOL ReadFile(HANDLE, void* buffer, DWORD size, DWORD* read, OVERLAPPED* block) override {
    return Answer(buffer, size, read, block);
  }
  BOOL WriteFile(HANDLE, const void*, DWORD, DWORD* written, OVERLAPPED* block) override {
    return Answer(nullptr, 0, written, block);
  }

 private:
  BOOL Answer(void* to, DWORD size, DWORD* count, OVERLAPPED* block) {
    constexpr ULONG_PTR kPending = 0x103;  // STATUS_PENDING
    constexpr DWORD kOfDriver = 0xE0000000;
    const uint8_t kind = input_.Byte();
    clock_.now += kind;
    block->Internal = 0;
    switch (kind % 6) {
      case 0:
        *count = Give(to, size);
        return TRUE;
      case 1:
        return Fail(input_.Word());
      case 2:
        return Fail(kOfDriver | input_.Word());
      case 3:  // it ends later
        transferred = Give(to, size);
        overlapped_error = input_.Word();
        return Wait(/*ends=*/true, kDone);
      case 4:  // it ends when it is cancelled
        return Wait(/*ends=*/false, WaitAnswer());
      default:  // it never ends
        block->Internal = kPending;
        return Wait(/*ends=*/false, WaitAnswer());
    }
  }

  DWORD Give(void* to, DWORD size) {
    const std::string bytes = input_.Text();
    const size_t count = std::min<size_t>(bytes.size(), size);
    std::copy_n(bytes.begin(), count, static_cast<char*>(to));
    return static_cast<DWORD>(count);
  }

  BOOL Wait(bool ends, DWORD answer) {
    hangs = !ends;
    wait_answer = answer;
    return Fail(ERROR_IO_PENDING);
  }

  // A transfer's wait: it takes too long, is aborted, or fails.
  DWORD WaitAnswer() {
    constexpr std::array kAnswers = {DWORD{WAIT_TIMEOUT}, DWORD{WAIT_OBJECT_0}, WAIT_FAILED};
    return kAnswers.at(input_.Byte() % kAnswers.size());
  }

  static BOOL Fail(DWORD error) {
    SetLastError(error);
    return FALSE;
  }

  fuzz::Input& input_;
  ManualClock& clock_;
};

void Read(CUSBConnection& connection, DWORD size) {
  // Of its own length, so that the sanitizer sees a write beyond it.
  std::vector<char> buffer(size);
  DWORD count = 0;
  connection.Read(buffer.data(), size, &count, /*timeout_ms=*/700);
  if (count > size) std::abort();
}

void Write(CUSBConnection& connection, const std::string& text, DWORD timeout_ms) {
  const std::vector<char> bytes(text.begin(), text.end());
  connection.Write(bytes.data(), static_cast<DWORD>(bytes.size()), timeout_ms);
}

}  // namespace

void fuzz::Target(std::span<const uint8_t> bytes) {
  Input input(bytes);
  ManualClock clock;
  Driver driver(input, clock);
  CUSBConnection connection(driver);
  connection.Open(L"\\\\?\\device");
  while (!input.AtEnd()) {
    switch (input.Byte() % 5) {
      case 0:
        Read(connection, input.Byte());
        break;
      case 1:
        Write(connection, input.Text(), input.Byte());
        break;
      case 2:
        connection.Flush();
        break;
      case 3:
        connection.Cancel();
        break;
      default:
        connection.ClearCancel();
    }
  }
}
