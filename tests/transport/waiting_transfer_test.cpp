// Reads and writes that really wait, on a named pipe that replaces a serial port.
#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <functional>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "platform/handle.h"
#include "platform/hresult.h"
#include "transport/serial_connection.h"

using rcvlink::DeviceCalls;
using rcvlink::FileHandle;
using rcvlink::KernelHandle;

namespace {

constexpr DWORD kBufferBytes = 4096;
constexpr DWORD kPatienceMs = 20000;  // of a test that fails

// The system's own calls, except those that only a serial port supports.
class PipeCalls : public DeviceCalls {
 public:
  std::function<void(const HANDLE* handles)> on_wait;  // runs first
  int waits = 0;

  DWORD WaitForMultipleObjects(DWORD count, const HANDLE* handles, DWORD timeout_ms) override {
    ++waits;
    if (on_wait) on_wait(handles);
    return DeviceCalls::WaitForMultipleObjects(count, handles, timeout_ms);
  }

  BOOL SetCommMask(HANDLE, DWORD) override { return TRUE; }
  BOOL SetupComm(HANDLE, DWORD, DWORD) override { return TRUE; }
  BOOL GetCommState(HANDLE, DCB*) override { return TRUE; }
  BOOL SetCommState(HANDLE, DCB*) override { return TRUE; }
  BOOL SetCommTimeouts(HANDLE, COMMTIMEOUTS*) override { return TRUE; }
  BOOL ClearCommError(HANDLE, DWORD* errors, COMSTAT* status) override {
    *errors = 0;
    *status = COMSTAT{};
    return TRUE;
  }
  BOOL PurgeComm(HANDLE, DWORD) override { return TRUE; }
};

KernelHandle NewEvent() { return KernelHandle(CreateEventW(nullptr, TRUE, FALSE, nullptr)); }

class WaitingTransfer : public testing::Test {
 protected:
  WaitingTransfer() {
    static std::atomic<int> counter = 0;
    const std::wstring name = L"pipe\\rcvlink-wait-" + std::to_wstring(GetCurrentProcessId()) +
                              L"-" + std::to_wstring(counter++);
    far_end = FileHandle(CreateNamedPipeW((L"\\\\.\\" + name).c_str(),
                                          PIPE_ACCESS_DUPLEX,
                                          PIPE_TYPE_BYTE,
                                          1,
                                          kBufferBytes,
                                          kBufferBytes,
                                          0,
                                          nullptr));
    const DCB settings{};
    opened = connection.Open(name.c_str(), &settings);
    calls.on_wait = [this](const HANDLE*) { SetEvent(waiting.get()); };
  }
  void SetUp() override { ASSERT_EQ(opened, S_OK); }

  // Executes a function on another thread when the transfer waits.
  std::thread WhenItWaits(std::function<void()> action) {
    ResetEvent(waiting.get());
    return std::thread([this, action = std::move(action)] {
      EXPECT_EQ(WaitForSingleObject(waiting.get(), kPatienceMs), WAIT_OBJECT_0);
      action();
    });
  }

  HRESULT Read() { return connection.Read(buffer.data(), kBufferBytes, &count, kPatienceMs); }
  std::string Received() const { return {buffer.data(), count}; }
  void Say(std::string_view text) const {
    DWORD written = 0;
    EXPECT_TRUE(
        WriteFile(far_end.get(), text.data(), static_cast<DWORD>(text.size()), &written, nullptr));
  }
  // More than the pipe holds.
  HRESULT WriteMuch() {
    const std::vector<char> much(size_t{16} * kBufferBytes, 'x');
    return connection.Write(much.data(), static_cast<DWORD>(much.size()), kPatienceMs);
  }

  PipeCalls calls;
  CSerialConnection connection{calls};
  FileHandle far_end;
  HRESULT opened = E_FAIL;
  const KernelHandle waiting = NewEvent();
  const KernelHandle outside = NewEvent();
  std::array<char, kBufferBytes> buffer{};
  DWORD count = 0;
};

TEST_F(WaitingTransfer, AnOutsideEventEndsARead) {
  connection.SetAbortEvent(outside.get());
  std::thread other = WhenItWaits([&] { SetEvent(outside.get()); });
  EXPECT_EQ(Read(), S_FALSE);
  other.join();
  EXPECT_EQ(count, 0u);
  EXPECT_EQ(calls.waits, 1);

  // No pending read is left that would take later bytes.
  ResetEvent(outside.get());
  Say("later");
  EXPECT_EQ(Read(), S_OK);
  EXPECT_EQ(Received(), "later");
}

TEST_F(WaitingTransfer, AnOutsideEventThatIsSignalledEndsEveryRead) {
  connection.SetAbortEvent(outside.get());
  SetEvent(outside.get());
  EXPECT_EQ(Read(), S_FALSE);
  EXPECT_EQ(Read(), S_FALSE);
  EXPECT_EQ(calls.waits, 2);
}

TEST_F(WaitingTransfer, CancelDoesNotEndAReadWhileThereIsAnOutsideEvent) {
  connection.SetAbortEvent(outside.get());
  std::thread other = WhenItWaits([&] {
    connection.Cancel();
    Say("data");
  });
  EXPECT_EQ(Read(), S_OK);
  other.join();
  EXPECT_EQ(Received(), "data");
  EXPECT_EQ(calls.waits, 1);

  // It is kept until the event is removed, and ends one read.
  connection.SetAbortEvent(nullptr);
  EXPECT_EQ(Read(), S_FALSE);
  std::thread sender = WhenItWaits([&] { Say("more"); });
  EXPECT_EQ(Read(), S_OK);
  sender.join();
  EXPECT_EQ(Received(), "more");
}

TEST_F(WaitingTransfer, CancelEndsAReadAfterTheEventWasRemoved) {
  connection.SetAbortEvent(outside.get());
  connection.SetAbortEvent(nullptr);
  std::thread other = WhenItWaits([&] { connection.Cancel(); });
  EXPECT_EQ(Read(), S_FALSE);
  other.join();
  EXPECT_EQ(calls.waits, 1);
}

TEST_F(WaitingTransfer, AnEventThatWasRemovedEndsNothing) {
  connection.SetAbortEvent(outside.get());
  connection.SetAbortEvent(nullptr);
  std::thread other = WhenItWaits([&] {
    SetEvent(outside.get());
    Say("data");
  });
  EXPECT_EQ(Read(), S_OK);
  other.join();
  EXPECT_EQ(Received(), "data");
}

TEST_F(WaitingTransfer, AnotherEventReplacesTheFirst) {
  const KernelHandle second = NewEvent();
  connection.SetAbortEvent(outside.get());
  connection.SetAbortEvent(second.get());
  SetEvent(outside.get());
  std::thread other = WhenItWaits([&] { SetEvent(second.get()); });
  EXPECT_EQ(Read(), S_FALSE);
  other.join();
  EXPECT_EQ(WaitForSingleObject(waiting.get(), 0), WAIT_OBJECT_0);

  ResetEvent(second.get());
  std::thread sender = WhenItWaits([&] { Say("data"); });
  EXPECT_EQ(Read(), S_OK) << "the first still counts";
  sender.join();
}

// Both happen before the wait: the read is complete, but the abort has priority.
class WaitingTransferWithBoth : public WaitingTransfer {
 protected:
  void SayAndWaitForIt(HANDLE read_event) {
    Say("data");
    EXPECT_EQ(WaitForSingleObject(read_event, kPatienceMs), WAIT_OBJECT_0);
  }
};

TEST_F(WaitingTransferWithBoth, TheOutsideEventWins) {
  connection.SetAbortEvent(outside.get());
  calls.on_wait = [&](const HANDLE* handles) {
    SayAndWaitForIt(handles[1]);
    SetEvent(outside.get());
  };
  EXPECT_EQ(Read(), S_FALSE);
  EXPECT_EQ(count, 0u);
  EXPECT_EQ(calls.waits, 1);
}

TEST_F(WaitingTransferWithBoth, CancelWins) {
  calls.on_wait = [&](const HANDLE* handles) {
    SayAndWaitForIt(handles[1]);
    connection.Cancel();
  };
  EXPECT_EQ(Read(), S_FALSE);
  EXPECT_EQ(count, 0u);
  EXPECT_EQ(calls.waits, 1);
}

TEST_F(WaitingTransfer, AnOutsideEventEndsAWrite) {
  connection.SetAbortEvent(outside.get());
  std::thread other = WhenItWaits([&] { SetEvent(outside.get()); });
  EXPECT_EQ(WriteMuch(), S_FALSE);
  other.join();
  EXPECT_EQ(calls.waits, 1);
}

TEST_F(WaitingTransfer, CancelEndsAWriteOnlyWithoutAnOutsideEvent) {
  connection.SetAbortEvent(outside.get());
  std::thread other = WhenItWaits([&] {
    connection.Cancel();
    SetEvent(outside.get());
  });
  EXPECT_EQ(WriteMuch(), S_FALSE);
  other.join();

  // The cancel did not end it: it is still set.
  connection.SetAbortEvent(nullptr);
  EXPECT_EQ(WriteMuch(), S_FALSE);
  EXPECT_EQ(calls.waits, 2);
}

}  // namespace
