// What a host does with a receiver, one operation after the other, on a simulated port in memory.
#ifndef RCVLINK_TESTS_TORTURE_SESSION_H_
#define RCVLINK_TESTS_TORTURE_SESSION_H_

#include <cstddef>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "platform/api_types.h"
#include "simulator/damaged_line.h"
#include "simulator/files.h"
#include "simulator/receiver.h"
#include "tests/support/manual_clock.h"
#include "tests/support/memory_stream.h"
#include "tests/torture/faulty_calls.h"
#include "tests/torture/lock_probe.h"
#include "transport/device_calls.h"

namespace torture {

// A kind of receiver and its link.
struct Link {
  const char* name;  // for the test
  EInstanceType instance;
  EProtocol family;
  DWORD speed = CBR_9600;  // of the receiver's port

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

  // The files that the receiver still has.
  long CountFiles() const;
  bool HasFile(const std::string& name) const;
  // Whether the two ends of the line have the same speed.
  bool IsInTune() const;

  FaultyCalls& calls() { return faulty_; }
  const FaultyCalls& calls() const { return faulty_; }
  ManualClock& clock() { return clock_; }

  // From now on the line damages what it carries.
  void Damage(const sim::DamageOptions& options);
  // Aborts the operations of the receiver from that time on, as a host does that has lost patience.
  void AbortAfter(void* receiver, DWORD milliseconds);
  bool has_aborted() const { return has_aborted_; }
  // From now on writes and requests to the driver are pending at first, as reads always are.
  void MakePending();

 private:
  class Line;
  class Port;

  ManualClock clock_;
  const sim::FileStore* files_ = nullptr;  // of the next
  std::unique_ptr<sim::Receiver> receiver_;
  std::unique_ptr<Line> line_;
  std::unique_ptr<Port> port_;
  bool has_aborted_ = false;
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

inline constexpr long kNotCalled = 0x7FFFFFFF;  // instead of a result

// What reading the directory gave.
struct Listing {
  long result = kNotCalled;
  long count = 0;
  bool are_files = true;  // whether each entry has the name and the size of one of the files

  // Closes the list that it opens.
  static Listing Of(void* receiver);
};

// Looks after each operation of a session whether its fault has come, and who has the lock.
struct Watch {
  LockProbe& locks;
  std::function<bool()> has_failed;
};

// The results of the operations; those that were not called have kNotCalled.
struct Session {
  long search = kNotCalled;
  long info = kNotCalled;
  bool has_texts = false;  // whether the identity is that of the receiver
  Listing list;
  long download = kNotCalled;
  long remove = kNotCalled;
  long close = kNotCalled;

  // With a watch: the operation in which the fault came, and the directory read just after it, on
  // the same handle.
  std::string_view failed_in;
  Listing next;
  // The first operation after which the lock was not as it has to be.
  std::string_view wrong_lock;

  // Every operation in this order, as far as the search found a receiver. Nothing of it allocates
  // but the library.
  void Run(const Link& link, IStream* stream, bool removes, const Watch* watch = nullptr);

  // Whether all succeeded, and the bytes are those of the file.
  bool IsWhole(const std::string& bytes) const;
  std::string InWords() const;

 private:
  void CheckLock(std::string_view operation, void* receiver, long expected, const Watch& watch);
  void CheckAfter(std::string_view operation, void* receiver, const Watch* watch);
};

}  // namespace torture

#endif  // RCVLINK_TESTS_TORTURE_SESSION_H_
