#include "tests/host/support/transcript_file.h"

#include <thread>

namespace bed {
namespace {

constexpr const char* kName = "transcript.txt";
constexpr auto kPollInterval = std::chrono::milliseconds(5);

}  // namespace

std::filesystem::path TranscriptFile::path() const { return folder_ / kName; }

std::string TranscriptFile::unix_path() const { return folder_.unix_path() + "/" + kName; }

void TranscriptFile::Clear() const { std::filesystem::remove(path()); }

std::string TranscriptFile::Text() const { return folder_.Read(kName); }

void TranscriptFile::WaitFor(std::string_view text, std::chrono::milliseconds timeout) const {
  const auto end = std::chrono::steady_clock::now() + timeout;
  std::string transcript = Text();
  while (transcript.find(text) == std::string::npos) {
    if (std::chrono::steady_clock::now() > end) {
      throw Error("the transcript does not hold \"" + std::string(text) + "\":\n" + transcript);
    }
    std::this_thread::sleep_for(kPollInterval);
    transcript = Text();
  }
}

}  // namespace bed
