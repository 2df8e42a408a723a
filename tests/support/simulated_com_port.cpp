#include "tests/support/simulated_com_port.h"

#include <algorithm>
#include <span>

SimulatedComPort::SimulatedComPort(sim::Receiver& receiver, ManualClock& clock)
    : port_(receiver, clock.now), clock_(clock) {
  state.DCBlength = sizeof(DCB);
}

void SimulatedComPort::Follow() { port_.Advance(clock_.now - port_.Now()); }

HANDLE SimulatedComPort::CreateFile(const wchar_t* name, DWORD, DWORD, DWORD) {
  if (name != path) {
    SetLastError(ERROR_FILE_NOT_FOUND);
    return INVALID_HANDLE_VALUE;
  }
  if (openings++ == 0) first_state_ = state;
  if (forgets) state = first_state_;
  port_.SetHostSpeed(state.BaudRate);
  // A real handle that can be closed.
  return CreateFileW(L"NUL", GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, 0, nullptr);
}

sim::Bytes SimulatedComPort::Take(size_t max_bytes, uint64_t timeout_ms) {
  if (Carries()) return port_.Read(max_bytes, timeout_ms);
  port_.Advance(timeout_ms);
  port_.Purge();
  return {};
}

BOOL SimulatedComPort::ReadFile(HANDLE, void* buffer, DWORD size, DWORD*, OVERLAPPED*) {
  Follow();
  const uint64_t limit_ms =
      uint64_t{timeouts_.ReadTotalTimeoutMultiplier} * size + timeouts_.ReadTotalTimeoutConstant;
  const uint64_t end_ms = is_usb ? UINT64_MAX : port_.Now() + limit_ms;
  pending_ = {static_cast<uint8_t*>(buffer), size, 0, end_ms};
  SetLastError(ERROR_IO_PENDING);
  return FALSE;
}

BOOL SimulatedComPort::WriteFile(
    HANDLE, const void* buffer, DWORD size, DWORD* written, OVERLAPPED*) {
  Follow();
  if (Carries()) port_.Write(std::span(static_cast<const uint8_t*>(buffer), size), state.BaudRate);
  *written = size;
  return TRUE;
}

// A read ends when it is complete, when the line was quiet for the interval, or at its limit.
DWORD SimulatedComPort::WaitForMultipleObjects(DWORD count,
                                               const HANDLE* handles,
                                               DWORD timeout_ms) {
  // The last is the transfer's own; the others end the wait early.
  const DWORD own = count - 1;
  for (DWORD i = 0; i < own; ++i) {
    if (::WaitForSingleObject(handles[i], 0) == WAIT_OBJECT_0) return WAIT_OBJECT_0 + i;
  }
  Follow();
  const uint64_t patience_ms = port_.Now() + timeout_ms;
  uint64_t end_ms = pending_.end_ms;
  while (pending_.received < pending_.size && port_.Now() < std::min(end_ms, patience_ms)) {
    const sim::Bytes bytes =
        Take(pending_.size - pending_.received, std::min(end_ms, patience_ms) - port_.Now());
    std::ranges::copy(bytes, pending_.buffer + pending_.received);
    pending_.received += static_cast<DWORD>(bytes.size());
    if (!bytes.empty() && is_usb) end_ms = port_.Now();
    if (!bytes.empty() && !is_usb) {
      end_ms = std::min(pending_.end_ms, port_.Now() + timeouts_.ReadIntervalTimeout);
    }
  }
  clock_.now = static_cast<DWORD>(port_.Now());
  const bool over = pending_.received == pending_.size || port_.Now() >= end_ms;
  return over ? WAIT_OBJECT_0 + own : WAIT_TIMEOUT;
}

BOOL SimulatedComPort::GetOverlappedResult(HANDLE, OVERLAPPED*, DWORD* bytes) {
  *bytes = pending_.received;
  return TRUE;
}

BOOL SimulatedComPort::CancelIo(HANDLE) { return TRUE; }

DWORD SimulatedComPort::WaitForSingleObject(HANDLE, DWORD) { return WAIT_OBJECT_0; }

BOOL SimulatedComPort::SetCommMask(HANDLE, DWORD) { return TRUE; }

BOOL SimulatedComPort::SetupComm(HANDLE, DWORD, DWORD) { return TRUE; }

BOOL SimulatedComPort::GetCommState(HANDLE, DCB* block) {
  *block = state;
  return TRUE;
}

BOOL SimulatedComPort::SetCommState(HANDLE, DCB* block) {
  Follow();
  state = *block;
  set_states.push_back(state);
  port_.SetHostSpeed(state.BaudRate);
  return TRUE;
}

BOOL SimulatedComPort::SetCommTimeouts(HANDLE, COMMTIMEOUTS* block) {
  timeouts_ = *block;
  return TRUE;
}

BOOL SimulatedComPort::ClearCommError(HANDLE, DWORD* errors, COMSTAT* status) {
  *errors = 0;
  *status = COMSTAT{};
  return TRUE;
}

BOOL SimulatedComPort::PurgeComm(HANDLE, DWORD) {
  Follow();
  port_.Purge();
  return TRUE;
}
