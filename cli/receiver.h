// The receiver at the other end of the cable.
#ifndef RCVLINK_CLI_RECEIVER_H_
#define RCVLINK_CLI_RECEIVER_H_

#include <windows.h>

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "context.h"
#include "discovery.h"
#include "rcvlink.h"
#include "ticker.h"

namespace cli {

// The identity of a receiver.
struct Identity {
  std::wstring id{};
  std::wstring model{};
  unsigned family = 0;  // a number of EProtocol
  unsigned variant = 0;
  unsigned features = 0;

  bool offers_renaming() const;
};

// One file of the receiver.
struct RemoteFile {
  std::wstring name{};
  uint64_t size = 0;
  SYSTEMTIME time{};
};

// The receiver's files.
struct Directory {
  std::vector<RemoteFile> files{};
  std::string doubt{};  // why some may be missing; empty: all are there
};

// Asks the library once a second to abort: a single request may fall between two steps and be
// lost.
class Aborter {
 public:
  // How often `Tick` is to be called.
  static constexpr std::chrono::milliseconds kInterval{100};

  explicit Aborter(void* receiver) : receiver_(receiver) {}
  void Tick();

 private:
  void* receiver_;
  unsigned ticks_ = 0;
};

// A receiver that was found. Ctrl-C ends whatever is being done with it.
class Receiver {
 public:
  // Finds the receiver that the command line names.
  // Throws Failure when there is none.
  explicit Receiver(Context& context);

  // Takes over a receiver that was found.
  Receiver(Context& context, const FoundReceiver& found);

  void* handle() const { return handle_.get(); }
  EInstanceType link() const { return link_; }  // on which it was found: serial or USB

  // Where it answered, on a serial port.
  const std::optional<KnownSetting>& setting() const { return setting_; }

  // Read once only.
  // Throws Failure.
  const Identity& Identify();

  // A number of EProtocol. Read only when the search did not find it out.
  // Throws Failure.
  unsigned Family();

  // Reads the receiver's directory. Warns when some of it may be missing.
  // Throws Failure.
  Directory ListFiles();

  // Asks the receiver whether it still answers.
  bool Answers();

  // The failure for a result other than S_OK; a cancellation after Ctrl-C.
  Failure FailureOf(std::string tried, long code, std::string meaning = "") const;

  // Throws Failure when Ctrl-C was pressed.
  void ThrowIfCancelled(const std::string& tried) const;

 private:
  std::vector<RemoteFile> ReadDirectory();
  std::string DoubtAbout(std::vector<RemoteFile>& files);
  void AwaitAnswer(const std::string& tried);

  struct Closer {
    void operator()(void* handle) const { devapi::CloseReceiver(handle); }
  };

  Context& context_;
  const Interrupt& interrupt_;
  std::unique_ptr<void, Closer> handle_;
  EInstanceType link_;
  std::optional<KnownSetting> setting_;
  std::optional<Identity> identity_;
  Ticker cancel_watch_;  // ends before the handle does
};

// The file of that name in a receiver's directory.
// Throws Failure when there is none.
const RemoteFile& FindFile(const std::vector<RemoteFile>& files,
                           const std::wstring& name,
                           const std::string& tried);

// Whether a receiver's directory has a file of that name.
bool HasFile(const std::vector<RemoteFile>& files, const std::wstring& name);

}  // namespace cli

#endif  // RCVLINK_CLI_RECEIVER_H_
