// What a host does with a receiver, one operation after the other, on a simulated port in memory.
#ifndef RCVLINK_TESTS_TORTURE_SESSION_H_
#define RCVLINK_TESTS_TORTURE_SESSION_H_

#include <memory>
#include <string>

#include "platform/api_types.h"
#include "simulator/damaged_line.h"
#include "simulator/files.h"
#include "simulator/receiver.h"
#include "tests/support/manual_clock.h"
#include "tests/support/memory_stream.h"
#include "tests/torture/faulty_calls.h"
#include "transport/device_calls.h"

namespace torture {

// A kind of receiver and its link.
struct Link {
  const char* name;  // for the test
  EInstanceType instance;
  EProtocol family;

  wchar_t* port() const;  // the name under which a search finds it
};

inline constexpr Link kLinks[] = {{"QuorinOnSerial", eInstanceSerial, eProtocolQuorin},
                                  {"VelmarOnSerial", eInstanceSerial, eProtocolVelmar},
                                  {"QuorinOnUsb", eInstanceUSB, eProtocolQuorin}};

// The receiver at the other end, with the Win32 calls through which the library reaches it.
class Bench {
 public:
  // The receiver has the files that a session needs, or these.
  explicit Bench(const Link& link);
  Bench(const Link& link, sim::FileStore files);

  ~Bench();

  // What a session needs: three files with this content.
  static constexpr long kFiles = 3;
  static std::string FileContent();

  FaultyCalls& calls() { return faulty_; }
  ManualClock& clock() { return clock_; }

  // From now on the line damages what it carries.
  void Damage(const sim::DamageOptions& options);
  // Aborts the operations of the receiver from that time on, as a host does that has lost patience.
  void AbortAfter(void* receiver, DWORD milliseconds);

 private:
  class Line;
  class Port;

  ManualClock clock_;
  std::unique_ptr<sim::Receiver> receiver_;
  std::unique_ptr<Line> line_;
  std::unique_ptr<Port> port_;
  FaultyCalls faulty_;
  rcvlink::SystemCallsOverride override_{faulty_};
};

// A receiver that a search has found, closed in the end.
class Found {
 public:
  explicit Found(const Link& link);
  Found(const Found&) = delete;
  Found& operator=(const Found&) = delete;
  ~Found() { devapi::CloseReceiver(handle_); }
  void* handle() const { return handle_; }

 private:
  void* handle_ = nullptr;
};

// The results of the operations; those that were not called have kNotCalled.
struct Session {
  static constexpr long kNotCalled = 0x7FFFFFFF;

  long search = kNotCalled;
  long info = kNotCalled;
  long list = kNotCalled;
  long count = 0;  // files in the list
  long download = kNotCalled;
  long remove = kNotCalled;
  long close = kNotCalled;

  // Every operation in this order, as far as the search found a receiver. Nothing of it allocates
  // but the library.
  void Run(const Link& link, IStream* stream, bool removes);

  // Whether all succeeded, and the bytes are those of the file.
  bool IsWhole(const std::string& bytes) const;
  std::string InWords() const;
};

}  // namespace torture

#endif  // RCVLINK_TESTS_TORTURE_SESSION_H_
