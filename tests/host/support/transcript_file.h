// The transcript of a simulated receiver's program.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_TRANSCRIPT_FILE_H_
#define RCVLINK_TESTS_HOST_SUPPORT_TRANSCRIPT_FILE_H_

#include <chrono>
#include <filesystem>
#include <string>
#include <string_view>

#include "tests/host/support/temp_folder.h"

namespace bed {

class TranscriptFile {
 public:
  // For programs of either side.
  std::filesystem::path path() const;
  std::string unix_path() const;

  // Removes it: the program does not replace a file.
  void Clear() const;

  std::string Text() const;
  // Waits until it contains `text`; raises Error when that does not come.
  void WaitFor(std::string_view text, std::chrono::milliseconds timeout) const;

 private:
  TempFolder folder_;
};

}  // namespace bed

#endif  // RCVLINK_TESTS_HOST_SUPPORT_TRANSCRIPT_FILE_H_
