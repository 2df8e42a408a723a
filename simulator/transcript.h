// The record of a session between host and receiver.
#ifndef SIMULATOR_TRANSCRIPT_H_
#define SIMULATOR_TRANSCRIPT_H_

#include <cstdint>
#include <ostream>
#include <span>
#include <string>
#include <string_view>

#include "simulator/bytes.h"

namespace sim {

// Printable ASCII as it is; everything else as \r, \n, \\ or \xNN.
std::string Escape(std::span<const uint8_t> bytes);
std::string Escape(std::string_view text);

// Writes what goes over a link, one event a line. Each line is flushed at once, so that the file can
// be read while the receiver runs. There are no times in it, and it does not show how the bytes were
// cut into reads: two identical sessions give identical transcripts.
//
//   > what the host sent        < what the receiver sent
//   = a setting that took hold  - a remark
class Transcript {
 public:
  // A transcript nobody reads.
  Transcript() = default;

  // `out` must outlive the transcript.
  explicit Transcript(std::ostream& out) : out_(&out) {}

  void FromHost(std::string_view text) { WriteLine('>', Escape(text)); }
  void FromHost(uint8_t control) { WriteLine('>', Escape(std::span(&control, 1))); }

  // `description` is written as it is: the caller escapes bytes, and describes a block in words.
  void FromReceiver(std::string_view description) { WriteLine('<', description); }

  void Setting(std::string_view text) { WriteLine('=', text); }
  void Remark(std::string_view text) { WriteLine('-', text); }

 private:
  void WriteLine(char mark, std::string_view text);

  std::ostream* out_ = nullptr;
};

}  // namespace sim

#endif  // SIMULATOR_TRANSCRIPT_H_
