// USB devices with simulated receivers in them.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_SIMULATED_USB_H_
#define RCVLINK_TESTS_HOST_SUPPORT_SIMULATED_USB_H_

#include <windows.h>

#include <chrono>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tests/host/support/handle.h"
#include "tests/host/support/temp_folder.h"
#include "tests/host/support/transcript_file.h"

namespace bed {

// A USB device with a simulated receiver in it. Its name is unique among all processes. The
// receiver's program ends with this one, even after a crash.
class SimulatedUsb {
 public:
  // `arguments` are those of rcvlink-sim-usb, the family first: {"quorin", "--id", "ABC"}. Added to
  // them: --device, --transcript, and --folder with files(), unless it is given. `files` are put
  // there first, by name; the receiver looks at its folder when it starts. Returns when the device
  // can be opened; raises Error with what the program said when it ends instead.
  explicit SimulatedUsb(std::vector<std::string> arguments,
                        const std::map<std::string, std::string>& files = {});
  SimulatedUsb(const SimulatedUsb&) = delete;
  SimulatedUsb& operator=(const SimulatedUsb&) = delete;
  // Unplugs the device.
  ~SimulatedUsb();

  // L"\\\\?\\rcvlink-usb-12-3", as CreateFileW takes it. The device keeps it when it is plugged in
  // again.
  std::wstring device() const;

  // The folder that the receiver serves.
  const TempFolder& files() const { return files_; }

  // Unplugs the device in the middle of what it does, and returns its program's exit status. After
  // that, no transfer is pending and the path can no longer be opened.
  int Unplug();
  // Kills the program, which unplugs the device too, but maybe not at once.
  void Kill();
  // Plugs a device in again after Unplug or Kill. The transcript starts empty.
  void Start(std::vector<std::string> arguments);
  // The exit status, when the receiver's program has ended by itself.
  std::optional<int> Status() const;
  // Waits for that end; raises Error when it does not come.
  int WaitForEnd(std::chrono::milliseconds timeout = std::chrono::seconds(20)) const;

  // The transcript so far, one event per line: "> " from the host, "< " from the receiver, "= " a
  // setting, "- " a remark. It is up to date when a request has ended; a handle is closed a little
  // after CloseHandle has returned.
  std::string Transcript() const { return transcript_.Text(); }
  // Waits until the transcript contains `text`; raises Error when it does not come.
  void WaitForTranscript(std::string_view text,
                         std::chrono::milliseconds timeout = std::chrono::seconds(20)) const {
    transcript_.WaitFor(text, timeout);
  }

 private:
  std::string name_;
  TempFolder files_;
  TranscriptFile transcript_;
  UniqueHandle process_;
  // The program's standard input, at whose end it ends, and its output.
  UniqueHandle input_;
  UniqueHandle output_;
};

}  // namespace bed

#endif  // RCVLINK_TESTS_HOST_SUPPORT_SIMULATED_USB_H_
