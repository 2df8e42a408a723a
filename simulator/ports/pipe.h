// A receiver on a named pipe (Windows).
#ifndef SIMULATOR_PORTS_PIPE_H_
#define SIMULATOR_PORTS_PIPE_H_

#include <deque>
#include <memory>
#include <string>
#include <vector>

#include "simulator/bytes.h"
#include "simulator/ports/handle.h"
#include "simulator/ports/overlapped.h"
#include "simulator/ports/port_clock.h"
#include "simulator/receiver.h"

namespace sim {

// One handle of a host on the pipe, or the place for one.
class PipeEnd {
 public:
  // Waits for a host. Throws std::system_error.
  PipeEnd(const std::wstring& path, bool first);

  // Set when something has happened that Step deals with.
  std::vector<HANDLE> Events() const;
  // Goes on with what has ended; gives what the host has sent.
  Bytes Step();

  // Sends bytes to a host that reads. They are lost without a host, and when very many wait.
  void Send(const Bytes& bytes);
  bool connected() const { return connected_; }
  // True when nothing waits for the host.
  bool idle() const { return waiting_.empty() && !write_.on_its_way(); }

 private:
  void WaitForHost();
  void Connect();
  void StartRead();
  void WriteWaiting();

  UniqueHandle pipe_;
  // After the pipe, so that they end first.
  OverlappedTransfer read_;
  OverlappedTransfer write_;
  bool connected_ = false;
  Bytes waiting_;
};

// A receiver that hosts open by a path. A host may open it with several handles, for instance one for
// reading and one for writing: each of them hears the receiver, and is heard.
class PipePort {
 public:
  // `path` is \\.\pipe\NAME. Throws std::system_error when there is such a pipe.
  explicit PipePort(const std::wstring& path);

  // Carries bytes until the event `stop` is set or the receiver is gone. There is no pipe while the
  // receiver's plug is out.
  void Serve(Receiver& receiver, HANDLE stop);

 private:
  void PlugIn();
  bool HasRoom() const;

  std::wstring path_;
  std::vector<std::unique_ptr<PipeEnd>> ends_;
  PortClock clock_;
};

}  // namespace sim

#endif  // SIMULATOR_PORTS_PIPE_H_
