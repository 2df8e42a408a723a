#include "simulator/ports/com.h"

#include <algorithm>
#include <optional>
#include <stdexcept>
#include <utility>
#include <vector>

namespace sim {
namespace {

constexpr size_t kMostRead = 4096;
constexpr BYTE kDataBits = 8;

UniqueHandle OpenPort(const std::wstring& name) {
  // Without this prefix, ports above COM9 cannot be opened.
  const std::wstring path = L"\\\\.\\" + name;
  UniqueHandle port(CreateFileW(path.c_str(),
                                GENERIC_READ | GENERIC_WRITE,
                                /*dwShareMode=*/0,
                                nullptr,
                                OPEN_EXISTING,
                                FILE_FLAG_OVERLAPPED,
                                nullptr));
  if (port.get() == INVALID_HANDLE_VALUE) {
    ThrowLastError("cannot open the port");
  }
  // Reads end when all that they ask for has come, and only then.
  COMMTIMEOUTS timeouts{};
  if (!SetCommTimeouts(port.get(), &timeouts)) {
    ThrowLastError("cannot set the port's time-outs");
  }
  return port;
}

}  // namespace

ComPort::ComPort(const std::wstring& name)
    : port_(OpenPort(name)), read_(port_.get()), write_(port_.get()) {}

void ComPort::SetSpeed(uint32_t speed) {
  DCB settings{};
  settings.DCBlength = sizeof(settings);
  if (!GetCommState(port_.get(), &settings)) {
    ThrowLastError("cannot read the port's settings");
  }
  settings.BaudRate = speed;
  settings.ByteSize = kDataBits;
  settings.Parity = NOPARITY;
  settings.StopBits = ONESTOPBIT;
  settings.fBinary = TRUE;
  settings.fParity = FALSE;
  settings.fOutxCtsFlow = FALSE;
  settings.fOutxDsrFlow = FALSE;
  settings.fDsrSensitivity = FALSE;
  settings.fOutX = FALSE;
  settings.fInX = FALSE;
  settings.fNull = FALSE;
  // A host may wait for these lines.
  settings.fDtrControl = DTR_CONTROL_ENABLE;
  settings.fRtsControl = RTS_CONTROL_ENABLE;
  settings.fAbortOnError = FALSE;
  if (!SetCommState(port_.get(), &settings)) {
    ThrowLastError("cannot set the port");
  }
  speed_ = speed;
}

void ComPort::Serve(Receiver& receiver, HANDLE stop) {
  SetSpeed(receiver.speed());
  StartRead();
  while (!receiver.gone()) {
    std::vector<HANDLE> events = {stop, read_.event()};
    if (write_.on_its_way()) {
      events.push_back(write_.event());
    }
    // Nothing is sent while the port has no room.
    WaitForEvents(events, write_.on_its_way() ? std::nullopt : clock_.WaitMs(receiver));
    if (IsSet(stop)) {
      return;
    }
    if (write_.on_its_way() && IsSet(write_.event()) && !write_.Finish()) {
      ThrowLastError("cannot write to the port");
    }
    if (IsSet(read_.event())) {
      TakeInput(receiver);
    }
    if (!write_.on_its_way()) {
      FollowSpeed(receiver);
      SendDue(receiver);
    }
  }
}

// Asks for what has come already, or else waits for one byte.
void ComPort::StartRead() {
  COMSTAT state{};
  DWORD errors = 0;
  if (!ClearCommError(port_.get(), &errors, &state)) {
    ThrowLastError("cannot read the port's state");
  }
  if (!read_.StartRead(std::clamp<size_t>(state.cbInQue, 1, kMostRead))) {
    ThrowLastError("cannot read from the port");
  }
}

void ComPort::TakeInput(Receiver& receiver) {
  const std::optional<size_t> count = read_.Finish();
  if (!count) {
    ThrowLastError("cannot read from the port");
  }
  // A read without a time-out ends empty only when the port is gone.
  if (*count == 0) {
    throw std::runtime_error("the port has been removed");
  }
  receiver.Receive(read_.bytes().first(*count), /*host_speed=*/0, clock_.NowMs());
  StartRead();
}

// One piece at a time, so that a receiver with a lot to send still listens.
void ComPort::SendDue(Receiver& receiver) {
  if (!clock_.IsDue(receiver)) {
    return;
  }
  Bytes sent = receiver.Send(clock_.NowMs(), /*host_speed=*/0);
  if (!sent.empty() && !write_.StartWrite(std::move(sent))) {
    ThrowLastError("cannot write to the port");
  }
}

// The reply to a command that changes the speed leaves at the old one.
void ComPort::FollowSpeed(const Receiver& receiver) {
  if (receiver.speed() != speed_) {
    FlushFileBuffers(port_.get());
    SetSpeed(receiver.speed());
  }
}

}  // namespace sim
