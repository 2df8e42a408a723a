#include "simulator/ports/pipe.h"

#include <algorithm>
#include <optional>
#include <utility>

namespace sim {
namespace {

// Enough for a host that opens two handles and comes again while its old ones are being closed.
constexpr size_t kEnds = 8;
constexpr DWORD kBufferSize = 65536;
constexpr size_t kReadSize = 4096;
// More than the buffer of the pipe: a handle that nobody reads is full long before one that is read.
constexpr size_t kMostWaiting = 16 * kBufferSize;

UniqueHandle MakePipe(const std::wstring& path, bool first) {
  UniqueHandle pipe(CreateNamedPipeW(
      path.c_str(),
      PIPE_ACCESS_DUPLEX | FILE_FLAG_OVERLAPPED | (first ? FILE_FLAG_FIRST_PIPE_INSTANCE : 0),
      PIPE_TYPE_BYTE | PIPE_READMODE_BYTE | PIPE_REJECT_REMOTE_CLIENTS,
      kEnds,
      kBufferSize,
      kBufferSize,
      /*nDefaultTimeOut=*/0,
      nullptr));
  if (pipe.get() == INVALID_HANDLE_VALUE) {
    ThrowLastError("cannot make the pipe");
  }
  return pipe;
}

}  // namespace

PipeEnd::PipeEnd(const std::wstring& path, bool first)
    : pipe_(MakePipe(path, first)), read_(pipe_.get()), write_(pipe_.get()) {
  // A host may have opened it already, so it is not disconnected first.
  Connect();
}

std::vector<HANDLE> PipeEnd::Events() const {
  std::vector<HANDLE> events = {read_.event()};
  if (write_.on_its_way()) {
    events.push_back(write_.event());
  }
  return events;
}

Bytes PipeEnd::Step() {
  if (write_.on_its_way() && IsSet(write_.event())) {
    write_.Finish();
    WriteWaiting();
  }
  Bytes heard;
  while (IsSet(read_.event())) {
    const std::optional<size_t> count = read_.Finish();
    if (!std::exchange(connected_, true)) {
      StartRead();
    } else if (!count) {
      WaitForHost();
    } else {
      const auto bytes = read_.bytes().first(*count);
      heard.insert(heard.end(), bytes.begin(), bytes.end());
      StartRead();
    }
  }
  return heard;
}

void PipeEnd::WaitForHost() {
  connected_ = false;
  waiting_.clear();
  read_.Cancel();
  write_.Cancel();
  DisconnectNamedPipe(pipe_.get());
  Connect();
}

void PipeEnd::Connect() {
  // A host may have come and gone by now.
  while (!read_.StartConnect() && GetLastError() == ERROR_NO_DATA) {
    DisconnectNamedPipe(pipe_.get());
  }
  if (!read_.on_its_way()) {
    ThrowLastError("cannot wait for a host");
  }
}

void PipeEnd::StartRead() {
  if (!read_.StartRead(kReadSize)) {
    WaitForHost();
  }
}

// It is the pipe that knows whether there is a host: one that has just opened a handle for reading
// writes its command on another, and must get the answer.
void PipeEnd::Send(const Bytes& bytes) {
  if (waiting_.size() + bytes.size() <= kMostWaiting) {
    waiting_.insert(waiting_.end(), bytes.begin(), bytes.end());
  }
  WriteWaiting();
}

void PipeEnd::WriteWaiting() {
  if (!write_.on_its_way() && !waiting_.empty()) {
    write_.StartWrite(std::exchange(waiting_, {}));
  }
}

PipePort::PipePort(const std::wstring& path) : path_(path) { PlugIn(); }

void PipePort::PlugIn() {
  while (ends_.size() < kEnds) {
    ends_.push_back(std::make_unique<PipeEnd>(path_, ends_.empty()));
  }
}

// A handle that its host only writes to is full for ever, so one that has room is enough.
bool PipePort::HasRoom() const {
  const auto full = [](const auto& end) { return end->connected() && !end->idle(); };
  const auto has_room = [](const auto& end) { return end->connected() && end->idle(); };
  return std::ranges::any_of(ends_, has_room) || std::ranges::none_of(ends_, full);
}

void PipePort::Serve(Receiver& receiver, HANDLE stop) {
  while (!receiver.gone()) {
    // The stop is the first, so that it is seen even when others are set too.
    std::vector<HANDLE> events = {stop};
    for (const auto& end : ends_) {
      const std::vector<HANDLE> of_end = end->Events();
      events.insert(events.end(), of_end.begin(), of_end.end());
    }
    WaitForEvents(events, HasRoom() ? clock_.WaitMs(receiver) : std::nullopt);
    if (IsSet(stop)) {
      return;
    }
    for (const auto& end : ends_) {
      if (const Bytes heard = end->Step(); !heard.empty()) {
        receiver.Receive(heard, /*host_speed=*/0, clock_.NowMs());
      }
    }
    // One piece at a time, so that a receiver with a lot to send still listens.
    if (clock_.IsDue(receiver) && HasRoom()) {
      const Bytes sent = receiver.Send(clock_.NowMs(), /*host_speed=*/0);
      for (const auto& end : ends_) {
        end->Send(sent);
      }
    }
    if (!receiver.plugged()) {
      // First those without a host, so that one that is hung up finds none of them.
      std::erase_if(ends_, [](const auto& end) { return !end->connected(); });
      ends_.clear();
    } else {
      PlugIn();
    }
  }
}

}  // namespace sim
